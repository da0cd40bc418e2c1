// Test support: temporary folders, small file helpers, the library
// environment in throw mode, and running the built executables.
#pragma once

#include <complex>
#include <map>
#include <string>
#include <vector>

// The thread counts a run is compared over: one, two, and more than a small
// machine has cores.
constexpr int CTLRX_TEST_THREADS[] = {1, 2, 3};

// TELLURIX_THREADS = theValue within a scope ("" unsets it), the count read
// again on entry and at the end.
class CTestThreads {
public:
  explicit CTestThreads(int theCount) : CTestThreads(std::to_string(theCount)) {}
  explicit CTestThreads(const std::string &theValue);
  ~CTestThreads();
  CTestThreads(const CTestThreads &) = delete;
  CTestThreads &operator=(const CTestThreads &) = delete;
};

// A fresh folder under /tmp, removed with its contents at destruction.
class CTempDir {
public:
  CTempDir();
  ~CTempDir();
  CTempDir(const CTempDir &) = delete;
  CTempDir &operator=(const CTempDir &) = delete;
  // The folder with a trailing "/".
  const std::string &path() const { return mPath; }
  std::string file(const std::string &theName) const { return mPath + theName; }

private:
  std::string mPath;
};

std::string tlrxReadFile(const std::string &thePath);
void tlrxWriteFile(const std::string &thePath, const std::string &theContent);
bool tlrxFileExists(const std::string &thePath);
std::vector<std::string> tlrxReadLines(const std::string &thePath);

std::string tlrxBuildDir();
std::string tlrxBinPath(const std::string &theName);
std::string tlrxConfigDir(); // build-tree configuration folder
std::string tlrxDataDir();   // installed data files, in the source tree

// Starts the runtime with the build-tree configuration, the given folder as
// working and batch folder, then switches to throw mode.
void tlrxStartLibraryEnvironment(const std::string &theWorkDir);

// Writes a configuration file into theDir from the build-tree one, with
// lines replaced (1-based line number -> text) and the file cut to theLines.
void tlrxWriteConfiguration(const std::string &theDir, const std::map<int, std::string> &theReplace = {},
                            int theLines = 14);

struct STLRXRun {
  int mExitStatus = -1;
  std::string mOutput; // standard output and error of the run
};
// Runs bin/theProgram with theArgs in theWorkDir as working and batch folder
// (also its current folder); theEnv adds or overrides variables ("" unsets).
STLRXRun tlrxRun(const std::string &theProgram, const std::vector<std::string> &theArgs,
                 const std::string &theWorkDir, const std::map<std::string, std::string> &theEnv = {});
// Shortcut for the main program with one command line.
STLRXRun tlrxRunMain(const std::string &theCommandLine, const std::string &theWorkDir,
                     const std::map<std::string, std::string> &theEnv = {});

// A small raster with its standard header, written through the program's own
// raster file and header writer (the runtime must be started).
struct STLRXTestRaster {
  int mLines = 4;
  int mPixels = 5;
  std::vector<double> mValues; // lines x pixels, line after line
  std::string mCellType = "FLOAT";
  std::string mDataUnits = "POWER";
  bool mHasNull = false;
  double mNull = 0.0;
  std::string mAcquisitionTime; // "" for none
  std::vector<std::complex<float>> mCells; // the values of complex cell types
};
void tlrxWriteTestRaster(const std::string &theName, const STLRXTestRaster &theRaster);
// All cells of a raster as double, through the raster file.
std::vector<double> tlrxReadTestRaster(const std::string &theName);
