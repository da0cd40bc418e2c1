// expat-based element tree and the byte-level pre-processing of XML lines.
#include "tlrx_xml_element_tree.h"

#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"

#include <cstdio>
#include <cstring>
#include <expat.h>
#include <memory>

namespace {

struct SEntity {
  const char *mReference; // as written in XML
  const char *mMarker;    // as handed to the parser
  char mCharacter;
};

// Order matters for restoring: no marker is a prefix of another.
const SEntity CTLRX_XML_ENTITIES[] = {
    {"&quot;", "##quot", '"'}, {"&apos;", "##apos", '\''}, {"&amp;", "##amp", '&'},
    {"&lt;", "##lt", '<'},     {"&gt;", "##gt", '>'},
};
// A literal '#' gets a marker too, so that "##amp" written in a value is
// not taken for a marker when restored.
constexpr char CTLRX_HASH_MARKER[] = "##hash";
constexpr size_t CTLRX_HASH_MARKER_LEN = sizeof(CTLRX_HASH_MARKER) - 1;

constexpr char CTLRX_BIG_MARKER[] = "####BIG";
constexpr size_t CTLRX_BIG_MARKER_LEN = sizeof(CTLRX_BIG_MARKER) - 1;
constexpr unsigned char CTLRX_BIG_FIRST = 128;
constexpr unsigned char CTLRX_BIG_LAST = 164;
constexpr unsigned char CTLRX_BIG_SHIFT = 80;

struct SFolding {
  unsigned char mByte;
  char mLetter;
};
// Latin-1 letters of old headers that the parser is spared.
const SFolding CTLRX_LATIN1_FOLDING[] = {{0xE9, 'e'}, {0xF1, 'n'}, {0xFC, 'u'}, {0xB0, 'd'}, {0xF6, 'o'}};

// Length of the well-formed UTF-8 sequence of two or more bytes at theText,
// 0 when there is none.
size_t utf8SequenceLength(const unsigned char *theText, size_t theRemaining) {
  const unsigned char aLead = theText[0];
  size_t aLength = 0;
  unsigned char aLow = 0x80, aHigh = 0xBF; // bounds of the second byte
  if (aLead >= 0xC2 && aLead <= 0xDF) {
    aLength = 2;
  } else if (aLead >= 0xE0 && aLead <= 0xEF) {
    aLength = 3;
    if (aLead == 0xE0)
      aLow = 0xA0;
    else if (aLead == 0xED)
      aHigh = 0x9F;
  } else if (aLead >= 0xF0 && aLead <= 0xF4) {
    aLength = 4;
    if (aLead == 0xF0)
      aLow = 0x90;
    else if (aLead == 0xF4)
      aHigh = 0x8F;
  } else {
    return 0;
  }
  if (aLength > theRemaining || theText[1] < aLow || theText[1] > aHigh)
    return 0;
  for (size_t i = 2; i < aLength; ++i)
    if (theText[i] < 0x80 || theText[i] > 0xBF)
      return 0;
  return aLength;
}

// Byte 0x8C would become the markup character '<' behind the marker: it
// passes as it is (the parser takes any byte).
void appendHighByte(unsigned char theByte, std::string &theOut) {
  const char aShifted = static_cast<char>(theByte - CTLRX_BIG_SHIFT);
  if (theByte >= CTLRX_BIG_FIRST && theByte <= CTLRX_BIG_LAST && aShifted != '<') {
    theOut.append(CTLRX_BIG_MARKER, CTLRX_BIG_MARKER_LEN);
    theOut.push_back(aShifted);
  } else {
    theOut.push_back(static_cast<char>(theByte));
  }
}

char foldLatin1(unsigned char theByte) {
  for (const SFolding &aFold : CTLRX_LATIN1_FOLDING)
    if (aFold.mByte == theByte)
      return aFold.mLetter;
  return 0;
}

// expat hands out UTF-8; the file was read as ISO-8859-1, so code points up
// to 255 are the file's bytes. Larger ones (character references) stay UTF-8.
void appendLatin1(const char *theUtf8, size_t theLength, std::string &theOut) {
  const auto *aText = reinterpret_cast<const unsigned char *>(theUtf8);
  for (size_t i = 0; i < theLength;) {
    const unsigned char aByte = aText[i];
    if (aByte < 0x80) {
      size_t aEnd = i + 1; // ASCII runs are copied in one go
      while (aEnd < theLength && aText[aEnd] < 0x80)
        ++aEnd;
      theOut.append(theUtf8 + i, aEnd - i);
      i = aEnd;
    } else if ((aByte == 0xC2 || aByte == 0xC3) && i + 1 < theLength) {
      theOut.push_back(static_cast<char>(((aByte & 0x03) << 6) | (aText[i + 1] & 0x3F)));
      i += 2;
    } else {
      theOut.push_back(static_cast<char>(aByte));
      ++i;
    }
  }
}

void appendLatin1(const char *theUtf8, std::string &theOut) { appendLatin1(theUtf8, std::strlen(theUtf8), theOut); }

struct SParserDeleter {
  void operator()(XML_ParserStruct *theParser) const { XML_ParserFree(theParser); }
};
using CParserPtr = std::unique_ptr<XML_ParserStruct, SParserDeleter>;

struct SFileCloser {
  void operator()(FILE *theFile) const { std::fclose(theFile); }
};
using CFilePtr = std::unique_ptr<FILE, SFileCloser>;

size_t lineContentLength(const char *theLine, size_t theLength) {
  while (theLength > 0 && (theLine[theLength - 1] == '\n' || theLine[theLength - 1] == '\r'))
    --theLength;
  return theLength;
}

} // namespace

