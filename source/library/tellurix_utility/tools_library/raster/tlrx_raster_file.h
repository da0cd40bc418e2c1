// Raster file: a headerless binary file of fixed-length records, one record
// per image line, described by the raster's XML header. Opens in read, write
// or update mode, positions with 64-bit offsets, reads and writes blocks of
// records with byte swapping, keeps an optional line cache and converts cells
// to float, double or complex values with the raster's no-data value and
// scale factors.
//
// File layout: HeaderOffset bytes, then NrOfLinesPerImage records of
// RowPrefix bytes + the cells + RowSuffix bytes, then FooterLen bytes. The
// cells of a BIT line are packed eight pixels per byte.
#pragma once

#include <cstdint>
#include <complex>
#include <cstdio>
#include <memory>
#include <string>
#include <vector>
#include "tlrx_error_codes.h"

#include "tlrx_cell_types.h"
#include "tlrx_no_data.h"

class CDescription;

// Both lines and pixels per line must lie in 1..CTLRX_RASTER_FILE_MAX_ROWS.
constexpr int32_t CTLRX_RASTER_FILE_MAX_ROWS = 900000;

// Modes (mRasterStatus). Opening is allowed only when closed.
constexpr int32_t CTLRX_RF_CLOSE = 0;
constexpr int32_t CTLRX_RF_OPEN_READ = 1;
constexpr int32_t CTLRX_RF_OPEN_WRITE = 2;
constexpr int32_t CTLRX_RF_OPEN_READ_WRITE = 3;
// TIFF-backed modes: reserved codes, known to close() and print(); this class
// never opens them (GeoTIFF output writes its TIFF files directly).
constexpr int32_t CTLRX_RF_OPEN_TIFF_READ = 4;
constexpr int32_t CTLRX_RF_OPEN_TIFF_WRITE = 5;

// Codes raised by the raster file.

// Layout of a raster as its header gives it, or as a caller sets it before
// opening a file for writing.
class CRasterFileParam {
public:
  std::string mFileName;                    // data file path
  int32_t mNrOfLinesPerImage = 0;
  int32_t mNrOfPixelsPerLine = 0;
  int32_t mCellType = CTLRX_CELL_UNKNOWN;   // -1 for an unknown name
  int32_t mDataUnits = CTLRX_UNITS_UNKNOWN; // -1 when the header lacks it
  int32_t mHeaderOffset = 0;
  int32_t mRowPrefix = 0;
  int32_t mRowSuffix = 0;
  int32_t mFooterLen = 0;
  double mNullCellValue = 0.0;
  bool mMSBF;                               // most significant byte first; machine order by default
  int32_t mNrOfChannels = 1;
  double mRealScaleFactor = 1.0;
  double mImaginaryScaleFactor = 1.0;
  bool mLinesReversed = false;              // file line order runs against the caller's
  bool mPixelsReversed = false;             // file pixel order runs against the caller's

  CRasterFileParam();

  // Fields of section "RasterInfo" of a loaded header; theFileName becomes
  // mFileName. Absent fields keep the defaults above ("BytesOrder" absent:
  // machine order; present: MSBF exactly when its text is "MSBF").
  void setFromDescription(const char *theFileName, const CDescription &theHeader);
  // Reads the header of raster theFileName (".sml" first, then "_hdr") and
  // takes its layout; raises 261122 with the name when it cannot be read.
  void readFromHeader(const char *theFileName);
  // Stores the layout into the "RasterInfo" fields of theHeader that the
  // section declares (for writing result headers). Unknown cell types and
  // units leave their fields unchanged.
  void storeInDescription(CDescription &theHeader) const;
};

class CRasterFile {
public:
  CRasterFile();
  // An object still open is closed (after a trace warning); errors are not
  // propagated out of the destructor.
  ~CRasterFile();
  CRasterFile(const CRasterFile &) = delete;
  CRasterFile &operator=(const CRasterFile &) = delete;

  // Opening; every form requires the closed state (261121 otherwise).
  // Reading from a name loads its header; from a loaded description, the
  // description's "RasterInfo" is used with theFileName as data file.
  void open_read(const char *theFileName, bool theLinesReversed = false, bool thePixelsReversed = false);
  void open_read(const char *theFileName, const CDescription &theHeader, bool theLinesReversed = false,
                 bool thePixelsReversed = false);
  void open_read(const CRasterFileParam &theParam);
  // Writing truncates (or creates) the data file.
  void open_write(const char *theFileName);
  void open_write(const char *theFileName, const CDescription &theHeader);
  void open_write(const CRasterFileParam &theParam);
  // Updating in place; a missing data file is created empty.
  void open_read_write(const char *theFileName);
  void open_read_write(const char *theFileName, const CDescription &theHeader);
  void open_read_write(const CRasterFileParam &theParam);

