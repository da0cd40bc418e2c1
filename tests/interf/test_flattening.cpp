// Flattening in throw mode: the result against z e^(-i phase) computed here,
// the no-data rules of both inputs, the result header, the failures with
// their codes, and the closing operation.
#include "tlrx_description_section.h"
#include "tlrx_description_test_support.h"
#include "tlrx_errors.h"
#include "tlrx_flattening.h"
#include "tlrx_header_expect.h"
#include "tlrx_raster_file.h"
#include "tlrx_slc_test_support.h"
#include "tlrx_test_support.h"

#include <gtest/gtest.h>

#include <cmath>
#include <complex>

namespace {

class Flattening : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }

  // A phase raster of 12 x 16 cells: 0.3 p - 0.1 l radians, theNull at the
  // cells of line 4 from column 5 on (declared only when theHasNull).
  std::string phase(const std::string &theName, bool theHasNull, int theLines = 12) {
    STLRXTestRaster aPhase;
    aPhase.mLines = theLines;
    aPhase.mPixels = 16;
    aPhase.mDataUnits = "SYNTHETIC INTERFEROGRAMME";
    aPhase.mHasNull = theHasNull;
    aPhase.mNull = -9999;
    for (int l = 0; l < theLines; ++l)
      for (int p = 0; p < 16; ++p)
        aPhase.mValues.push_back(l == 4 && p >= 5 && theHasNull ? -9999.0 : 0.3 * p - 0.1 * l);
    tlrxWriteTestRaster(mDir.file(theName), aPhase);
    return mDir.file(theName);
  }

  int run(std::vector<std::string> theArgs, int (*theProgram)(int, char **) = tlrx_flattening) {
    theArgs.insert(theArgs.begin(), "tlrx_flattening");
    return tlrxCallStep(theProgram, theArgs);
  }
};

} // namespace

// z e^(-i phase) cell by cell with the magnitude kept; a no-data cell of
// either input is 0 + 0i; a phase of exactly 0 without a declared null value
// is a phase like any other.
TEST_F(Flattening, RemovesThePhaseAndKeepsTheMagnitude) {
  const std::string aRoot = tlrxSimulateSlc(mDir, "pair", {"--lines", "12", "--pixels", "16"});
  {
    CRasterFile aRaster; // a no-data cell in the interferogram
    aRaster.open_read_write((aRoot + "_1").c_str());
    std::vector<std::complex<float>> aLine(16);
    aRaster.getComplexLine(aLine.data(), 2);
    aLine[3] = std::complex<float>();
    aRaster.putComplexLine(2, aLine.data());
    aRaster.close();
  }
  for (const bool aHasNull : {true, false}) {
    SCOPED_TRACE(aHasNull);
    ASSERT_EQ(run({aRoot + "_1", phase("sint", aHasNull), mDir.file("out"), "NotOK", "NotOK", "NotOK"}), 0);
    const STLRXTestSlc aZ = tlrxReadSlc(aRoot + "_1"), aFlat = tlrxReadSlc(mDir.file("out_dint"));
    ASSERT_EQ(aFlat.mCells.size(), 12u * 16u);
    for (int l = 0; l < 12; ++l)
      for (int p = 0; p < 16; ++p) {
        const bool aNull = (l == 2 && p == 3) || (aHasNull && l == 4 && p >= 5);
        const std::complex<double> aWant =
            aNull ? std::complex<double>() : std::complex<double>(aZ.at(l, p)) * std::polar(1.0, -(0.3 * p - 0.1 * l));
        EXPECT_LT(std::abs(std::complex<double>(aFlat.at(l, p)) - aWant), 1e-6 * (1 + std::abs(aWant))) << l << "," << p;
        if (!aNull)
          EXPECT_NEAR(std::abs(aFlat.at(l, p)), std::abs(aZ.at(l, p)), 1e-6 * std::abs(aZ.at(l, p)));
      }
    tlrxExpectHeader(mDir.file("out_dint"),
                     "CellType=FLOAT_COMPLEX;DataUnits=FLATTENED INTERFEROGRAMME;NrOfLinesPerImage=12;"
                     "NrOfPixelsPerLine=16;NullCellValue=0;HeaderOffset=0");
  }
}