// Receives expat's callbacks and grows the tree; one per parsed file.
class CXmlTreeBuilder {
public:
  explicit CXmlTreeBuilder(CXmlElementTree &theTree) : mTree(theTree) {}

  static void XMLCALL onStart(void *theUserData, const XML_Char *theName, const XML_Char **theAttributes) {
    static_cast<CXmlTreeBuilder *>(theUserData)->start(theName, theAttributes);
  }
  static void XMLCALL onEnd(void *theUserData, const XML_Char *) {
    auto *aBuilder = static_cast<CXmlTreeBuilder *>(theUserData);
    if (!aBuilder->mOpen.empty())
      aBuilder->mOpen.pop_back();
  }
  static void XMLCALL onText(void *theUserData, const XML_Char *theText, int theLength) {
    auto *aBuilder = static_cast<CXmlTreeBuilder *>(theUserData);
    if (aBuilder->mOpen.empty() || theLength <= 0)
      return;
    CXmlElement *aElement = aBuilder->mOpen.back();
    aElement->mHasText = true;
    appendLatin1(theText, static_cast<size_t>(theLength), aElement->mText);
  }

private:
  void start(const XML_Char *theName, const XML_Char **theAttributes) {
    CXmlElement &aElement = mTree.mElements.emplace_back();
    aElement.mIndex = mTree.mElements.size() - 1;
    appendLatin1(theName, aElement.mName);
    for (int i = 0; theAttributes[i] != nullptr && theAttributes[i + 1] != nullptr; i += 2) {
      auto &aAttribute = aElement.mAttributes.emplace_back();
      appendLatin1(theAttributes[i], aAttribute.first);
      mValue.clear();
      appendLatin1(theAttributes[i + 1], mValue);
      fdfRestoreXmlText(mValue.data(), mValue.size(), aAttribute.second);
    }
    if (!mOpen.empty()) {
      CXmlElement *aParent = mOpen.back();
      aElement.mParent = aParent;
      aElement.mDepth = aParent->mDepth + 1;
      aParent->mChildren.push_back(&aElement);
    }
    mOpen.push_back(&aElement);
  }

  CXmlElementTree &mTree;
  std::vector<CXmlElement *> mOpen; // open elements, innermost last
  std::string mValue;               // attribute value before restoring
};

const char *CXmlElement::getAttribute(const char *theName) const {
  for (const auto &aAttribute : mAttributes)
    if (aAttribute.first == theName)
      return aAttribute.second.c_str();
  return nullptr;
}

const CXmlElement *CXmlElement::findChild(const char *theName) const {
  for (const CXmlElement *aChild : mChildren)
    if (aChild->mName == theName)
      return aChild;
  return nullptr;
}

void CXmlElementTree::clear() {
  mElements.clear();
  mErrorText.clear();
}

