// Co-registration of a simulated SLC pair, for bench_coregistration.sh:
//   bench_coregistration <pair root> <parameter xml> <output parameter file>
// runs the procedure on <root>_1 and <root>_2 and prints one line: wall and
// CPU seconds of the whole procedure, fine windows, lines read and the
// fitted constant terms. The runtime is started from TELLURIX_INIT_DIR like
// the main program.
#include <chrono>
#include <cstdio>
#include <ctime>
#include <string>

#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_init_from_xml_schema.h"
#include "tlrx_interf_utility.h"

int main(int argc, char **argv) {
  if (argc < 4) {
    std::fprintf(stderr, "usage: %s <pair root> <parameter xml> <output parameter file>\n", argv[0]);
    return 2;
  }
  try {
    fdfInitEnvironment(true, "bench_coregistration");
    CDescription aParameters;
    fdfLoadCommandParameters("PARAMETERS_INFO_MAIN_FE_COHERENCE_CMD",
                             {"COREGISTRATION_CMD", "MAIN_CMD", "INTERF_CMD", "FLAT_CMD"}, argv[2], aParameters);
    STLRXCoregSwitches aSwitches;
    aSwitches.mCommandFile = argv[2];
    const std::string aRoot = argv[1];
    const std::clock_t aCpu = std::clock();
    const auto aStart = std::chrono::steady_clock::now();
    const STLRXCoregResult aResult = fdfCoregistration((aRoot + "_1").c_str(), (aRoot + "_2").c_str(), argv[3],
                                                       aParameters, 1, 1, aSwitches);
    const double aWall = std::chrono::duration<double>(std::chrono::steady_clock::now() - aStart).count();
    std::printf("wall %.3f cpu %.3f windows %d lines_read %lld range0 %.4f azimuth0 %.4f\n", aWall,
                double(std::clock() - aCpu) / CLOCKS_PER_SEC, aResult.mFineWindows,
                static_cast<long long>(aResult.mLinesRead), aResult.mRangePoly.at(0), aResult.mAzimuthPoly.at(0));
  } catch (const CErrorExceptionManager &aError) {
    std::fprintf(stderr, "bench_coregistration: error %d: %s\n", static_cast<int>(aError.mCode), aError.mMessage);
    return 1;
  }
  return 0;
}
