// An 8-bit GeoTIFF written under a temporary name and renamed on success.
#include "tlrx_geotiff_file.h"

#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_platform.h"

#include <geotiff/geotiff.h>
#include <geotiff/geotiffio.h>
#include <geotiff/xtiffio.h>

#include <algorithm>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <sys/stat.h>
#include <unistd.h>

namespace {

char sLastTiffError[1024] = "";

void captureTiffError(const char *theModule, const char *theFormat, va_list theArgs) {
  char aText[900];
  std::vsnprintf(aText, sizeof aText, theFormat, theArgs);
  std::snprintf(sLastTiffError, sizeof sLastTiffError, "%s: %s", theModule != nullptr ? theModule : "libtiff",
                aText);
  fdfTraceMessage("libtiff error %s\n", sLastTiffError);
}

void traceTiffWarning(const char *theModule, const char *theFormat, va_list theArgs) {
  char aText[1024];
  std::vsnprintf(aText, sizeof aText, theFormat, theArgs);
  fdfTraceMessage("libtiff warning %s: %s\n", theModule != nullptr ? theModule : "libtiff", aText);
}

// Permissions of a new file under the process's umask (mkstemp gives 0600).
mode_t newFileMode() {
  const mode_t aMask = umask(0);
  umask(aMask);
  return 0666 & ~aMask;
}

struct SGtifFree {
  void operator()(GTIF *theGtif) const { GTIFFree(theGtif); }
};

bool setGeoKey(GTIF *theGtif, const STLRXGeoKey &theKey) {
  const geokey_t aKey = static_cast<geokey_t>(theKey.mKey);
  switch (theKey.mType) {
  case ETLRXGeoKeyType::kShort: return GTIFKeySet(theGtif, aKey, TYPE_SHORT, 1, theKey.mShort) != 0;
  case ETLRXGeoKeyType::kDouble: return GTIFKeySet(theGtif, aKey, TYPE_DOUBLE, 1, static_cast<double>(theKey.mDouble)) != 0;
  case ETLRXGeoKeyType::kText: return GTIFKeySet(theGtif, aKey, TYPE_ASCII, 0, theKey.mText.c_str()) != 0;
  }
  return false;
}

} // namespace

const char *fdfLastTiffError() { return sLastTiffError; }

CGeoTiffFile::CHandlerScope::CHandlerScope()
    : mPreviousError(TIFFSetErrorHandler(captureTiffError)), mPreviousWarning(TIFFSetWarningHandler(traceTiffWarning)) {
  sLastTiffError[0] = '\0';
}

CGeoTiffFile::CHandlerScope::~CHandlerScope() {
  TIFFSetErrorHandler(mPreviousError);
  TIFFSetWarningHandler(mPreviousWarning);
}

CGeoTiffFile::CGeoTiffFile(const std::string &theFinalName, uint64_t theImageBytes) : mFinalName(theFinalName) {
  fdfRemoveStaleTemporaries(theFinalName, CTLRX_TIFF_TEMPORARY_TAG, 6);
  const std::string aPattern =
      theFinalName + CTLRX_TIFF_TEMPORARY_TAG + std::to_string(fdfProcessId()) + ".XXXXXX";
  std::vector<char> aTemplate(aPattern.c_str(), aPattern.c_str() + aPattern.size() + 1);
  const int aFd = mkstemp(aTemplate.data());
  if (aFd < 0) {
    std::snprintf(sLastTiffError, sizeof sLastTiffError, "%s: %s", theFinalName.c_str(), std::strerror(errno));
    fail("failed in GTIFNew");
  }
  mTempName = aTemplate.data();
  fchmod(aFd, newFileMode());
  // Classic TIFF offsets stop at 4 GB; larger quick-looks become BigTIFF.
  const char *aMode = theImageBytes > 0xF0000000ULL ? "w8" : "w";
  mTiff = XTIFFFdOpen(aFd, mTempName.c_str(), aMode);
  if (mTiff == nullptr) {
    close(aFd);
    discard(); // the destructor does not run for a failed construction
    fail("failed in GTIFNew");
  }
}

CGeoTiffFile::~CGeoTiffFile() {
  if (!mCommitted)
    discard();
}

void CGeoTiffFile::fail(const char *theWhat) const {
  fdfTraceMessage("%s\n", theWhat);
  TLRX_RAISE_F(CTLRX_ERR_TIFF_CREATE, "%s %s %s", theWhat, mFinalName.c_str(), sLastTiffError);
}