bool CXmlElementTree::parseFile(const char *theFileName, size_t theMaxLineLength) {
  clear();
  char aMessage[CTLRX_MAX_LEN_FILE + 256];
  if (theFileName != nullptr && fdfExistFile(theFileName) && !fdfIsRegularFile(theFileName)) {
    std::snprintf(aMessage, sizeof aMessage, "%s is not a regular file", theFileName);
    mErrorText = aMessage;
    fdfTraceMessage("\n%s\n", aMessage);
    return false;
  }
  CFilePtr aFile(theFileName != nullptr ? std::fopen(theFileName, "rb") : nullptr);
  if (!aFile) {
    std::snprintf(aMessage, sizeof aMessage, "cannot open %s", theFileName != nullptr ? theFileName : "(none)");
    mErrorText = aMessage;
    fdfTraceMessage("\n%s\n", aMessage);
    return false;
  }
  CParserPtr aParser(XML_ParserCreate("ISO-8859-1"));
  if (!aParser) {
    mErrorText = "cannot create the XML parser";
    return false;
  }
  CXmlTreeBuilder aBuilder(*this);
  XML_SetUserData(aParser.get(), &aBuilder);
  XML_SetElementHandler(aParser.get(), &CXmlTreeBuilder::onStart, &CXmlTreeBuilder::onEnd);
  XML_SetCharacterDataHandler(aParser.get(), &CXmlTreeBuilder::onText);

  // Room for the longest accepted line, its line end and the terminator.
  CScratchBuffer aLine(theMaxLineLength + 3);
  std::string aProcessed;
  long aLineNbr = 0;
  bool aFinal = false;
  while (!aFinal) {
    bool aTooLong = false;
    long aLength = fdfReadRawLine(aFile.get(), aLine.data(), aLine.capacity(), aTooLong);
    if (aLength < 0)
      aLength = 0;
    ++aLineNbr;
    if (std::ferror(aFile.get())) {
      std::snprintf(aMessage, sizeof aMessage, "read error at line %ld of %s", aLineNbr, theFileName);
      fdfTraceMessage("\n%s\n", aMessage);
      clear();
      mErrorText = aMessage;
      return false;
    }
    const size_t aContent = lineContentLength(aLine.data(), static_cast<size_t>(aLength));
    if (aTooLong || aContent > theMaxLineLength) {
      std::snprintf(aMessage, sizeof aMessage, "line longer than %zu characters at line %ld of %s",
                    theMaxLineLength, aLineNbr, theFileName);
      fdfTraceMessage("\n%s\n", aMessage);
      clear();
      mErrorText = aMessage;
      return false;
    }
    // The last line is handed over as final: look one byte ahead.
    const int aNext = std::getc(aFile.get());
    aFinal = aNext == EOF;
    if (!aFinal)
      std::ungetc(aNext, aFile.get());

    aProcessed.clear();
    fdfPreprocessXmlLine(aLine.data(), static_cast<size_t>(aLength), aProcessed);
    if (XML_Parse(aParser.get(), aProcessed.data(), static_cast<int>(aProcessed.size()), aFinal ? 1 : 0) ==
        XML_STATUS_ERROR) {
      const char *aError = XML_ErrorString(XML_GetErrorCode(aParser.get()));
      const auto aErrorLine = static_cast<int>(XML_GetCurrentLineNumber(aParser.get()));
      fdfTraceMessage("%s at line %d\n%.*s\n", aError != nullptr ? aError : "XML error", aErrorLine,
                      static_cast<int>(aContent), aLine.data());
      std::snprintf(aMessage, sizeof aMessage, "%s at line %d of %s", aError != nullptr ? aError : "XML error",
                    aErrorLine, theFileName);
      clear();
      mErrorText = aMessage;
      return false;
    }
  }
  return true;
}

long fdfReadRawLine(FILE *theFile, char *theBuffer, size_t theCapacity, bool &theTooLong) {
  theTooLong = false;
  if (theFile == nullptr || theBuffer == nullptr || theCapacity < 2)
    return -1;
  size_t aLength = 0;
  int aChar = getc_unlocked(theFile);
  if (aChar == EOF) {
    theBuffer[0] = '\0';
    return -1;
  }
  for (; aChar != EOF; aChar = getc_unlocked(theFile)) {
    if (aLength + 1 >= theCapacity) {
      if (aChar == '\n')
        break; // only the line end did not fit
      theTooLong = true;
      while (aChar != EOF && aChar != '\n')
        aChar = getc_unlocked(theFile);
      break;
    }
    theBuffer[aLength++] = static_cast<char>(aChar);
    if (aChar == '\n')
      break;
  }
  theBuffer[aLength] = '\0';
  return static_cast<long>(aLength);
}

