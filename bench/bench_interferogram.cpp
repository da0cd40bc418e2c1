// The interferogram generator for bench_interferogram.sh:
//   bench_interferogram resample <pair root> <range shift> <azimuth shift>
//     resamples <root>_2 onto the master grid line by line (constant shifts
//     as polynomials, the Doppler centroid from the header) and prints the
//     wall and CPU seconds and the output pixels per CPU second;
//   bench_interferogram run <argument>...
//     runs the interferogram step with these arguments, as the chain does;
//   bench_interferogram coherence <argument>...
//     runs the coherence step likewise.
// The runtime is started from TELLURIX_INIT_DIR like the main program.
#include <chrono>
#include <complex>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <string>
#include <vector>

#include "tlrx_cc_ave.h"
#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_hires_interf_SLC_with_sint.h"
#include "tlrx_raster_file.h"
#include "tlrx_slave_resampler.h"
#include "tlrx_standard_header.h"

namespace {

int resample(const std::string &theRoot, double theRange, double theAzimuth) {
  const std::string aSlaveName = theRoot + "_2";
  CDescription aHeader;
  fdfReadStandardHeader(aSlaveName.c_str(), aHeader);
  CRasterFile aSlave;
  aSlave.open_read(aSlaveName.c_str(), aHeader);
  const int32_t aLines = aSlave.getNrOfLinesPerImage(), aPixels = aSlave.getNrOfPixelsPerLine();
  std::vector<double> aCentroid;
  fdfDopplerFromHeader(aHeader, aPixels, aCentroid);
  CPolynomialShiftField aField({theRange, 0, 0}, {theAzimuth, 0, 0});
  // The lines are read before the clock starts: the resampling is measured.
  std::vector<std::complex<float>> aImage(static_cast<size_t>(aLines) * aPixels), aOut(aPixels);
  for (int32_t l = 0; l < aLines; ++l)
    aSlave.getComplexLine(aImage.data() + static_cast<size_t>(l) * aPixels, l);
  CSlaveResampler aResampler(aLines, aPixels, aPixels, aField, aCentroid,
                             [&](int32_t theLine, std::complex<float> *theCells) {
                               std::memcpy(theCells, aImage.data() + static_cast<size_t>(theLine) * aPixels,
                                           sizeof(std::complex<float>) * aPixels);
                             });
  const std::clock_t aCpu = std::clock();
  const auto aStart = std::chrono::steady_clock::now();
  double aCheck = 0;
  for (int32_t l = 0; l < aLines; ++l) {
    aResampler.resampleLine(l, aOut.data());
    aCheck += std::norm(aOut[static_cast<size_t>(l) % aPixels]);
  }
  const double aWall = std::chrono::duration<double>(std::chrono::steady_clock::now() - aStart).count();
  const double aCpuSeconds = double(std::clock() - aCpu) / CLOCKS_PER_SEC;
  std::printf("wall %.3f cpu %.3f mpixels_per_cpu_s %.1f check %.3g\n", aWall, aCpuSeconds,
              double(aLines) * aPixels / aCpuSeconds / 1e6, aCheck);
  return 0;
}

} // namespace

int main(int argc, char **argv) {
  if (argc < 3 || (std::strcmp(argv[1], "resample") == 0 && argc < 5)) {
    std::fprintf(stderr, "usage: %s resample <pair root> <range> <azimuth> | run <argument>... | coherence "
                         "<argument>...\n",
                 argv[0]);
    return 2;
  }
  try {
    fdfInitEnvironment(true, "bench_interferogram");
    if (std::strcmp(argv[1], "resample") == 0)
      return resample(argv[2], std::stod(argv[3]), std::stod(argv[4]));
    if (std::strcmp(argv[1], "coherence") == 0) {
      argv[1] = const_cast<char *>("tlrx_cc_ave");
      return tlrx_cc_ave(argc - 1, argv + 1);
    }
    argv[1] = const_cast<char *>("tlrx_hires_interf_SLC_with_sint");
    return tlrx_hires_interf_SLC_with_sint(argc - 1, argv + 1);
  } catch (const CErrorExceptionManager &aError) {
    std::fprintf(stderr, "bench_interferogram: error %d: %s\n", static_cast<int>(aError.mCode), aError.mMessage);
    return 1;
  }
}