// Any thread count gives the bytes and count of one: 101 lines are several
// bands with a last block cut short. A file cut short mid-image fails with
// the same code and leaves no result.
TEST_F(Flattening, ThreadCountDoesNotChangeTheResult) {
  const int aLines = 101, aPixels = 53;
  const std::string aRoot = tlrxSimulateSlc(mDir, "pair", {"--lines", "101", "--pixels", "53"});
  STLRXTestRaster aPhase;
  aPhase.mLines = aLines;
  aPhase.mPixels = aPixels;
  aPhase.mHasNull = true;
  aPhase.mNull = -9999;
  int aFlattened = 0;
  for (int i = 0; i < aLines * aPixels; ++i) {
    aPhase.mValues.push_back(i % 11 == 4 ? -9999.0 : 0.01 * i);
    aFlattened += i % 11 == 4 ? 0 : 1;
  }
  tlrxWriteTestRaster(mDir.file("sint"), aPhase);
  std::string aFirst;
  for (const int aThreads : CTLRX_TEST_THREADS) {
    SCOPED_TRACE(aThreads);
    const CTestThreads aSetting(aThreads);
    const std::string aOut = mDir.file("t" + std::to_string(aThreads));
    ASSERT_EQ(run({aRoot + "_1", mDir.file("sint"), aOut}), 0);
    const std::string aBytes = tlrxReadFile(aOut + "_dint");
    ASSERT_EQ(aBytes.size(), size_t(aLines) * aPixels * 8);
    if (aThreads == 1)
      aFirst = aBytes;
    EXPECT_TRUE(aBytes == aFirst);
  }
  const std::string aLog = tlrxReadFile(mDir.file("Process.log")), aCount = "flattened pixels: " +
                           std::to_string(aFlattened) + " of " + std::to_string(aLines * aPixels) + "\n";
  size_t aSeen = 0;
  for (size_t i = aLog.find(aCount); i != std::string::npos; i = aLog.find(aCount, i + 1))
    ++aSeen;
  EXPECT_EQ(aSeen, 3u);
  // Lines 70 on are missing from the interferogram's file.
  tlrxWriteFile(aRoot + "_1", tlrxReadFile(aRoot + "_1").substr(0, size_t(70) * aPixels * 8));
  std::vector<std::pair<int32_t, std::string>> aFailures;
  for (const int aThreads : CTLRX_TEST_THREADS) {
    const CTestThreads aSetting(aThreads);
    std::string aMessage;
    const int32_t aCode = tlrxCodeOf([&] { run({aRoot + "_1", mDir.file("sint"), mDir.file("cut")}); }, &aMessage);
    aFailures.emplace_back(aCode, aMessage);
    EXPECT_FALSE(tlrxFileExists(mDir.file("cut_dint"))) << aThreads;
  }
  EXPECT_NE(aFailures[0].first, 0);
  EXPECT_EQ(aFailures, decltype(aFailures)(aFailures.size(), aFailures[0]));
}

TEST_F(Flattening, FailuresRaiseTheirCodes) {
  const std::string aRoot = tlrxSimulateSlc(mDir, "pair", {"--lines", "12", "--pixels", "16"});
  const std::string z = aRoot + "_1", aPhase = phase("sint", true), aShort = phase("short", true, 10),
                    aClash = phase("x_dint", true); // the result of root x
  STLRXTestRaster aReal;
  aReal.mLines = 12;
  aReal.mPixels = 16;
  aReal.mValues.assign(12 * 16, 1.0);
  tlrxWriteTestRaster(mDir.file("real"), aReal);
  const std::string o = mDir.file("o");
  tlrxExpectStepFailures(
      tlrx_flattening, {
      {{z, aPhase}, CTLRX_ERR_ARGUMENTS, ""},
      {{z, mDir.file("none"), o}, CTLRX_ERR_FILE_OPEN, mDir.file("none") + "_hdr"},
      {{mDir.file("real"), aPhase, o}, CTLRX_ERR_IMAGES_INCOMPATIBLE, "FLOAT (interferogram " + mDir.file("real") + ")"},
      {{z, aRoot + "_2", o}, CTLRX_ERR_IMAGES_INCOMPATIBLE, "FLOAT_COMPLEX (synthetic phase " + aRoot + "_2)"},
      {{z, aShort, o}, CTLRX_ERR_SIZE_MISMATCH, aShort + ": 10 x 16, the interferogram 12 x 16"},
      {{z, aClash, mDir.file("x")}, CTLRX_ERR_PARAMETER_FILE, aClash},
      },
      o + "_dint");

}

// With the chain's 6 arguments the closing removes the interferogram and the
// synthetic phase with their headers; with fewer it removes nothing.
TEST_F(Flattening, ClosingRemovesBothInputsOnlyWithTheChainsArguments) {
  const std::string aRoot = tlrxSimulateSlc(mDir, "pair", {"--lines", "12", "--pixels", "16"});
  const std::string aPhase = phase("sint", false);
  const std::vector<std::string> aFiles = {aRoot + "_1", aRoot + "_1.sml", aPhase, aPhase + ".sml"};
  for (const std::string &aFile : aFiles)
    ASSERT_TRUE(tlrxFileExists(aFile)) << aFile;
  EXPECT_EQ(run({aRoot + "_1", aPhase, mDir.file("out"), "NotOK", "NotOK"}, tlrx_flattening_close), 0);
  for (const std::string &aFile : aFiles)
    EXPECT_TRUE(tlrxFileExists(aFile)) << aFile;
  EXPECT_EQ(run({aRoot + "_1", aPhase, mDir.file("out"), "NotOK", "NotOK", "NotOK"}, tlrx_flattening_close), 0);
  for (const std::string &aFile : aFiles)
    EXPECT_FALSE(tlrxFileExists(aFile)) << aFile;
  EXPECT_TRUE(tlrxFileExists(aRoot + "_2"));
}
