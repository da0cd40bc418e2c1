// Flattening (see tlrx_flattening.h): bands of lines of both inputs.
#include "tlrx_flattening.h"

#include <cmath>
#include <complex>
#include <string>
#include <vector>

#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_header_numbers.h"
#include "tlrx_no_data.h"
#include "tlrx_raster_file.h"
#include "tlrx_result_files.h"
#include "tlrx_step_common.h"
#include "tlrx_line_bands.h"
#include "tlrx_threads.h"

namespace {

constexpr int CTLRX_FLATTENING_CLOSE_ARGUMENTS = 7;
// Lines per block of the parallel turn (each line stands alone).
constexpr int32_t CTLRX_FLATTENING_BLOCK = 16;

// The phase's no-data rule: its declared null value, and NaN. A header
// without one declares none (a phase of exactly 0 is a phase).
SNoData phaseNoData(const CDescription &theHeader) {
  const CDescriptionField *aField = theHeader.findField("RasterInfo.NullCellValue");
  return aField != nullptr && aField->holdsValue() ? SNoData(aField->getDouble()) : SNoData(std::nan(""));
}

// One line turned by minus its phase; a cell without data, zero or with a
// phase without data gives 0. Returns the cells turned.
int64_t fdfFlattenLine(std::complex<float> *theCells, const uint8_t *theValid, const double *thePhases,
                       int32_t thePixels, const SNoData &thePhaseNull) {
  int64_t aCount = 0;
  for (int32_t j = 0; j < thePixels; ++j) {
    std::complex<float> &z = theCells[j];
    const double aAngle = thePhases[j];
    if (theValid[j] == 0 || z == std::complex<float>() || thePhaseNull.isNullOrNaN(aAngle)) {
      z = std::complex<float>();
      continue;
    }
    // Turned in double: the magnitude is kept to float rounding.
    double aSin = 0.0, aCos = 1.0;
    ::sincos(-aAngle, &aSin, &aCos);
    const double a = z.real(), b = z.imag();
    z = std::complex<float>(static_cast<float>(a * aCos - b * aSin), static_cast<float>(a * aSin + b * aCos));
    ++aCount;
  }
  return aCount;
}

} // namespace

