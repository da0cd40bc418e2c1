// Line-by-line reading through CRasterFile::getLine against a plain read() of
// the same file from the page cache. Each round times the baselines and every
// case one after the other, so that load changes on a shared machine hit them
// alike; the medians of the per-round throughput ratios (raster file /
// baseline) are printed, for wall time and for the thread's CPU time (user
// and system), with the allocations made inside the reading loop.
//
// Usage: bench_raster_read [folder] [rounds]   (default /tmp, 15 rounds)
#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <fcntl.h>
#include <functional>
#include <new>
#include <string>
#include <unistd.h>
#include <vector>

#include "tlrx_errors.h"
#include "tlrx_raster_file.h"

namespace {

// Allocation counter: every operator new of the process passes here.
long long sAllocations = 0;

constexpr int32_t CLines = 4096;
constexpr int32_t CPixels = 4096;

bool machineIsMSBF() {
  const uint16_t aProbe = 1;
  uint8_t aFirst;
  std::memcpy(&aFirst, &aProbe, 1);
  return aFirst == 0;
}

struct STimes {
  double mWall;
  double mCpu;
};

double cpuSeconds() {
  timespec aTime;
  clock_gettime(CLOCK_THREAD_CPUTIME_ID, &aTime);
  return static_cast<double>(aTime.tv_sec) + static_cast<double>(aTime.tv_nsec) * 1e-9;
}

STimes timesOf(const std::function<void()> &theBody) {
  const double aCpu = cpuSeconds();
  const auto aStart = std::chrono::steady_clock::now();
  theBody();
  return {std::chrono::duration<double>(std::chrono::steady_clock::now() - aStart).count(), cpuSeconds() - aCpu};
}

double median(std::vector<double> theValues) {
  std::sort(theValues.begin(), theValues.end());
  return theValues[theValues.size() / 2];
}

// FLOAT cells with a sprinkle of no-data values, in the given byte order,
// after theHeader bytes and with theFix bytes of prefix and suffix per line.
void makeRaster(const std::string &thePath, bool theMSBF, int32_t theFix) {
  FILE *aFile = std::fopen(thePath.c_str(), "wb");
  if (aFile == nullptr) {
    std::perror(thePath.c_str());
    std::exit(1);
  }
  std::vector<float> aLine(CPixels);
  const std::vector<char> aPad(static_cast<size_t>(theFix), 0);
  for (int32_t r = 0; r < CLines; ++r) {
    for (int32_t c = 0; c < CPixels; ++c) {
      float aValue = (r * 13 + c * 7) % 1000 == 0 ? -9999.0f : static_cast<float>(r + c) * 0.01f;
      if (theMSBF != machineIsMSBF()) {
        uint32_t aWord;
        std::memcpy(&aWord, &aValue, 4);
        aWord = __builtin_bswap32(aWord);
        std::memcpy(&aValue, &aWord, 4);
      }
      aLine[c] = aValue;
    }
    std::fwrite(aPad.data(), 1, aPad.size(), aFile);
    std::fwrite(aLine.data(), 4, aLine.size(), aFile);
    std::fwrite(aPad.data(), 1, aPad.size(), aFile);
  }
  std::fclose(aFile);
}

// The baseline: read() of the whole file in chunks, touching nothing.
void plainRead(const std::string &thePath, size_t theChunk, std::vector<char> &theBuffer) {
  const int aFd = open(thePath.c_str(), O_RDONLY);
  theBuffer.resize(theChunk);
  while (read(aFd, theBuffer.data(), theChunk) > 0) {
  }
  close(aFd);
}

template <typename T>
void rasterRead(const CRasterFileParam &theParam, int32_t theCache, std::vector<T> &theLine, double &theSink,
                long long *theAllocationsInLoop) {
  CRasterFile aFile;
  aFile.open_read(theParam);
  if (theCache > 0)
    aFile.setBuffer(theCache);
  theLine.resize(CPixels);
  aFile.getLine(theLine.data(), 0); // first access allocates the line buffer
  const long long aBefore = sAllocations;
  for (int32_t r = 0; r < CLines; ++r)
    aFile.getLine(theLine.data(), r);
  if (theAllocationsInLoop != nullptr)
    *theAllocationsInLoop = sAllocations - aBefore;
  theSink += theLine[CPixels / 2];
  aFile.close();
}

} // namespace

void *operator new(size_t theSize) {
  ++sAllocations;
  if (void *aBlock = std::malloc(theSize == 0 ? 1 : theSize))
    return aBlock;
  throw std::bad_alloc();
}
void operator delete(void *theBlock) noexcept { std::free(theBlock); }
void operator delete(void *theBlock, size_t) noexcept { std::free(theBlock); }

