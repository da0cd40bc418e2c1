// The feature worker. Set-up: grid header, temporal order, input sources,
// output headers; then one pass over the output lines, each pixel's series
// reduced by CTemporalSeries; then the outputs are closed and converted.
// The grid header and the list file are temporaries of the run in the
// working folder; outputs are written under temporary names and moved into
// place once complete, and the whole run's results go if any step fails.
#include "tlrx_temporal_features.h"

#include "tlrx_acquisition_dates.h"
#include "tlrx_description_section.h"
#include "tlrx_description_xml.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_step_common.h"
#include "tlrx_generic_utility.h"
#include "tlrx_geocoded_stack.h"
#include "tlrx_raster_to_geotiff.h"
#include "tlrx_pending_files.h"
#include "tlrx_platform.h"
#include "tlrx_raster_file.h"
#include "tlrx_result_files.h"
#include "tlrx_standard_header.h"
#include "tlrx_temporal_grid.h"
#include "tlrx_line_bands.h"
#include "tlrx_threads.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <memory>

namespace {

const STemporalOutput sOutputs[CTLRX_TF_COUNT] = {
    {"mean", "_mea", false},
    {"std", "_std", false},
    {"median", "_med", false},
    {"gradient", "_grad", false},
    {"max", "_max", false},
    {"min", "_min", false},
    {"span_max_less_min", "_spanD", false},
    {"max_less_min_sup", "_maxI", false},
    {"max_less_min_inf", "_maxD", false},
    {"span_max_on_min", "_spanR", false},
    {"max_on_min_sup", "_maxR", false},
    {"max_on_min_inf", "_minR", false},
    {"date_max", "_dateMax", true},
    {"date_min_before_max", "_dateMinBeforeMax", true},
};

constexpr const char *CTLRX_TF_PROCESS = "Multi Temporal Features Extraction";
constexpr const char *CTLRX_TF_TIFF_PROCESS = "Tiff generation ... ";
// Lines per piece of parallel work: rows of every input are held per line.
constexpr int32_t CTLRX_TF_BLOCK_LINES = 2;

// The inputs' values along one output line: n rows of P values.
class CInputRows {
public:
  virtual ~CInputRows() = default;
  virtual void read(int32_t theLine, double *theRows) = 0;
  const std::vector<double> &nulls() const { return mNulls; }

protected:
  std::vector<double> mNulls;
};

// Co-registered inputs: the top-left P pixels of line l of each input.
class CDirectRows : public CInputRows {
public:
  CDirectRows(const std::vector<std::string> &theNames, int32_t thePixels) : mPixels(thePixels) {
    fdfTraceMessage(" Time ordered Image List:\n");
    for (const std::string &aName : theNames) {
      fdfTraceMessage("%s\n", aName.c_str());
      CDescription aHeader;
      fdfReadTemporalInputHeader(aName, aHeader);
      mFiles.push_back(std::make_unique<CRasterFile>());
      mFiles.back()->open_read(aName.c_str(), aHeader);
      mNulls.push_back(mFiles.back()->getDummyVal());
    }
  }
  void read(int32_t theLine, double *theRows) override {
    for (size_t i = 0; i < mFiles.size(); ++i)
      mFiles[i]->getLine(theRows + i * static_cast<size_t>(mPixels), theLine, 0, mPixels - 1);
  }

private:
  int32_t mPixels;
  std::vector<std::unique_ptr<CRasterFile>> mFiles;
};

// Geocoded inputs, resampled onto the grid by the stack.
class CGeocodedRows : public CInputRows {
public:
  CGeocodedRows(const std::vector<std::string> &theNames, const std::string &theGrid,
                const std::string &theInterpolation, CPendingFiles &thePending) {
    const std::string aList = theGrid + ".txt";
    writeList(aList, theNames, thePending);
    const bool aReady = mStack.initialise(aList.c_str(), theGrid.c_str(), theInterpolation.c_str(), 1, 0);
    fdfRemoveFile(aList.c_str());
    thePending.forgetFile(aList);
    if (!aReady) {
      const std::string aHeader = fdfHeaderFileName(theGrid);
      fdfTraceMessage("Error: missing parameter file %s\n", aHeader.c_str());
      TLRX_RAISE(CTLRX_ERR_FILE_OPEN, aHeader.c_str());
    }
    mNulls = mStack.getNullValues();
  }
  void read(int32_t theLine, double *theRows) override {
    const size_t aPixels = static_cast<size_t>(mStack.getGrid().mPixels);
    for (int32_t i = 0; i < mStack.getInputCount(); ++i)
      mStack.getLine(i, theLine, theRows + i * aPixels);
  }

private:
  static void writeList(const std::string &theList, const std::vector<std::string> &theNames,
                        CPendingFiles &thePending) {
    FILE *aFile = std::fopen(theList.c_str(), "w");
    bool aWritten = aFile != nullptr;
    if (aFile != nullptr) {
      thePending.addFile(theList);
      for (const std::string &aName : theNames)
        aWritten = aWritten && std::fprintf(aFile, "%s\n", aName.c_str()) > 0;
      aWritten = aWritten && std::fprintf(aFile, "#\n") > 0;
      aWritten = std::fclose(aFile) == 0 && aWritten;
    }
    if (!aWritten) {
      fdfTraceMessage("Error while writing parameter file %s\n", theList.c_str());
      TLRX_RAISE(CTLRX_ERR_FILE_WRITE, theList.c_str());
    }
  }

