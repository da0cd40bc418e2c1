// Splitting a description file around one section's block, and replacing a
// file through a temporary copy.
#include "tlrx_description_file_lines.h"

#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_generic_utility.h"
#include "tlrx_xml_element_tree.h"

#include <cstdio>
#include <memory>
#include <vector>

namespace {

struct SFileCloser {
  void operator()(FILE *theFile) const { std::fclose(theFile); }
};
using CFilePtr = std::unique_ptr<FILE, SFileCloser>;

} // namespace

std::string_view fdfTrimLine(std::string_view theLine) {
  size_t aBegin = 0;
  while (aBegin < theLine.size() && (theLine[aBegin] == ' ' || theLine[aBegin] == '\t'))
    ++aBegin;
  size_t aEnd = theLine.size();
  while (aEnd > aBegin && (theLine[aEnd - 1] == ' ' || theLine[aEnd - 1] == '\t' || theLine[aEnd - 1] == '\r' ||
                           theLine[aEnd - 1] == '\n'))
    --aEnd;
  return theLine.substr(aBegin, aEnd - aBegin);
}

bool fdfSplitFileAroundBlock(const char *theFile, size_t theMaxLine, CSectionBlockFinder &theFinder,
                             STLRXSplitFile &theSplit) {
  theSplit = STLRXSplitFile();
  CFilePtr aFile(fdfIsRegularFile(theFile) ? std::fopen(theFile, "rb") : nullptr);
  if (!aFile) {
    fdfTraceMessage("\ncannot read %s\n", theFile);
    return false;
  }
  CScratchBuffer aBuffer(theMaxLine + 3);
  // All lines in one text, with the offset of each line.
  std::string aText;
  std::vector<size_t> aStarts;
  long aBlockBegin = -1, aBlockEnd = -1, aInsertion = -1;
  bool aInBlock = false;
  for (;;) {
    bool aTooLong = false;
    const long aLength = fdfReadRawLine(aFile.get(), aBuffer.data(), aBuffer.capacity(), aTooLong);
    if (aLength < 0)
      break;
    const std::string_view aLine(aBuffer.data(), static_cast<size_t>(aLength));
    if (aTooLong || fdfTrimLine(aLine).size() > theMaxLine) {
      fdfTraceMessage("\nline %zu of %s is longer than %zu characters\n", aStarts.size() + 1, theFile, theMaxLine);
      return false;
    }
    const long aIndex = static_cast<long>(aStarts.size());
    aStarts.push_back(aText.size());
    aText.append(aLine);
    if (aBlockEnd >= 0)
      continue; // the block is done: everything else is kept
    if (aInBlock) {
      const CSectionBlockFinder::EInside aState = theFinder.inside(aLine);
      if (aState == CSectionBlockFinder::EInside::endsBefore) {
        aBlockEnd = aIndex;
        aInBlock = false;
      } else if (aState == CSectionBlockFinder::EInside::endsWith) {
        aBlockEnd = aIndex + 1;
        aInBlock = false;
      }
    } else if (aBlockBegin < 0 && theFinder.opensBlock(aLine)) {
      aBlockBegin = aIndex;
      aInBlock = true;
    } else if (theFinder.isInsertionLine(aLine)) {
      aInsertion = aIndex;
    }
  }
  if (std::ferror(aFile.get())) {
    fdfTraceMessage("\nread error in %s\n", theFile);
    return false;
  }
  const long aLineCount = static_cast<long>(aStarts.size());
  aStarts.push_back(aText.size());
  if (aInBlock) {
    if (!theFinder.closedByEndOfFile()) {
      fdfTraceMessage("\nunterminated section block in %s\n", theFile);
      return false;
    }
    aBlockEnd = aLineCount;
  }
  long aCutBegin = 0, aCutEnd = 0;
  if (aBlockBegin >= 0) {
    aCutBegin = aBlockBegin;
    aCutEnd = aBlockEnd;
    theSplit.mFoundBlock = true;
  } else if (aInsertion >= 0) {
    aCutBegin = aCutEnd = aInsertion;
  } else if (theFinder.insertsAtEnd()) {
    aCutBegin = aCutEnd = aLineCount;
  } else {
    fdfTraceMessage("\nno place for a new section in %s\n", theFile);
    return false;
  }
  theSplit.mBefore.assign(aText, 0, aStarts[static_cast<size_t>(aCutBegin)]);
  theSplit.mAfter.assign(aText, aStarts[static_cast<size_t>(aCutEnd)], std::string::npos);
  // A last line without its line end must not run into the new block.
  if (aCutBegin == aLineCount && !theSplit.mBefore.empty() && theSplit.mBefore.back() != '\n')
    theSplit.mBefore.push_back('\n');
  theSplit.mKeptLines = aLineCount - (aCutEnd - aCutBegin);
  theSplit.mRemovalLine = aCutBegin;
  return true;
}

bool fdfReplaceFile(const char *theFile, const std::string &theContent) {
  const std::string aTemporary = std::string(theFile) + ".tlrx_tmp";
  bool aWritten = false;
  {
    CFilePtr aFile(std::fopen(aTemporary.c_str(), "wb"));
    if (aFile) {
      aWritten = std::fwrite(theContent.data(), 1, theContent.size(), aFile.get()) == theContent.size() &&
                 std::fflush(aFile.get()) == 0;
      aWritten = (std::fclose(aFile.release()) == 0) && aWritten;
    }
  }
  if (aWritten && std::rename(aTemporary.c_str(), theFile) == 0)
    return true;
  std::remove(aTemporary.c_str());
  fdfTraceMessage("\ncannot write %s\n", theFile);
  return false;
}
