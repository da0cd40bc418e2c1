// Plain main of the replay programs: runs every file given, and every file
// of every folder given (in name order), through the fuzz target once.
#include "tlrx_fuzz_support.h"

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <vector>

int main(int theArgc, char **theArgv) {
  LLVMFuzzerInitialize(&theArgc, &theArgv);
  std::vector<std::filesystem::path> aInputs;
  for (int i = 1; i < theArgc; ++i) {
    const std::filesystem::path aPath(theArgv[i]);
    if (std::filesystem::is_directory(aPath)) {
      for (const auto &aEntry : std::filesystem::directory_iterator(aPath))
        if (aEntry.is_regular_file())
          aInputs.push_back(aEntry.path());
    } else {
      aInputs.push_back(aPath);
    }
  }
  std::sort(aInputs.begin(), aInputs.end());
  for (const auto &aPath : aInputs) {
    std::ifstream aIn(aPath, std::ios::binary);
    if (!aIn) {
      std::fprintf(stderr, "cannot read %s\n", aPath.c_str());
      return 1;
    }
    const std::vector<char> aData((std::istreambuf_iterator<char>(aIn)), std::istreambuf_iterator<char>());
    LLVMFuzzerTestOneInput(reinterpret_cast<const uint8_t *>(aData.data()), aData.size());
  }
  std::printf("replayed %zu inputs\n", aInputs.size());
  return aInputs.empty() ? 1 : 0;
}
