#include "tlrx_test_support.h"

#include "tlrx_envi_util.h"

#include "tlrx_enviroment.h"
#include "tlrx_errors.h"

#include <cstdlib>
#include <fstream>
#include <sstream>
#include <stdexcept>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

CTempDir::CTempDir() {
  char aTemplate[] = "/tmp/tlrx_test_XXXXXX";
  const char *aDir = mkdtemp(aTemplate);
  if (aDir == nullptr)
    throw std::runtime_error("mkdtemp failed");
  mPath = std::string(aDir) + "/";
}

CTempDir::~CTempDir() {
  if (std::getenv("TLRX_KEEP_TEST_DIRS") == nullptr)
    std::system(("rm -rf '" + mPath + "'").c_str());
}

std::string tlrxReadFile(const std::string &thePath) {
  std::ifstream aIn(thePath, std::ios::binary);
  std::ostringstream aText;
  aText << aIn.rdbuf();
  return aText.str();
}

void tlrxWriteFile(const std::string &thePath, const std::string &theContent) {
  std::ofstream aOut(thePath, std::ios::binary | std::ios::trunc);
  aOut << theContent;
}

bool tlrxFileExists(const std::string &thePath) {
  struct stat aStat;
  return stat(thePath.c_str(), &aStat) == 0;
}

std::vector<std::string> tlrxReadLines(const std::string &thePath) {
  std::vector<std::string> aLines;
  std::ifstream aIn(thePath);
  for (std::string aLine; std::getline(aIn, aLine);)
    aLines.push_back(aLine);
  return aLines;
}

std::string tlrxBuildDir() { return TLRX_TEST_BUILD_DIR; }
std::string tlrxBinPath(const std::string &theName) { return tlrxBuildDir() + "/bin/" + theName; }
std::string tlrxConfigDir() { return tlrxBuildDir() + "/etc/tellurix"; }
std::string tlrxDataDir() { return TLRX_TEST_DATA_DIR; }

void tlrxStartLibraryEnvironment(const std::string &theWorkDir) {
  setenv("TELLURIX_INIT_DIR", tlrxConfigDir().c_str(), 1);
  setenv("TELLURIX_WORKING_DIR", theWorkDir.c_str(), 1);
  setenv("TELLURIX_BATCH_DIR", theWorkDir.c_str(), 1);
  unsetenv("TELLURIX_WORKING_FILE");
  fdfInitEnvironment(true, "Tellurix test banner");
  fdfInstallEnviHeaderWriter();
}

void tlrxWriteConfiguration(const std::string &theDir, const std::map<int, std::string> &theReplace, int theLines) {
  std::vector<std::string> aLines = tlrxReadLines(tlrxConfigDir() + "/Tellurix_configuration.ini");
  std::ostringstream aOut;
  for (int i = 0; i < theLines && i < static_cast<int>(aLines.size()); ++i) {
    auto aFound = theReplace.find(i + 1);
    aOut << (aFound != theReplace.end() ? aFound->second : aLines[i]) << "\n";
  }
  tlrxWriteFile(theDir + "/Tellurix_configuration.ini", aOut.str());
}

static std::string tlrxQuote(const std::string &theText) {
  std::string aOut = "'";
  for (char aChar : theText)
    aOut += aChar == '\'' ? std::string("'\\''") : std::string(1, aChar);
  return aOut + "'";
}

// "cd DIR && exec env ... PROGRAM ARGS": the shell becomes the program, so
// a started run's process id is the program's own.
static std::string tlrxShellCommand(const std::string &theProgram, const std::vector<std::string> &theArgs,
                                    const std::string &theWorkDir, const std::map<std::string, std::string> &theEnv) {
  std::map<std::string, std::string> aEnv = {{"TELLURIX_INIT_DIR", tlrxConfigDir()},
                                             {"TELLURIX_WORKING_DIR", theWorkDir},
                                             {"TELLURIX_BATCH_DIR", theWorkDir},
                                             {"TELLURIX_WORKING_FILE", ""}};
  for (const auto &aEntry : theEnv)
    aEnv[aEntry.first] = aEntry.second;
  std::string aCommand = "cd " + tlrxQuote(theWorkDir) + " && exec env";
  // env takes its -u options before the assignments.
  for (const auto &aEntry : aEnv)
    if (aEntry.second.empty())
      aCommand += " -u " + aEntry.first;
  for (const auto &aEntry : aEnv)
    if (!aEntry.second.empty())
      aCommand += " " + aEntry.first + "=" + tlrxQuote(aEntry.second);
  aCommand += " " + tlrxQuote(theProgram.find('/') == std::string::npos ? tlrxBinPath(theProgram) : theProgram);
  for (const std::string &aArg : theArgs)
    aCommand += " " + tlrxQuote(aArg);
  return aCommand;
}

static int tlrxExitStatus(int theStatus) {
  return WIFEXITED(theStatus) ? WEXITSTATUS(theStatus) : 128 + WTERMSIG(theStatus);
}

