// The expat element tree and the byte-level steps around it: line
// pre-processing, value restoring, escaping, line reading.
#include "tlrx_description_section.h"
#include "tlrx_test_support.h"
#include "tlrx_xml_element_tree.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <string>

namespace {

class XmlTreeTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }
  void TearDown() override { EXPECT_EQ(fdfScratchBuffersInUse(), 0); }
  bool parse(CXmlElementTree &theTree, const std::string &theText, size_t theMaxLine = CTLRX_XML_MAX_LINE) {
    tlrxWriteFile(mDir.file("t.xml"), theText);
    return theTree.parseFile(mDir.file("t.xml").c_str(), theMaxLine);
  }
};

std::string preprocess(const std::string &theLine) {
  std::string aOut;
  fdfPreprocessXmlLine(theLine.data(), theLine.size(), aOut);
  return aOut;
}

std::string escape(const char *theText) {
  std::string aOut;
  fdfEscapeXmlText(theText, aOut);
  return aOut;
}

} // namespace

TEST(XmlTextSteps, PreprocessingReplacesEntitiesHighBytesAndLatin1Letters) {
  EXPECT_EQ(preprocess("a&quot;&apos;&amp;&lt;&gt;&#38;&amp b"), "a##quot##apos##amp##lt##gt&#38;&amp b");
  // Bytes 128..164: "####BIG" and the byte minus 80; 165 and above pass.
  EXPECT_EQ(preprocess("\x80\x85\xA4\xA5"), "####BIG0####BIG5####BIGT\xA5");
  // Latin-1 letters outside UTF-8 sequences are folded; inside they pass.
  EXPECT_EQ(preprocess("\xE9\xF1\xFC\xB0\xF6"), "enudo");
  // Bytes of a well-formed UTF-8 sequence are never folded nor marked.
  EXPECT_EQ(preprocess("\xC3\xA9 \xC2\xB0 \xE9\x80\x80 \xC4\x8C"), "\xC3\xA9 \xC2\xB0 \xE9\x80\x80 \xC4\x8C");
  // A literal '#' is marked, so that a literal "##amp" survives restoring
  // (the '#' of a character reference is left to the parser); a stray 0x8C
  // passes instead of turning into '<'.
  EXPECT_EQ(preprocess("a#b##amp&#38;"), "a##hashb##hash##hashamp&#38;");
  EXPECT_EQ(preprocess("\x86\x8C\x8D"), "####BIG6\x8C####BIG=");
  EXPECT_EQ(preprocess(std::string("a\0b", 3)), std::string("a\0b", 3));
}

TEST(XmlTextSteps, RestoringInvertsThePreprocessingOfValues) {
  EXPECT_EQ(fdfRestoreXmlText("##quot##apos##amp##lt##gt"), "\"'&<>");
  EXPECT_EQ(fdfRestoreXmlText("####BIG5x####BIGT"), "\x85x\xA4");
  EXPECT_EQ(fdfRestoreXmlText("#a##b###amp####BIG"), "#a##b#&####BIG");
  EXPECT_EQ(fdfRestoreXmlText("##hash##hashamp##hash"), "##amp#");
  for (int aByte = 1; aByte < 256; ++aByte) {
    const std::string aText = std::string("v") + static_cast<char>(aByte) + "&<";
    EXPECT_EQ(fdfRestoreXmlText(preprocess(escape(aText.c_str()))), aByte == 0xE9   ? "ve&<"
                                                                     : aByte == 0xF1 ? "vn&<"
                                                                     : aByte == 0xFC ? "vu&<"
                                                                     : aByte == 0xB0 ? "vd&<"
                                                                     : aByte == 0xF6 ? "vo&<"
                                                                                     : aText)
        << aByte;
  }
}

TEST(XmlTextSteps, EscapingCoversTheFiveCharacters) {
  EXPECT_EQ(escape("<a href=\"x\">'&'</a>\x85"), "&lt;a href=&quot;x&quot;&gt;&apos;&amp;&apos;&lt;/a&gt;\x85");
}