  CGeocodedImageStack mStack;
};

// One open output with its header.
struct SOpenOutput {
  int mFeature = 0;
  std::string mName;
  CDescription mHeader;
  std::unique_ptr<CResultRaster> mFile;
};

[[noreturn]] void fdfRaiseMissing(const std::string &theName) {
  fdfTraceMessage("Error: missing parameter file %s\n", theName.c_str());
  TLRX_RAISE(CTLRX_ERR_FILE_OPEN, theName.c_str());
}

// The raster file reports its own open failures; this command reports an
// output it cannot create as a missing file, before anything is written.
void fdfCheckCreatable(const std::string &theName) {
  if (fdfIsDirectory(theName))
    fdfRaiseMissing(theName);
  const std::string aPart = fdfPartName(theName);
  fdfAddPendingFile(aPart);
  FILE *aFile = std::fopen(aPart.c_str(), "wb");
  if (aFile == nullptr)
    fdfRaiseMissing(theName);
  std::fclose(aFile);
}

void fdfOpenOutput(SOpenOutput &theOutput, const CDescription &theGridHeader, const std::string &theReference) {
  CDescription &aHeader = theOutput.mHeader;
  fdfDeclareStandardHeader(aHeader);
  aHeader = theGridHeader;
  if (sOutputs[theOutput.mFeature].mDate) {
    fdfSetHeaderText(aHeader, "RasterInfo.CellType", "INT");
    fdfSetHeaderNumber(aHeader, "RasterInfo.NullCellValue", CTLRX_TF_NO_DATE);
    fdfStampOtherInfo(aHeader, CTLRX_TF_REFERENCE_KEY, theReference.c_str());
  }
  fdfCheckCreatable(theOutput.mName);
  theOutput.mFile = std::make_unique<CResultRaster>(theOutput.mName, aHeader);
}

// Days of the inputs, ordered in time with their names, and the trace of
// their distances from the reference.
std::vector<long> fdfOrderInTime(std::vector<std::string> &theNames) {
  const std::vector<STLRXDate> aDates = fdfOrderByDayNumber(theNames);
  std::vector<long> aDays;
  for (const STLRXDate &aDate : aDates)
    aDays.push_back(aDate.mDay);
  fdfTraceMessage("Temporal Distanfe from the reference date : ");
  for (size_t i = 0; i < aDays.size(); ++i)
    fdfTraceMessage(" ID = %d , Temp Dist = %ld\n", static_cast<int>(i), aDays[i] - aDays[0]);
  return aDays;
}

std::string fdfReferenceDateText(const std::string &theEarliest) {
  CDescription aHeader;
  fdfReadTemporalInputHeader(theEarliest, aHeader);
  std::string aText;
  fdfFindOtherInfo(aHeader, CTLRX_ACQUISITION_TIME_KEY, aText);
  return aText;
}

} // namespace

const STemporalOutput &fdfTemporalOutput(int theFeature) { return sOutputs[theFeature]; }

double fdfMaxRatioThreshold(double theMaxIncrementThrDb) { return std::pow(10.0, theMaxIncrementThrDb / 10.0); }

double fdfMaxRatioTimeThreshold(double theMaxIncrementThrDb, double theMaxDecrementThrTime) {
  return fdfMaxRatioThreshold(theMaxIncrementThrDb) / theMaxDecrementThrTime;
}