int main(int argc, char **argv) {
  const std::string aFolder = argc > 1 ? argv[1] : "/tmp";
  const int aRounds = argc > 2 ? std::max(1, std::atoi(argv[2])) : 15;
  const std::string aNative = aFolder + "/tlrx_bench_native.raw";
  const std::string aSwapped = aFolder + "/tlrx_bench_swapped.raw";
  const std::string aFramed = aFolder + "/tlrx_bench_framed.raw";
  makeRaster(aNative, machineIsMSBF(), 0);
  makeRaster(aSwapped, !machineIsMSBF(), 0);
  makeRaster(aFramed, machineIsMSBF(), 16);

  CRasterFileParam aParam;
  aParam.mFileName = aNative;
  aParam.mNrOfLinesPerImage = CLines;
  aParam.mNrOfPixelsPerLine = CPixels;
  aParam.mCellType = CTLRX_CELL_FLOAT;
  aParam.mNullCellValue = -9999.0;
  CRasterFileParam aSwappedParam = aParam;
  aSwappedParam.mFileName = aSwapped;
  aSwappedParam.mMSBF = !machineIsMSBF();
  CRasterFileParam aFramedParam = aParam;
  aFramedParam.mFileName = aFramed;
  aFramedParam.mRowPrefix = 16;
  aFramedParam.mRowSuffix = 16;

  std::vector<char> aBuffer;
  std::vector<float> aFloats;
  std::vector<double> aDoubles;
  double aSink = 0.0;
  for (const std::string &aPath : {aNative, aSwapped, aFramed}) // page cache warm-up
    plainRead(aPath, 1 << 20, aBuffer);

  const double aMegabytes = static_cast<double>(CLines) * CPixels * 4 / 1e6;
  long long aAllocations = -1;
  struct SCase {
    const char *mName;
    std::function<void()> mBody;
    std::vector<double> mWall[2]; // ratios against the 1 MiB and the per-line baseline
    std::vector<double> mCpu[2];
    std::vector<double> mSpeed;
  };
  std::vector<SCase> aCases = {
      {"getLine<float>, no cache", [&] { rasterRead<float>(aParam, 0, aFloats, aSink, &aAllocations); }, {}, {}, {}},
      {"getLine<float>, cache of 64 lines", [&] { rasterRead<float>(aParam, 64, aFloats, aSink, nullptr); }, {}, {},
       {}},
      {"getLine<double>, no cache", [&] { rasterRead<double>(aParam, 0, aDoubles, aSink, nullptr); }, {}, {}, {}},
      {"getLine<float>, swapped byte order", [&] { rasterRead<float>(aSwappedParam, 0, aFloats, aSink, nullptr); },
       {}, {}, {}},
      {"getLine<float>, 16-byte prefix and suffix",
       [&] { rasterRead<float>(aFramedParam, 0, aFloats, aSink, nullptr); }, {}, {}, {}},
  };
  std::vector<double> aBaseSpeed[2];
  for (int aRound = 0; aRound < aRounds; ++aRound) {
    const STimes aBase[2] = {timesOf([&] { plainRead(aNative, 1 << 20, aBuffer); }),
                             timesOf([&] { plainRead(aNative, CPixels * 4, aBuffer); })};
    for (int b = 0; b < 2; ++b)
      aBaseSpeed[b].push_back(aMegabytes / aBase[b].mWall);
    for (SCase &aCase : aCases) {
      const STimes aTimes = timesOf(aCase.mBody);
      aCase.mSpeed.push_back(aMegabytes / aTimes.mWall);
      for (int b = 0; b < 2; ++b) {
        aCase.mWall[b].push_back(aBase[b].mWall / aTimes.mWall);
        aCase.mCpu[b].push_back(aBase[b].mCpu / aTimes.mCpu);
      }
    }
  }
  std::printf("file %d x %d FLOAT, %.1f MB, %d interleaved rounds, medians\n", CLines, CPixels, aMegabytes, aRounds);
  std::printf("%-44s %8.0f MB/s\n", "baseline read() 1 MiB chunks", median(aBaseSpeed[0]));
  std::printf("%-44s %8.0f MB/s\n", "baseline read() one line per call", median(aBaseSpeed[1]));
  std::printf("%-44s %8s  %-23s %-23s\n", "", "", "ratio to 1 MiB read()", "ratio to line read()");
  std::printf("%-44s %8s  %-11s %-11s %-11s %-11s\n", "case", "MB/s", "wall", "cpu", "wall", "cpu");
  for (const SCase &aCase : aCases)
    std::printf("%-44s %8.0f  %-11.2f %-11.2f %-11.2f %-11.2f\n", aCase.mName, median(aCase.mSpeed),
                median(aCase.mWall[0]), median(aCase.mCpu[0]), median(aCase.mWall[1]), median(aCase.mCpu[1]));
  std::printf("allocations inside the getLine<float> loop: %lld for %d lines\n", aAllocations, CLines);
  std::printf("(checksum %g)\n", aSink);
  for (const std::string &aPath : {aNative, aSwapped, aFramed})
    unlink(aPath.c_str());
  return 0;
}
