// XML files read into a tree of elements (name, attributes, text, children)
// with expat. Header, parameter and schema files all go through here.
//
// Lines are pre-processed before expat sees them: the five entity references
// reach the tree unresolved (as "##amp" and the like), a literal "#" as
// "##hash", and stray bytes 128 to 164 as "####BIG" plus one character, so
// that string values can be restored byte for byte (fdfRestoreXmlText); a
// few Latin-1 letters are folded to ASCII. UTF-8 text is never folded.
// The parser reads the file as ISO-8859-1, so any byte sequence is accepted
// and the tree holds the file's own bytes (UTF-8 text passes unchanged).
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <deque>
#include <string>
#include <utility>
#include <vector>

constexpr size_t CTLRX_XML_MAX_LINE = 10000000;        // whole header and parameter files
constexpr size_t CTLRX_XML_SECTION_MAX_LINE = 1000000; // single sections (list layout)

class CXmlElement {
public:
  const std::string &getName() const { return mName; }
  // Value of the attribute, nullptr when the element does not carry it.
  const char *getAttribute(const char *theName) const;
  const std::vector<std::pair<std::string, std::string>> &getAttributes() const { return mAttributes; }
  // Character data directly inside the element, pieces joined in order.
  const std::string &getText() const { return mText; }
  // Whether any character data was seen (an empty element has none).
  bool hasText() const { return mHasText; }
  const std::vector<const CXmlElement *> &getChildren() const { return mChildren; }
  // First child with exactly this name, or nullptr.
  const CXmlElement *findChild(const char *theName) const;
  const CXmlElement *getParent() const { return mParent; }
  // 0 for the document element.
  int32_t getDepth() const { return mDepth; }
  // Position in document order (order of the start tags).
  size_t getIndex() const { return mIndex; }

private:
  friend class CXmlTreeBuilder;
  std::string mName;
  std::vector<std::pair<std::string, std::string>> mAttributes;
  std::string mText;
  bool mHasText = false;
  std::vector<const CXmlElement *> mChildren;
  const CXmlElement *mParent = nullptr;
  int32_t mDepth = 0;
  size_t mIndex = 0;
};

// The elements of one file. Elements are stored flat, so neither building
// nor destroying the tree recurses, whatever the nesting depth of the file.
class CXmlElementTree {
public:
  // Parses theFileName, lines of at most theMaxLineLength characters (line
  // end not counted). False, with the reason in the trace and in
  // getErrorText(), when the file cannot be opened or read, a line is too
  // long, or expat rejects the text; the tree is then empty.
  bool parseFile(const char *theFileName, size_t theMaxLineLength);

  void clear();
  bool empty() const { return mElements.empty(); }
  // The document element, nullptr when empty.
  const CXmlElement *getRoot() const { return mElements.empty() ? nullptr : &mElements.front(); }
  size_t getElementCount() const { return mElements.size(); }
  // Elements in document order.
  const CXmlElement &getElement(size_t theIndex) const { return mElements[theIndex]; }
  const std::string &getErrorText() const { return mErrorText; }

private:
  friend class CXmlTreeBuilder;
  std::deque<CXmlElement> mElements;
  std::string mErrorText;
};

// Reads one line, line end included, into theBuffer (NUL-terminated; bytes,
// NUL included, are kept as they are). Returns the number of bytes stored,
// or -1 at end of file. A line that does not fit sets theTooLong, keeps its
// first theCapacity - 1 bytes and has its rest skipped up to the line end.
long fdfReadRawLine(FILE *theFile, char *theBuffer, size_t theCapacity, bool &theTooLong);

// Line pre-processing before the parser (appends to theOut):
// "&quot;" "&apos;" "&amp;" "&lt;" "&gt;" -> "##quot" "##apos" "##amp" "##lt" "##gt";
// a literal "#" (not the one of a character reference "&#") -> "##hash";
// well-formed UTF-8 sequences pass unchanged; of the other bytes,
// 128..164 -> "####BIG" followed by the byte minus 80 (but 0x8C, which
// would give "<", passes), and 0xE9 0xF1 0xFC 0xB0 0xF6 -> "e" "n" "u" "d" "o".
void fdfPreprocessXmlLine(const char *theLine, size_t theLength, std::string &theOut);

// Inverse of the pre-processing for a value or attribute text: the "##"
// markers become their characters again and "####BIG" x becomes the byte
// x + 80.
void fdfRestoreXmlText(const char *theText, size_t theLength, std::string &theOut);
std::string fdfRestoreXmlText(const std::string &theText);

// The five XML escapes for writing a value (appends to theOut).
void fdfEscapeXmlText(const char *theText, std::string &theOut);
