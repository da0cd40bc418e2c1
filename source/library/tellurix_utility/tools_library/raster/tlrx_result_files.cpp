#include "tlrx_result_files.h"

#include "tlrx_description_xml.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_step_common.h"
#include "tlrx_generic_utility.h"
#include "tlrx_platform.h"

#include <cerrno>
#include <cstdio>
#include <cstring>

namespace {

void fdfAddRasterFiles(std::vector<std::string> &theFiles, const std::string &theName) {
  theFiles.push_back(theName);
  for (const std::string &aHeader : fdfHeaderFiles(theName))
    theFiles.push_back(aHeader);
}

// Whether two names, of files that may not exist yet, are one entry: the
// same name in the same folder however the folder is spelled.
bool sameEntry(const std::string &theFirst, const std::string &theSecond) {
  const auto aSplit = [](const std::string &theName) {
    const size_t aSlash = theName.find_last_of('/');
    return aSlash == std::string::npos ? std::make_pair(std::string("."), theName)
                                       : std::make_pair(theName.substr(0, aSlash + 1), theName.substr(aSlash + 1));
  };
  const auto aFirst = aSplit(theFirst), aSecond = aSplit(theSecond);
  return theFirst == theSecond || fdfSameFile(theFirst, theSecond) ||
         (aFirst.second == aSecond.second && fdfSameFile(aFirst.first, aSecond.first));
}

} // namespace

void CRunFiles::addInput(const std::string &theName) { fdfAddRasterFiles(mReads, theName); }

void CRunFiles::addResult(const std::string &theName, bool theTiff) {
  mResults.push_back(theName);
  fdfAddRasterFiles(mWrites, theName);
  if (theTiff)
    fdfAddRasterFiles(mWrites, theName + ".tif");
}

void CRunFiles::refuseClashes(int32_t theCode) const {
  for (const std::string &aResult : mResults)
    if (fdfHeaderFileName(aResult) == aResult) {
      fdfTraceMessage("Error: the result %s is named like a header file\n", aResult.c_str());
      TLRX_RAISE(theCode, aResult.c_str());
    }
  // Two results under one name would write into one temporary file.
  for (size_t i = 0; i < mResults.size(); ++i)
    for (size_t j = i + 1; j < mResults.size(); ++j)
      if (sameEntry(mResults[i], mResults[j])) {
        fdfTraceMessage("Error: two results are named %s\n", mResults[j].c_str());
        TLRX_RAISE(theCode, mResults[j].c_str());
      }
  for (const std::string &aWrite : mWrites)
    for (const std::string &aRead : mReads)
      if (fdfSameFile(aWrite, aRead)) {
        fdfTraceMessage("Error: the result %s would overwrite the input %s\n", aWrite.c_str(), aRead.c_str());
        fdfLogMessage("\nThe result %s would overwrite the input %s\n", aWrite.c_str(), aRead.c_str());
        TLRX_RAISE(theCode, aWrite.c_str());
      }
}

std::string fdfRunTemporaryName(const char *theStem) {
  return fdfGetRequiredEnvVar("TELLURIX_WORKING_DIR") + theStem + "_" + std::to_string(fdfProcessId());
}

namespace {

constexpr const char *CTLRX_PART_TAG = ".part-";

} // namespace

std::string fdfPartName(const std::string &theName) { return theName + CTLRX_PART_TAG + std::to_string(fdfProcessId()); }

CResultRaster::CResultRaster(const std::string &theName, const CDescription &theHeader)
    : mName(theName), mTemporary(fdfPartName(theName)) {
  // Found now rather than when the finished raster cannot be moved there.
  if (fdfIsDirectory(mName)) {
    fdfTraceMessage("Error: cannot open the file: %s  (a directory)\n", mName.c_str());
    TLRX_RAISE(CTLRX_ERR_FILE_WRITE, mName.c_str());
  }
  fdfRemoveStaleTemporaries(mName, CTLRX_PART_TAG, 0);
  mPending.addFile(mTemporary);
  mRaster.open_write(mTemporary.c_str(), theHeader);
}

void CResultRaster::commit(CDescription &theHeader, int32_t theHeaderCode) {
  mRaster.close();
  // The headers of an earlier result of that name would describe the new
  // data until the new header is written.
  fdfRemoveHeaderFiles(mName);
  if (std::rename(mTemporary.c_str(), mName.c_str()) != 0) {
    fdfTraceMessage("Error: cannot move %s to %s: %s\n", mTemporary.c_str(), mName.c_str(), std::strerror(errno));
    TLRX_RAISE(CTLRX_ERR_FILE_WRITE, mName.c_str());
  }
  mPending.forgetFile(mTemporary);
  mPending.addRaster(mName);
  fdfWriteResultHeader(mName, theHeader, theHeaderCode);
  mPending.handOver();
}
