// An 8-bit, one-band GeoTIFF being written: TIFF fields, palette, GeoTIFF
// keys, checked scan lines. The file is written under a temporary name
// beside the final one and renamed only by commit(), so a failed conversion
// (an error, an interruption, the end of the process) never leaves a
// truncated TIFF behind: the destructor, or an exit handler when the
// process ends while the file is open, removes the temporary file.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include <tiffio.h>

#include "tlrx_geotiff_georef.h"

constexpr uint32_t CTLRX_TIFF_ROWS_PER_STRIP = 20;
constexpr int CTLRX_TIFF_PALETTE_SIZE = 256;

struct STLRXTiffLayout {
  uint32_t mWidth = 0;
  uint32_t mLength = 0;
  std::string mSoftware;
  std::string mDocumentName;
};

class CGeoTiffFile {
public:
  // Creates the temporary file and opens it for TIFF writing; raises
  // CTLRX_ERR_TIFF_CREATE ("failed in GTIFNew") when it cannot.
  explicit CGeoTiffFile(const std::string &theFinalName, uint64_t theImageBytes);
  ~CGeoTiffFile();
  CGeoTiffFile(const CGeoTiffFile &) = delete;
  CGeoTiffFile &operator=(const CGeoTiffFile &) = delete;

  // ImageWidth, ImageLength, Orientation, PlanarConfiguration, Compression,
  // SamplesPerPixel, BitsPerSample, RowsPerStrip, Software, DocumentName.
  void writeFields(const STLRXTiffLayout &theLayout);
  // Photometric palette with a colour map of 256 16-bit entries per colour.
  void writePalette(const std::vector<uint16_t> &theRed, const std::vector<uint16_t> &theGreen,
                    const std::vector<uint16_t> &theBlue);
  void writeMinIsBlack();
  // GeoTIFF keys, then tie point and pixel scale when given.
  void writeGeoReference(const STLRXGeoReference &theGeo);
  // Rows must come in order 0, 1, ...; a failed write raises CTLRX_ERR_TIFF_CREATE.
  void writeScanline(uint8_t *theLine, uint32_t theRow);
  // Flushes and closes the TIFF (checked); the file stays temporary.
  void finish();
  // Renames the finished file to its final name.
  void commit();

  const std::string &finalName() const { return mFinalName; }
  const std::string &temporaryName() const { return mTempName; }

private:
  [[noreturn]] void fail(const char *theWhat) const;
  void closeTiff();
  void discard();

  // libtiff's messages go to the trace while the file is open; the
  // previous handlers come back afterwards (also when opening fails).
  class CHandlerScope {
  public:
    CHandlerScope();
    ~CHandlerScope();
    CHandlerScope(const CHandlerScope &) = delete;
    CHandlerScope &operator=(const CHandlerScope &) = delete;

  private:
    TIFFErrorHandler mPreviousError;
    TIFFErrorHandler mPreviousWarning;
  };

  CHandlerScope mHandlers;
  std::string mFinalName;
  std::string mTempName;
  TIFF *mTiff = nullptr;
  bool mCommitted = false;
};

// The last error libtiff reported while a CGeoTiffFile was open.
const char *fdfLastTiffError();

// Temporaries are named "<final name>.tlrxtmp_<pid>.XXXXXX", so each one
// names its TIFF and the process that writes it.
constexpr const char *CTLRX_TIFF_TEMPORARY_TAG = ".tlrxtmp_";
