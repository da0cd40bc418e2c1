#include "tlrx_pending_files.h"

#include "tlrx_description_xml.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"

#include <algorithm>
#include <exception>

namespace {

CPendingFiles *theActiveGuard = nullptr;

std::vector<std::string> fdfHeaderFiles(const std::string &theName) {
  const std::string aHeader = fdfHeaderFileName(theName);
  return {aHeader, fdfXmlHeaderFileName(aHeader), theName + ".hdr"};
}

std::vector<std::string> fdfRasterFiles(const std::string &theName) {
  std::vector<std::string> aFiles = fdfHeaderFiles(theName);
  aFiles.insert(aFiles.begin(), theName);
  return aFiles;
}

} // namespace

CPendingFiles::CPendingFiles() : mUncaught(std::uncaught_exceptions()) {
  theActiveGuard = this;
  fdfSetErrorHook(&CPendingFiles::onError);
}

CPendingFiles::~CPendingFiles() {
  fdfSetErrorHook(nullptr);
  theActiveGuard = nullptr;
  if (std::uncaught_exceptions() > mUncaught)
    removeAll();
}

void CPendingFiles::addFile(const std::string &theName) { mFiles.push_back(theName); }

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

void CPendingFiles::removeAll() {
  for (const std::string &aFile : mFiles)
    if (fdfExistFile(aFile.c_str()))
      fdfRemoveFile(aFile.c_str());
  mFiles.clear();
}

void CPendingFiles::onError(int32_t theCode) {
  if (theActiveGuard != nullptr && theCode != 0 && theCode != CTLRX_WARNING_STATUS)
    theActiveGuard->removeAll();
}

void fdfRemoveHeaderFiles(const std::string &theName) {
  for (const std::string &aFile : fdfHeaderFiles(theName))
    if (fdfExistFile(aFile.c_str()))
      fdfRemoveFile(aFile.c_str());
}
