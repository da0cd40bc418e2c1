#include "tlrx_pending_files.h"

#include "tlrx_description_xml.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"

#include <algorithm>
#include <exception>

namespace {

// The innermost guard alive; each guard knows the one it is nested in.
CPendingFiles *sInnermostGuard = nullptr;

std::vector<std::string> fdfRasterFiles(const std::string &theName) {
  std::vector<std::string> aFiles = fdfHeaderFiles(theName);
  aFiles.insert(aFiles.begin(), theName);
  return aFiles;
}

} // namespace

std::vector<std::string> fdfHeaderFiles(const std::string &theName) {
  const std::string aHeader = fdfHeaderFileName(theName);
  return {aHeader, fdfXmlHeaderFileName(aHeader), theName + ".hdr"};
}

CPendingFiles::CPendingFiles() : mEnclosing(sInnermostGuard), mUncaught(std::uncaught_exceptions()) {
  sInnermostGuard = this;
}

CPendingFiles::~CPendingFiles() {
  // Guards end in reverse order of their start; keep the chain whole anyway.
  if (sInnermostGuard == this) {
    sInnermostGuard = mEnclosing;
  } else {
    for (CPendingFiles *aGuard = sInnermostGuard; aGuard != nullptr; aGuard = aGuard->mEnclosing)
      if (aGuard->mEnclosing == this)
        aGuard->mEnclosing = mEnclosing;
  }
  if (std::uncaught_exceptions() > mUncaught)
    removeAll();
}

void CPendingFiles::addFile(const std::string &theName) {
  if (std::find(mFiles.begin(), mFiles.end(), theName) == mFiles.end())
    mFiles.push_back(theName);
}

void CPendingFiles::addRaster(const std::string &theName) {
  for (const std::string &aFile : fdfRasterFiles(theName))
    addFile(aFile);
}

void CPendingFiles::addHeaders(const std::string &theName) {
  for (const std::string &aFile : fdfHeaderFiles(theName))
    addFile(aFile);
}

void CPendingFiles::forgetFile(const std::string &theName) {
  mFiles.erase(std::remove(mFiles.begin(), mFiles.end(), theName), mFiles.end());
}

void CPendingFiles::forgetRaster(const std::string &theName) {
  for (const std::string &aFile : fdfRasterFiles(theName))
    forgetFile(aFile);
}

CPendingFiles *CPendingFiles::outermost() {
  CPendingFiles *aGuard = sInnermostGuard;
  while (aGuard != nullptr && aGuard->mEnclosing != nullptr)
    aGuard = aGuard->mEnclosing;
  return aGuard;
}

void CPendingFiles::handOver() {
  CPendingFiles *aRun = outermost();
  if (aRun != this)
    for (const std::string &aFile : mFiles)
      aRun->addFile(aFile);
  mFiles.clear();
}

void CPendingFiles::removeAll() {
  for (const std::string &aFile : mFiles)
    if (fdfExistFile(aFile.c_str()))
      fdfRemoveFile(aFile.c_str());
  mFiles.clear();
}

void fdfAddPendingFile(const std::string &theName) {
  if (CPendingFiles *aRun = CPendingFiles::outermost())
    aRun->addFile(theName);
}

void fdfRemoveHeaderFiles(const std::string &theName) {
  for (const std::string &aFile : fdfHeaderFiles(theName))
    if (fdfExistFile(aFile.c_str()))
      fdfRemoveFile(aFile.c_str());
}
