// Common part of the fuzz targets.
#include "tlrx_fuzz_support.h"

#include "tlrx_errors.h"

#include <cstdio>
#include <memory>
#include <sys/stat.h>
#include <unistd.h>

namespace {

const char *const CTLRX_FUZZ_KEYS = R"([Sensor]
Name    = S
Lines   = I
Gain    = D
Doppler = VD
Counts  = VI
Labels  = VS
Grid    = MD
Ints    = MI
Table   = MS
Orbit   = 3VD T X Y
Codes   = 2VI A B
Pos     = 2D Lat Lon
[RasterInfo]
NrOfLinesPerImage = I
GeocodedImage     = S
OtherInfo         = MS
)";

std::string scratchFolder() {
  struct stat aStat;
  const std::string aBase = stat("/dev/shm", &aStat) == 0 ? "/dev/shm/" : "/tmp/";
  const std::string aFolder = aBase + "tlrx_fuzz_" + std::to_string(getpid()) + "/";
  mkdir(aFolder.c_str(), 0700);
  return aFolder;
}

} // namespace

extern "C" int LLVMFuzzerInitialize(int *, char ***) {
  return 0;
}

std::string tlrxFuzzPath(const char *theName) {
  static const std::string aFolder = scratchFolder();
  return aFolder + theName;
}

void tlrxFuzzWrite(const std::string &thePath, const uint8_t *theData, size_t theSize) {
  FILE *aFile = std::fopen(thePath.c_str(), "wb");
  if (aFile == nullptr)
    return;
  if (theSize > 0)
    std::fwrite(theData, 1, theSize, aFile);
  std::fclose(aFile);
}

CDescription &tlrxFuzzDescription() {
  static CDescription *sDescription = [] {
    auto *aNew = new CDescription();
    const std::string aKeys = tlrxFuzzPath("sections.key");
    tlrxFuzzWrite(aKeys, reinterpret_cast<const uint8_t *>(CTLRX_FUZZ_KEYS), std::char_traits<char>::length(CTLRX_FUZZ_KEYS));
    for (const char *aName : {"Sensor", "RasterInfo"}) {
      auto aSection = std::make_unique<CDescriptionSection>();
      aSection->declareFromKeyFile(aKeys.c_str(), aName);
      aNew->addSection(std::move(aSection));
    }
    return aNew;
  }();
  sDescription->clearValues();
  return *sDescription;
}