int tlrx_flattening(int argc, char **argv) {
  fdfTraceMessage("*** flattening of the interferogram by the synthetic phase ***\n");
  if (argc < 4) {
    fdfTraceMessage("Usage: %s <interferogram> <synthetic phase> <output root> [NotOK NotOK NotOK]\n",
                    argc > 0 ? argv[0] : "tlrx_flattening");
    TLRX_RAISE(CTLRX_ERR_ARGUMENTS, nullptr);
  }
  const std::string aInterferogram = argv[1], aPhase = argv[2], aOutput = std::string(argv[3]) + "_dint";
  fdfTraceMessage("  interferogram : %s\n  synthetic phase : %s\n  flattened interferogram : %s\n",
                  aInterferogram.c_str(), aPhase.c_str(), aOutput.c_str());
  CRunFiles aFiles;
  aFiles.addInput(aInterferogram);
  aFiles.addInput(aPhase);
  aFiles.addResult(aOutput, false);
  aFiles.refuseClashes(CTLRX_ERR_PARAMETER_FILE);

  CDescription aZHeader, aPhaseHeader;
  fdfLoadInputHeader(aInterferogram, aZHeader);
  fdfLoadInputHeader(aPhase, aPhaseHeader);
  const std::string aZType = fdfHeaderText(aZHeader, "RasterInfo.CellType");
  const std::string aPhaseType = fdfHeaderText(aPhaseHeader, "RasterInfo.CellType");
  if (aZType != "FLOAT_COMPLEX") {
    fdfTraceMessage("Error: unsupported data type: %s for the interferogram %s\n", aZType.c_str(),
                    aInterferogram.c_str());
    TLRX_RAISE_F(CTLRX_ERR_IMAGES_INCOMPATIBLE, "%.64s (interferogram %.200s)", aZType.c_str(),
                 aInterferogram.c_str());
  }
  if (aPhaseType.find("COMPLEX") != std::string::npos) {
    fdfTraceMessage("Error: unsupported data type: %s for the synthetic phase %s\n", aPhaseType.c_str(),
                    aPhase.c_str());
    TLRX_RAISE_F(CTLRX_ERR_IMAGES_INCOMPATIBLE, "%.64s (synthetic phase %.200s)", aPhaseType.c_str(),
                 aPhase.c_str());
  }
  CRasterFile aZ, aPhi;
  aZ.open_read(aInterferogram.c_str(), aZHeader);
  aPhi.open_read(aPhase.c_str(), aPhaseHeader);
  const int32_t aLines = aZ.getNrOfLinesPerImage(), aPixels = aZ.getNrOfPixelsPerLine();
  if (aPhi.getNrOfLinesPerImage() != aLines || aPhi.getNrOfPixelsPerLine() != aPixels) {
    fdfTraceMessage("Error: the synthetic phase %s has %d x %d cells, the interferogram %d x %d\n", aPhase.c_str(),
                    aPhi.getNrOfLinesPerImage(), aPhi.getNrOfPixelsPerLine(), aLines, aPixels);
    TLRX_RAISE_F(CTLRX_ERR_SIZE_MISMATCH, "%.200s: %d x %d, the interferogram %d x %d", aPhase.c_str(),
                 aPhi.getNrOfLinesPerImage(), aPhi.getNrOfPixelsPerLine(), aLines, aPixels);
  }

  CDescription aHeader;
  fdfMakeResultHeader(aHeader, aZHeader, "FLOAT_COMPLEX", "FLATTENED INTERFEROGRAMME", 0.0);
  CResultRaster aOut(aOutput, aHeader);
  const SNoData aPhaseNull = phaseNoData(aPhaseHeader);
  // Bands of lines read and written in order; the cells are turned on
  // blocks of lines in parallel, each line on its own.
  const SBandPlan aPlan = fdfLineBandPlan(aLines, CTLRX_FLATTENING_BLOCK, fdfThreadCount());
  CBandLines<std::complex<float>> aCells(aPlan.mBand, aPixels);
  CBandLines<uint8_t> aValid(aPlan.mBand, aPixels);
  CBandLines<double> aPhases(aPlan.mBand, aPixels);
  // Counts per block of the band, added in block order.
  std::vector<int64_t> aBlockCounts(static_cast<size_t>(aPlan.mBand / aPlan.mBlock + 1), 0);
  CLineProgress aProgress(99.0);
  int64_t aFlattened = 0;
  fdfRunBands(
      aPlan, fdfParallelFor,
      [&](const SLineBand &theBand) {
        for (int32_t l = theBand.mFirst; l < theBand.mFirst + theBand.mCount; ++l) {
          aProgress.update(l, aLines);
          aZ.getComplexLine(aCells.line(l), l, 0, -1, aValid.line(l));
          aPhi.getLine(aPhases.line(l), l);
        }
      },
      [&](int32_t theFirst, int32_t theCount, int) {
        int64_t aCount = 0;
        for (int32_t l = theFirst; l < theFirst + theCount; ++l)
          aCount += fdfFlattenLine(aCells.line(l), aValid.line(l), aPhases.line(l), aPixels, aPhaseNull);
        aBlockCounts[static_cast<size_t>(theFirst % aPlan.mBand / aPlan.mBlock)] = aCount;
      },
      [&](const SLineBand &theBand) {
        for (int32_t l = theBand.mFirst; l < theBand.mFirst + theBand.mCount; ++l)
          aOut.file().putComplexLine(l, aCells.line(l));
        const int32_t aBlocks = (theBand.mCount + aPlan.mBlock - 1) / aPlan.mBlock;
        for (int32_t k = 0; k < aBlocks; ++k)
          aFlattened += aBlockCounts[static_cast<size_t>(k)];
      });
  aZ.close();
  aPhi.close();
  aOut.commit(aHeader, CTLRX_ERR_FILE_COPY);
  fdfLogMessage("\nflattened pixels: %lld of %lld\n", static_cast<long long>(aFlattened),
                static_cast<long long>(aLines) * aPixels);
  return 0;
}

int tlrx_flattening_close(int argc, char **argv) {
  if (argc < CTLRX_FLATTENING_CLOSE_ARGUMENTS) {
    fdfTraceMessage("\nSHUT: %d arguments, %d wanted: nothing removed\n", argc, CTLRX_FLATTENING_CLOSE_ARGUMENTS);
    return 0;
  }
  fdfTraceMessage("\nSHUT\n");
  fdfDeleteRaster(argv[1], true, true);
  fdfDeleteRaster(argv[2], true, true);
  return 0;
}