STLRXRun tlrxRun(const std::string &theProgram, const std::vector<std::string> &theArgs,
                 const std::string &theWorkDir, const std::map<std::string, std::string> &theEnv) {
  const std::string aCommand = tlrxShellCommand(theProgram, theArgs, theWorkDir, theEnv) + " </dev/null 2>&1";
  STLRXRun aRun;
  FILE *aPipe = popen(aCommand.c_str(), "r");
  if (aPipe == nullptr)
    return aRun;
  char aBuffer[4096];
  size_t aRead;
  while ((aRead = fread(aBuffer, 1, sizeof aBuffer, aPipe)) > 0)
    aRun.mOutput.append(aBuffer, aRead);
  aRun.mExitStatus = tlrxExitStatus(pclose(aPipe));
  return aRun;
}

STLRXRun tlrxRunMain(const std::string &theCommandLine, const std::string &theWorkDir,
                     const std::map<std::string, std::string> &theEnv) {
  return tlrxRun("main_features_extraction", {theCommandLine}, theWorkDir, theEnv);
}

#include "tlrx_description_xml.h"
#include "tlrx_raster_file.h"
#include "tlrx_standard_header.h"

void tlrxWriteTestRaster(const std::string &theName, const STLRXTestRaster &theRaster) {
  CDescription aHeader;
  fdfDeclareStandardHeader(aHeader);
  aHeader.getField("RasterInfo.NrOfLinesPerImage").setInteger(theRaster.mLines);
  aHeader.getField("RasterInfo.NrOfPixelsPerLine").setInteger(theRaster.mPixels);
  aHeader.getField("RasterInfo.CellType").setString(theRaster.mCellType.c_str());
  aHeader.getField("RasterInfo.DataUnits").setString(theRaster.mDataUnits.c_str());
  aHeader.getField("RasterInfo.HeaderOffset").setInteger(0);
  aHeader.getField("RasterInfo.RowPrefix").setInteger(0);
  aHeader.getField("RasterInfo.RowSuffix").setInteger(0);
  if (theRaster.mHasNull)
    aHeader.getField("RasterInfo.NullCellValue").setDouble(theRaster.mNull);
  if (!theRaster.mAcquisitionTime.empty())
    fdfStampOtherInfo(aHeader, "ACQUISITION TIME", theRaster.mAcquisitionTime.c_str());
  CRasterFile aFile;
  aFile.open_write(theName.c_str(), aHeader);
  const int32_t aCellType = aFile.getCellType();
  if (!theRaster.mCells.empty()) {
    for (int l = 0; l < theRaster.mLines; ++l)
      aFile.putComplexLine(l, theRaster.mCells.data() + static_cast<size_t>(l) * theRaster.mPixels);
    aFile.close();
    fdfWriteStandardHeader(theName.c_str(), aHeader, true);
    return;
  }
  std::vector<uint8_t> aLine(static_cast<size_t>(fdfCellLineBytes(aCellType, theRaster.mPixels)));
  for (int l = 0; l < theRaster.mLines; ++l) {
    for (int p = 0; p < theRaster.mPixels; ++p) {
      const double aValue = theRaster.mValues.at(static_cast<size_t>(l) * theRaster.mPixels + p);
      switch (aCellType) {
      case CTLRX_CELL_FLOAT: reinterpret_cast<float *>(aLine.data())[p] = static_cast<float>(aValue); break;
      case CTLRX_CELL_DOUBLE: reinterpret_cast<double *>(aLine.data())[p] = aValue; break;
      case CTLRX_CELL_SHORT: reinterpret_cast<int16_t *>(aLine.data())[p] = static_cast<int16_t>(aValue); break;
      case CTLRX_CELL_UNSIGNED_SHORT: reinterpret_cast<uint16_t *>(aLine.data())[p] = static_cast<uint16_t>(aValue); break;
      case CTLRX_CELL_UNSIGNED_BYTE: aLine[p] = static_cast<uint8_t>(aValue); break;
      default: throw std::runtime_error("tlrxWriteTestRaster: unsupported cell type " + theRaster.mCellType);
      }
    }
    aFile.putLine(l, aLine.data());
  }
  aFile.close();
  fdfWriteStandardHeader(theName.c_str(), aHeader, true);
}

std::vector<double> tlrxReadTestRaster(const std::string &theName) {
  CRasterFile aFile;
  aFile.open_read(theName.c_str());
  const int32_t aPixels = aFile.getNrOfPixelsPerLine();
  std::vector<double> aValues(static_cast<size_t>(aFile.getNrOfLinesPerImage()) * aPixels);
  for (int32_t l = 0; l < aFile.getNrOfLinesPerImage(); ++l)
    aFile.getLine(&aValues[static_cast<size_t>(l) * aPixels], l);
  aFile.close();
  return aValues;
}

#include "tlrx_threads.h"

CTestThreads::CTestThreads(const std::string &theValue) {
  if (theValue.empty())
    unsetenv("TELLURIX_THREADS");
  else
    setenv("TELLURIX_THREADS", theValue.c_str(), 1);
  fdfResetThreadCount();
}

CTestThreads::~CTestThreads() {
  unsetenv("TELLURIX_THREADS");
  fdfResetThreadCount();
}