void CGeoTiffFile::closeTiff() {
  if (mTiff != nullptr) {
    XTIFFClose(mTiff);
    mTiff = nullptr;
  }
}

void CGeoTiffFile::discard() {
  closeTiff();
  if (!mTempName.empty()) {
    std::remove(mTempName.c_str());
  }
}

void CGeoTiffFile::writeFields(const STLRXTiffLayout &theLayout) {
  const bool aSet = TIFFSetField(mTiff, TIFFTAG_IMAGEWIDTH, theLayout.mWidth) != 0 &&
                    TIFFSetField(mTiff, TIFFTAG_IMAGELENGTH, theLayout.mLength) != 0 &&
                    TIFFSetField(mTiff, TIFFTAG_ORIENTATION, ORIENTATION_TOPLEFT) != 0 &&
                    TIFFSetField(mTiff, TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG) != 0 &&
                    TIFFSetField(mTiff, TIFFTAG_COMPRESSION, COMPRESSION_NONE) != 0 &&
                    TIFFSetField(mTiff, TIFFTAG_SAMPLESPERPIXEL, 1) != 0 &&
                    TIFFSetField(mTiff, TIFFTAG_BITSPERSAMPLE, 8) != 0 &&
                    TIFFSetField(mTiff, TIFFTAG_ROWSPERSTRIP, CTLRX_TIFF_ROWS_PER_STRIP) != 0 &&
                    TIFFSetField(mTiff, TIFFTAG_SOFTWARE, theLayout.mSoftware.c_str()) != 0 &&
                    TIFFSetField(mTiff, TIFFTAG_DOCUMENTNAME, theLayout.mDocumentName.c_str()) != 0;
  if (!aSet)
    fail("failed in GTIFNew");
}

void CGeoTiffFile::writePalette(const std::vector<uint16_t> &theRed, const std::vector<uint16_t> &theGreen,
                                const std::vector<uint16_t> &theBlue) {
  if (theRed.size() != CTLRX_TIFF_PALETTE_SIZE || theGreen.size() != CTLRX_TIFF_PALETTE_SIZE ||
      theBlue.size() != CTLRX_TIFF_PALETTE_SIZE)
    fail("No space for colormap.");
  if (TIFFSetField(mTiff, TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_PALETTE) == 0 ||
      TIFFSetField(mTiff, TIFFTAG_COLORMAP, theRed.data(), theGreen.data(), theBlue.data()) == 0)
    fail("failed in GTIFNew");
}

void CGeoTiffFile::writeMinIsBlack() {
  if (TIFFSetField(mTiff, TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_MINISBLACK) == 0)
    fail("failed in GTIFNew");
}

void CGeoTiffFile::writeGeoReference(const STLRXGeoReference &theGeo) {
  std::unique_ptr<GTIF, SGtifFree> aGtif(GTIFNew(mTiff));
  if (!aGtif)
    fail("failed in GTIFNew");
  for (const STLRXGeoKey &aKey : theGeo.mKeys)
    if (!setGeoKey(aGtif.get(), aKey))
      fail("failed in GTIFNew");
  if (GTIFWriteKeys(aGtif.get()) == 0)
    fail("failed in GTIFNew");
  if (!theGeo.mHasTransform)
    return;
  if (TIFFSetField(mTiff, TIFFTAG_GEOTIEPOINTS, 6, theGeo.mTiePoint) == 0 ||
      TIFFSetField(mTiff, TIFFTAG_GEOPIXELSCALE, 3, theGeo.mPixelScale) == 0)
    fail("failed in GTIFNew");
}

void CGeoTiffFile::writeScanline(uint8_t *theLine, uint32_t theRow) {
  if (TIFFWriteScanline(mTiff, theLine, theRow, 0) != 1)
    fail("Error while writing TIFF file");
}

void CGeoTiffFile::finish() {
  if (TIFFFlush(mTiff) != 1)
    fail("Error while writing TIFF file");
  closeTiff();
}

void CGeoTiffFile::commit() {
  closeTiff();
  if (std::rename(mTempName.c_str(), mFinalName.c_str()) != 0) {
    std::snprintf(sLastTiffError, sizeof sLastTiffError, "rename: %s", std::strerror(errno));
    fail("Error while renaming TIFF file");
  }
  mCommitted = true;
}