  // Writes queued lines; in write mode pads lines never written with zeros
  // (warning 130561) up to the declared size. Back to CTLRX_RF_CLOSE even
  // when a final write fails (then 261124 is raised).
  void close();

  // Positions on the record of file line theRow; false (after a trace) when
  // the positioning fails.
  bool seekLinePosition(int32_t theRow);

  // Raw cells of columns theColStart..theColEnd of theRowNbr lines into
  // theDest, swapped into machine order, packed line after line. Lines and
  // columns outside the image are clamped (with a trace), BIT lines are always
  // whole. Returns the number of lines delivered.
  int32_t readRecords(int32_t theRowStart, int32_t theRowNbr, int32_t theColStart, int32_t theColEnd, void *theDest,
                      bool theTrace = false);
  // Raw cells from theSource (machine order; left unchanged) into the file.
  // theColEnd below 0 means the last column. Returns the lines written.
  int32_t writeRecords(int32_t theRowStart, int32_t theRowNbr, const void *theSource, int32_t theColStart = 0,
                       int32_t theColEnd = -1, bool theTrace = false);

  // Line cache of theLines lines (read or write mode only; false otherwise).
  bool setBuffer(int32_t theLines);
  void freeBuffer();  // writes queued lines, drops the cache
  void flushBuffer(); // writes queued lines

  // Read and update modes: the raw cells (machine order) of columns
  // theColStart..theColEnd (theColEnd below 0: last column; BIT: the whole
  // packed line) of file line theRow, through the cache when it is on. The
  // pointer stays valid until the next call that reads.
  // Write mode: the line buffer (one whole line) to fill before putLine.
  void *getLineBuffer(int32_t theRow, int32_t theColStart = 0, int32_t theColEnd = -1);
  // Queues the line buffer (whole line) for file line theRow, or writes it at
  // once without a cache. The second form takes the cells from theCells.
  void putLine(int32_t theRow);
  void putLine(int32_t theRow, const void *theCells);

  // One line converted to T (float or double), in the caller's line and
  // pixel order. No-data cells give the no-data value; other real cells the
  // value times the real scale factor; complex cells re^2 + im^2 after
  // scaling (its square root with theAmplitude). theColEnd below 0 means the
  // last column. Columns or line outside the image raise 261121.
  template <typename T>
  void getLine(T *theDest, int32_t theRow, int32_t theColStart = 0, int32_t theColEnd = -1,
               bool theAmplitude = false);
  // The whole line as double, and theMask 0 for no-data cells, 1 elsewhere.
  void getValidMask(double *theDest, int32_t *theMask, int32_t theRow, bool theAmplitude = false);

  // Complex cell types only (261121 otherwise), T float or double, in the
  // caller's line and pixel order; the file's byte order and scale factors
  // are applied here. Reading: columns theColStart..theColEnd (below 0: the
  // last), each part times its scale factor; a no-data cell (both parts no
  // data as stored) gives (D, D) and, when theValid is given, 0 there and 1
  // elsewhere. Writing (write or update mode): one whole line; a value that
  // is no data (both parts) is stored as D in both parts, other parts are
  // divided by their scale factor, rounded to the nearest integer and
  // saturated for integer parts (NaN as 0). Columns or line outside the
  // image raise 261121.
  template <typename T>
  void getComplexLine(std::complex<T> *theDest, int32_t theRow, int32_t theColStart = 0, int32_t theColEnd = -1,
                      uint8_t *theValid = nullptr);
  template <typename T>
  void putComplexLine(int32_t theRow, const std::complex<T> *theSource);

  int32_t getNrOfPixelsPerLine() const { return mNrOfPixelsPerLine; }
  int32_t getNrOfLinesPerImage() const { return mNrOfLinesPerImage; }
  int32_t getCellType() const { return mCellType; }
  int32_t getDataUnits() const { return mDataUnits; }
  int32_t getRasterStatus() const { return mRasterStatus; }
  int32_t getDataNbr() const { return mDataNbr; }
  double getDummyVal() const { return mDummyVal; }
  SNoData getNoData() const { return SNoData(mDummyVal); }
  const char *getFileName() const { return mFileName.c_str(); }
  int32_t getBytesPerPixel() const { return mBytesPerPixel; }
  int32_t getRecordLen() const { return mRecordLen; }
  bool isSwapped() const { return mSwap; }
  int32_t getBufferSize() const { return mCacheSize; }

  // The state to the trace, headed by theLabel.
  void print(const char *theLabel) const;

private:
  struct SFileCloser {
    void operator()(FILE *theFile) const;
  };