namespace {

// Opens every requested output, in the order of the output table, with its
// header written beside it.
std::vector<std::unique_ptr<SOpenOutput>> fdfOpenOutputs(const STemporalRequest &theRequest,
                                                         const CDescription &theGridHeader,
                                                         const std::string &theReference) {
  std::vector<std::unique_ptr<SOpenOutput>> aOutputs;
  for (int f = 0; f < CTLRX_TF_COUNT; ++f) {
    if (!theRequest.mOutputs[f])
      continue;
    auto aOutput = std::make_unique<SOpenOutput>();
    aOutput->mFeature = f;
    aOutput->mName = theRequest.mRoot + sOutputs[f].mSuffix;
    fdfOpenOutput(*aOutput, theGridHeader, theReference);
    aOutputs.push_back(std::move(aOutput));
  }
  return aOutputs;
}

// The pass over the output lines in bands: inputs read (or resampled) on
// this thread, features computed into the band's output lines in parallel,
// lines written in order.
void fdfWriteFeatureLines(CInputRows &theSource, const CTemporalSeries &theSeries, int32_t theLines,
                          int32_t thePixels, size_t theInputs, std::vector<std::unique_ptr<SOpenOutput>> &theOpen) {
  const SBandPlan aPlan = fdfLineBandPlan(theLines, CTLRX_TF_BLOCK_LINES, fdfThreadCount());
  CBandLines<double> aRows(aPlan.mBand, static_cast<int32_t>(theInputs) * thePixels);
  // One band of lines per output: values as floats, dates as integers.
  std::vector<CBandLines<float>> aValueBands(CTLRX_TF_VALUE_COUNT, CBandLines<float>(0, 0));
  std::vector<CBandLines<int32_t>> aDateBands(2, CBandLines<int32_t>(0, 0));
  for (const auto &aOutput : theOpen) {
    const int aFeature = aOutput->mFeature;
    if (sOutputs[aFeature].mDate)
      aDateBands[aFeature - CTLRX_TF_DATE_MAX] = CBandLines<int32_t>(aPlan.mBand, thePixels);
    else
      aValueBands[aFeature] = CBandLines<float>(aPlan.mBand, thePixels);
  }
  auto aLinesAt = [&](int32_t theLine) {
    STemporalLines aLines;
    for (const auto &aOutput : theOpen) {
      const int aFeature = aOutput->mFeature;
      if (sOutputs[aFeature].mDate)
        aLines.mDate[aFeature - CTLRX_TF_DATE_MAX] = aDateBands[aFeature - CTLRX_TF_DATE_MAX].line(theLine);
      else
        aLines.mValue[aFeature] = aValueBands[aFeature].line(theLine);
    }
    return aLines;
  };
  // Every thread reduces its pixels' series with a copy of its own.
  std::vector<CTemporalSeries> aSeries(static_cast<size_t>(fdfThreadCount()), theSeries);
  CLineProgress aProgress(100.0);
  fdfRunBands(
      aPlan, fdfParallelFor,
      [&](const SLineBand &theBand) {
        for (int32_t l = theBand.mFirst; l < theBand.mFirst + theBand.mCount; ++l) {
          aProgress.update(l, theLines);
          theSource.read(l, aRows.line(l));
        }
      },
      [&](int32_t theFirst, int32_t theCount, int theThread) {
        for (int32_t l = theFirst; l < theFirst + theCount; ++l)
          aSeries[static_cast<size_t>(theThread)].line(aRows.line(l), thePixels, aLinesAt(l));
      },
      [&](const SLineBand &theBand) {
        for (int32_t l = theBand.mFirst; l < theBand.mFirst + theBand.mCount; ++l) {
          const STemporalLines aLines = aLinesAt(l);
          for (const auto &aOutput : theOpen) {
            const int aFeature = aOutput->mFeature;
            aOutput->mFile->file().putLine(l, sOutputs[aFeature].mDate
                                                  ? static_cast<const void *>(aLines.mDate[aFeature - CTLRX_TF_DATE_MAX])
                                                  : static_cast<const void *>(aLines.mValue[aFeature]));
          }
        }
      });
}

} // namespace