void fdfPreprocessXmlLine(const char *theLine, size_t theLength, std::string &theOut) {
  const auto *aText = reinterpret_cast<const unsigned char *>(theLine);
  for (size_t i = 0; i < theLength;) {
    const unsigned char aByte = aText[i];
    if (aByte == '&') {
      bool aReplaced = false;
      for (const SEntity &aEntity : CTLRX_XML_ENTITIES) {
        const size_t aRefLength = std::strlen(aEntity.mReference);
        if (theLength - i >= aRefLength && std::memcmp(theLine + i, aEntity.mReference, aRefLength) == 0) {
          theOut.append(aEntity.mMarker);
          i += aRefLength;
          aReplaced = true;
          break;
        }
      }
      if (!aReplaced) {
        theOut.push_back('&');
        ++i;
      }
    } else if (aByte == '#' && (i == 0 || theLine[i - 1] != '&')) { // "&#" starts a character reference
      theOut.append(CTLRX_HASH_MARKER, CTLRX_HASH_MARKER_LEN);
      ++i;
    } else if (aByte < 0x80) {
      size_t aEnd = i + 1; // plain ASCII runs are copied in one go
      while (aEnd < theLength && aText[aEnd] < 0x80 && aText[aEnd] != '&' && aText[aEnd] != '#')
        ++aEnd;
      theOut.append(theLine + i, aEnd - i);
      i = aEnd;
    } else if (const size_t aSequence = utf8SequenceLength(aText + i, theLength - i); aSequence > 0) {
      // UTF-8 passes as it is: a continuation byte turned into a marker
      // could end in '<' (0x8C) and break the line for the parser.
      theOut.append(theLine + i, aSequence);
      i += aSequence;
    } else {
      const char aLetter = foldLatin1(aByte);
      if (aLetter != 0)
        theOut.push_back(aLetter);
      else
        appendHighByte(aByte, theOut);
      ++i;
    }
  }
}

void fdfRestoreXmlText(const char *theText, size_t theLength, std::string &theOut) {
  if (std::memchr(theText, '#', theLength) == nullptr) {
    theOut.append(theText, theLength);
    return;
  }
  for (size_t i = 0; i < theLength;) {
    if (theText[i] == '#') {
      if (theLength - i > CTLRX_BIG_MARKER_LEN &&
          std::memcmp(theText + i, CTLRX_BIG_MARKER, CTLRX_BIG_MARKER_LEN) == 0) {
        const auto aCode = static_cast<unsigned char>(theText[i + CTLRX_BIG_MARKER_LEN]);
        theOut.push_back(static_cast<char>(static_cast<unsigned char>(aCode + CTLRX_BIG_SHIFT)));
        i += CTLRX_BIG_MARKER_LEN + 1;
        continue;
      }
      if (theLength - i >= CTLRX_HASH_MARKER_LEN &&
          std::memcmp(theText + i, CTLRX_HASH_MARKER, CTLRX_HASH_MARKER_LEN) == 0) {
        theOut.push_back('#');
        i += CTLRX_HASH_MARKER_LEN;
        continue;
      }
      bool aRestored = false;
      for (const SEntity &aEntity : CTLRX_XML_ENTITIES) {
        const size_t aMarkerLength = std::strlen(aEntity.mMarker);
        if (theLength - i >= aMarkerLength && std::memcmp(theText + i, aEntity.mMarker, aMarkerLength) == 0) {
          theOut.push_back(aEntity.mCharacter);
          i += aMarkerLength;
          aRestored = true;
          break;
        }
      }
      if (aRestored)
        continue;
    }
    theOut.push_back(theText[i]);
    ++i;
  }
}

std::string fdfRestoreXmlText(const std::string &theText) {
  std::string aOut;
  aOut.reserve(theText.size());
  fdfRestoreXmlText(theText.data(), theText.size(), aOut);
  return aOut;
}

void fdfEscapeXmlText(const char *theText, std::string &theOut) {
  for (const char *aChar = theText; *aChar != '\0'; ++aChar) {
    switch (*aChar) {
    case '&': theOut.append("&amp;"); break;
    case '<': theOut.append("&lt;"); break;
    case '>': theOut.append("&gt;"); break;
    case '"': theOut.append("&quot;"); break;
    case '\'': theOut.append("&apos;"); break;
    default: theOut.push_back(*aChar); break;
    }
  }
}