  void openWith(const CRasterFileParam &theParam, int32_t theMode);
  void openFromHeader(const char *theFileName, int32_t theMode, bool theLinesReversed = false,
                      bool thePixelsReversed = false);
  void openFromDescription(const char *theFileName, const CDescription &theHeader, int32_t theMode,
                           bool theLinesReversed = false, bool thePixelsReversed = false);
  void refuseWhenOpen(const char *theFileName) const;
  void validateLayout(const CRasterFileParam &theParam, int32_t theMode) const;
  void openStream(const char *theFileName, int32_t theMode);
  void checkFileCoversImage(const CRasterFileParam &theParam) const;
  void adoptLayout(const CRasterFileParam &theParam, int32_t theMode);
  void resetState();

  template <typename F>
  auto guarded(int theLine, F &&theBody) -> decltype(theBody());
  [[noreturn]] void raiseUnexpected(int theLine) const;

  void checkAccess(int32_t theRowNbr, bool theWriting) const;
  void checkReadable(int32_t theRowNbr) const { checkAccess(theRowNbr, false); }
  void checkWritable(int32_t theRowNbr) const { checkAccess(theRowNbr, true); }
  void clampRows(int32_t &theRowStart, int32_t &theRowNbr, const char *theFormat) const;
  void clampColumns(int32_t &theColStart, int32_t &theColEnd) const;
  int64_t lineBytes(int32_t theColStart, int32_t theColEnd) const;
  int64_t recordOffset(int32_t theRow) const;

  void readLines(int32_t theRowStart, int32_t theRowNbr, int32_t theColStart, int32_t theColEnd, uint8_t *theDest);
  void writeLines(int32_t theRowStart, int32_t theRowNbr, const uint8_t *theSource, int32_t theColStart,
                  int32_t theColEnd);
  void readBytes(void *theDest, size_t theBytes, int32_t theRow);
  void writeBytes(const void *theSource, size_t theBytes, int32_t theRow);
  void switchDirection(bool theWriting);
  void swapValues(uint8_t *theData, int64_t theValues) const;
  void positionOnRecordOrRaise(int32_t theRow, int32_t theCode);

  uint8_t *lineBuffer();
  void refillCache(int32_t theRow, int32_t theColStart, int32_t theColEnd);
  void padMissingLines();

  // The line's raw cells for typed access (mode and range checked).
  const uint8_t *typedLineCells(int32_t theRow, int32_t &theColStart, int32_t &theColEnd);
  // File line of the caller's line theRow for typed access (261121 outside).
  int32_t typedFileRow(int32_t theRow) const;
  void requireComplexCells() const;
  [[noreturn]] void failUnknownCellType() const;

  std::string mFileName;
  std::vector<uint8_t> mRecordBuffer;         // one record; prefix and suffix stay zero in write mode
  std::vector<uint8_t> mLineBuffer;           // one whole line, allocated on first unbuffered access
  std::vector<uint8_t> mCacheBlock;           // storage of the cache lines
  std::vector<uint8_t *> mCacheLines;         // line pointers into mCacheBlock
  std::vector<int32_t> mCacheLineNumbers;     // write mode: target line of each queued line
  int32_t mCacheSize = 0;
  int32_t mQueued = 0;
  int32_t mCacheFirst = -1;
  int32_t mCacheLast = -1;
  int32_t mCacheColStart = -1;                // columns the read cache holds
  int32_t mCacheColEnd = -1;
  std::unique_ptr<char[]> mStreamBuffer;      // outlives mFile, which is declared after it
  std::unique_ptr<FILE, SFileCloser> mFile;
  int32_t mRasterStatus = CTLRX_RF_CLOSE;
  int32_t mNrOfPixelsPerLine = 0;
  int32_t mNrOfLinesPerImage = 0;
  int32_t mCellType = CTLRX_CELL_UNKNOWN;
  int32_t mDataUnits = CTLRX_UNITS_UNKNOWN;
  int32_t mHeaderLen = 0;
  int32_t mBytesPerPixel = 0;
  int32_t mRecordLen = 0;
  int32_t mRowPrefix = 0;
  int32_t mRowSuffix = 0;
  int32_t mFooterLen = 0;
  bool mSwap = false;
  int32_t mDataNbr = 0;
  int32_t mLinePosition = 0;                  // -1 when the stream stands inside a record
  int32_t mMaxLineSeek = 0;
  int32_t mMaxLineWritten = 0;
  double mDummyVal = 0.0;
  double mRealScaleFactor = 1.0;
  double mImaginaryScaleFactor = 1.0;
  bool mScaleFactor = false;
  bool mLinesReversed = false;
  bool mPixelsReversed = false;
  bool mLastWasWrite = false;                 // update mode: direction of the last transfer
};

#include "tools_raster_file_exp.h"
