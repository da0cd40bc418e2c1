// Line-level rewriting of description files: an existing file is split
// around the block of one section (its lines removed, every other line kept
// byte for byte), and the file is replaced as a whole, so that a failed
// write never leaves a half-written header behind.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

// Decides where the block of one section lies in the lines of a file.
class CSectionBlockFinder {
public:
  enum class EInside { continues, endsBefore, endsWith };
  virtual ~CSectionBlockFinder() = default;
  // A line outside the block: whether it opens the block.
  virtual bool opensBlock(std::string_view theLine) = 0;
  // A line after the opening one: whether the block goes on, ended just
  // before this line (the line is kept) or ends with it (removed too).
  virtual EInside inside(std::string_view theLine) = 0;
  // Whether a block still open at the end of the file is complete.
  virtual bool closedByEndOfFile() const = 0;
  // Without a block: whether this line is where a new block goes (before
  // it); the last such line wins. No such line: see insertsAtEnd.
  virtual bool isInsertionLine(std::string_view theLine) = 0;
  // Without a block and without an insertion line: append at the end (true)
  // or fail (false).
  virtual bool insertsAtEnd() const = 0;
};

// The kept lines of a file, before and after the removal point.
struct STLRXSplitFile {
  std::string mBefore;
  std::string mAfter;
  long mKeptLines = 0;    // lines kept
  long mRemovalLine = 0;  // kept lines before the removal point
  bool mFoundBlock = false;
};

// Reads theFile (lines of at most theMaxLine characters) into theSplit.
// False, with the reason in the trace, when the file cannot be read, holds
// an over-long line, leaves its block open, or offers no insertion point.
// Takes a scratch buffer (848646 "All pools are busy" when none is free).
bool fdfSplitFileAroundBlock(const char *theFile, size_t theMaxLine, CSectionBlockFinder &theFinder,
                             STLRXSplitFile &theSplit);

// Writes theContent to a temporary file beside theFile and renames it over
// theFile. False when any step fails (theFile is then unchanged).
bool fdfReplaceFile(const char *theFile, const std::string &theContent);

// theLine without leading blanks and tabs and trailing blanks, tabs and line ends.
std::string_view fdfTrimLine(std::string_view theLine);