namespace {

// Refuses, before anything is written, an output that would land on an input
// or on the parameter file.
void fdfRefuseClashes(const STemporalRequest &theRequest) {
  CRunFiles aFiles;
  aFiles.addRead(theRequest.mParameterFile);
  for (const std::string &aInput : theRequest.mInputs)
    aFiles.addInput(aInput);
  for (int f = 0; f < CTLRX_TF_COUNT; ++f)
    if (theRequest.mOutputs[f])
      aFiles.addResult(theRequest.mRoot + sOutputs[f].mSuffix, theRequest.mMakeTiff);
  aFiles.refuseClashes(CTLRX_ERR_PARAMETER_FILE);
}

} // namespace

int32_t fdfTemporalFeatureExtraction(const STemporalRequest &theRequest) {
  fdfTraceMessage("\n\nMulti Temporal Features Extraction\n");
  fdfSetProcessName(CTLRX_TF_PROCESS);
  getAndSetPerc(-1, 0, nullptr);
  if (theRequest.mInputs.empty())
    TLRX_RAISE(CTLRX_ERR_PARAMETER_FILE, theRequest.mRoot.c_str());
  fdfRefuseClashes(theRequest);
  CPendingFiles aRun;

  // The common grid's header lives under a name of this run only.
  const std::string aGrid = fdfRunTemporaryName("tlrx_temporal_grid");
  aRun.addHeaders(aGrid);
  const STemporalGridInfo aGridInfo = fdfBuildTemporalGrid(theRequest.mInputs, aGrid);

  STemporalSettings aSettings;
  aSettings.mNormalize = theRequest.mNormalize;
  aSettings.mDecibels = theRequest.mDecibels;
  aSettings.mRatioTimeThreshold =
      fdfMaxRatioTimeThreshold(theRequest.mMaxIncrementThrDb, theRequest.mMaxDecrementThrTime);
  std::copy(theRequest.mOutputs, theRequest.mOutputs + CTLRX_TF_COUNT, aSettings.mWanted);
  fdfTraceMessage("\n\t MaxIncrementThrDb = %f\t MaxRatioThr = %g\n\t MaxIncrementThrTime = %f\n\t MaxRatioTimeThr = %g\n",
                  theRequest.mMaxIncrementThrDb, fdfMaxRatioThreshold(theRequest.mMaxIncrementThrDb),
                  theRequest.mMaxDecrementThrTime, aSettings.mRatioTimeThreshold);

  std::vector<std::string> aNames = theRequest.mInputs;
  const std::vector<long> aDays = fdfOrderInTime(aNames);
  const std::string aReference = fdfReferenceDateText(aNames[0]);

  CDescription aGridHeader;
  fdfReadStandardHeader(aGrid.c_str(), aGridHeader);
  const int32_t aLines = fdfHeaderSize(aGridHeader, "RasterInfo.NrOfLinesPerImage", CTLRX_RASTER_FILE_MAX_ROWS);
  const int32_t aPixels = fdfHeaderSize(aGridHeader, "RasterInfo.NrOfPixelsPerLine", CTLRX_RASTER_FILE_MAX_ROWS);
  aSettings.mNull = fdfHeaderNullValue(aGridHeader);

  std::unique_ptr<CInputRows> aSource;
  if (aGridInfo.mGeocoded)
    aSource = std::make_unique<CGeocodedRows>(aNames, aGrid, theRequest.mInterpolation, aRun);
  else
    aSource = std::make_unique<CDirectRows>(aNames, aPixels);
  fdfRemoveHeaderFiles(aGrid);
  aRun.forgetAll();

  std::vector<std::unique_ptr<SOpenOutput>> aOutputs = fdfOpenOutputs(theRequest, aGridHeader, aReference);
  CTemporalSeries aSeries(aSettings, aDays, aSource->nulls());
  fdfWriteFeatureLines(*aSource, aSeries, aLines, aPixels, aNames.size(), aOutputs);
  aSource.reset();

  std::vector<std::string> aWritten;
  for (auto &aOutput : aOutputs) {
    aOutput->mFile->commit(aOutput->mHeader, CTLRX_ERR_FILE_OPEN);
    aWritten.push_back(aOutput->mName);
  }
  aOutputs.clear();
  if (theRequest.mMakeTiff)
    for (const std::string &aName : aWritten) {
      fdfSetProcessName(CTLRX_TF_TIFF_PROCESS);
      getAndSetPerc(-1, 0, nullptr);
      fdfRasterQuickLook(aName.c_str(), theRequest.mSaturation);
    }
  aRun.forgetAll();
  return 0;
}