TEST_F(XmlTreeTest, TreeHoldsNamesAttributesTextAndOrder) {
  CXmlElementTree aTree;
  ASSERT_TRUE(parse(aTree, "<?xml version=\"1.0\" ?>\r\n<root a = \"1\" b='x&amp;y'>\r\n"
                           "  <v>one <!-- c --> two</v>\n  <e/>\n  <v>3</v><w>&#233;&#x4E2D;</w>\n</root>"));
  const CXmlElement *aRoot = aTree.getRoot();
  ASSERT_NE(aRoot, nullptr);
  EXPECT_EQ(aRoot->getName(), "root");
  EXPECT_STREQ(aRoot->getAttribute("a"), "1");
  EXPECT_STREQ(aRoot->getAttribute("b"), "x&y"); // attribute values are restored too
  EXPECT_EQ(aRoot->getAttribute("c"), nullptr);
  ASSERT_EQ(aRoot->getChildren().size(), 4u);
  EXPECT_EQ(aRoot->findChild("v")->getText(), "one  two");
  EXPECT_FALSE(aRoot->findChild("e")->hasText());
  EXPECT_EQ(aRoot->getChildren()[2]->getText(), "3");
  EXPECT_EQ(aRoot->findChild("w")->getText(), "\xE9\xE4\xB8\xAD");
  EXPECT_EQ(aRoot->findChild("w")->getDepth(), 1);
  EXPECT_EQ(aTree.getElementCount(), 5u);
  EXPECT_EQ(aTree.getElement(3).getName(), "v");
  EXPECT_EQ(aTree.getElement(3).getIndex(), 3u);
  EXPECT_EQ(aTree.getElement(3).getParent(), aRoot);
}

TEST_F(XmlTreeTest, DeepNestingNeitherRecursesNorFails) {
  std::string aText;
  const int aDepth = 200000;
  for (int i = 0; i < aDepth; ++i)
    aText += "<a>\n";
  for (int i = 0; i < aDepth; ++i)
    aText += "</a>\n";
  CXmlElementTree aTree;
  ASSERT_TRUE(parse(aTree, aText));
  EXPECT_EQ(aTree.getElementCount(), static_cast<size_t>(aDepth));
  EXPECT_EQ(aTree.getElement(aDepth - 1).getDepth(), aDepth - 1);
}

TEST_F(XmlTreeTest, LineLimitCountsTheContentOnly) {
  CXmlElementTree aTree;
  EXPECT_TRUE(parse(aTree, "<a>123456</a>\r\n", 13));
  EXPECT_TRUE(parse(aTree, "<a>123456</a>", 13));
  EXPECT_FALSE(parse(aTree, "<a>1234567</a>\n", 13));
  EXPECT_NE(aTree.getErrorText().find("line longer than 13 characters at line 1"), std::string::npos);
  EXPECT_TRUE(aTree.empty());
  EXPECT_FALSE(parse(aTree, "<a>\n</b>\n"));
  EXPECT_NE(aTree.getErrorText().find("mismatched tag at line 2"), std::string::npos);
  EXPECT_FALSE(aTree.parseFile(mDir.file("none.xml").c_str(), 100));
}

TEST(XmlRawLines, LinesKeepEveryByteAndReportOverflow) {
  const std::string aContent = std::string("ab\0c\n", 5) + "0123456789\nlast";
  FILE *aFile = fmemopen(const_cast<char *>(aContent.data()), aContent.size(), "rb");
  ASSERT_NE(aFile, nullptr);
  char aBuffer[8];
  bool aTooLong = true;
  EXPECT_EQ(fdfReadRawLine(aFile, aBuffer, sizeof aBuffer, aTooLong), 5);
  EXPECT_FALSE(aTooLong);
  EXPECT_EQ(std::string(aBuffer, 5), std::string("ab\0c\n", 5));
  EXPECT_EQ(fdfReadRawLine(aFile, aBuffer, sizeof aBuffer, aTooLong), 7);
  EXPECT_TRUE(aTooLong);
  EXPECT_STREQ(aBuffer, "0123456");
  EXPECT_EQ(fdfReadRawLine(aFile, aBuffer, sizeof aBuffer, aTooLong), 4);
  EXPECT_FALSE(aTooLong);
  EXPECT_STREQ(aBuffer, "last");
  EXPECT_EQ(fdfReadRawLine(aFile, aBuffer, sizeof aBuffer, aTooLong), -1);
  std::fclose(aFile);
}
