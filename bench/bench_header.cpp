// Reading and writing a full raster header: the 21 standard sections with
// every field set, a 10,000-row "OtherInfo" table and 1,000 state vectors.
#include "tlrx_description_xml.h"
#include "tlrx_errors.h"
#include "tlrx_standard_header.h"

#include <benchmark/benchmark.h>

#include <cstdio>
#include <memory>
#include <string>
#include <unistd.h>

namespace {

constexpr int32_t CTLRX_BENCH_TABLE_ROWS = 10000;
constexpr int32_t CTLRX_BENCH_STATE_VECTORS = 1000;

void fillField(CDescriptionField &theField, int32_t theRows, int32_t theCols) {
  if (theField.getValueType() == CTLRX_DS_FIELD_POINTER)
    return;
  if (theField.getShape() != CTLRX_DS_SCALAR)
    theField.allocate(theRows, theCols);
  for (int32_t r = 0; r < theField.getRowNbr(); ++r)
    for (int32_t c = 0; c < theField.getColNbr(); ++c) {
      if (theField.getValueType() == CTLRX_DS_INTEGER)
        theField.setInteger(r, c, r * 31 + c);
      else if (theField.getValueType() == CTLRX_DS_DOUBLE)
        theField.setDouble(r, c, 6378137.0 / (r + c + 3));
      else
        theField.setString(r, c, (std::string("value <") + std::to_string(r) + "&" + std::to_string(c) + ">").c_str());
    }
}

// Every field of every standard section holds a value.
void buildHeader(CDescription &theDescription) {
  for (const std::string &aName : fdfStandardHeaderSections()) {
    auto aSection = std::make_unique<CDescriptionSection>();
    aSection->declareFromKeyFile((std::string(TLRX_BENCH_DATA_DIR) + "/key_files/" + aName + ".key").c_str(),
                                 aName.c_str());
    theDescription.addSection(std::move(aSection));
  }
  for (int32_t s = 0; s < theDescription.getSectionCount(); ++s) {
    CDescriptionSection &aSection = *theDescription.getSection(s);
    for (int32_t f = 0; f < aSection.getFieldCount(); ++f) {
      CDescriptionField &aField = *aSection.getField(f);
      if (aField.getShape() == CTLRX_DS_MULTIPLE) {
        const bool aState = std::string(aField.getName()) == "StateVectorData";
        if (aField.getMember(0) != nullptr && aField.getMember(0)->getShape() == CTLRX_DS_VECTOR)
          aField.setNumberOfElements(aState ? CTLRX_BENCH_STATE_VECTORS : 5);
        for (int32_t m = 0; m < aField.getMemberCount(); ++m) {
          CDescriptionField &aMember = *aField.getMember(m);
          fillField(aMember, 1, aMember.getColNbr());
        }
      } else if (aField.getParentIndex() == -1) {
        const bool aTable = std::string(aField.getName()) == "OtherInfo";
        fillField(aField, aTable ? CTLRX_BENCH_TABLE_ROWS : (aField.getShape() == CTLRX_DS_MATRIX ? 3 : 1),
                  aField.getShape() == CTLRX_DS_MATRIX ? 2 : 8);
      }
    }
  }
}

struct SBenchHeader {
  CDescription mDescription;
  std::string mFile;
  SBenchHeader() {
    buildHeader(mDescription);
    mFile = "/tmp/tlrx_bench_header_" + std::to_string(getpid());
  }
  ~SBenchHeader() {
    for (const char *aSuffix : {".sml", "_hdr"})
      std::remove((mFile + aSuffix).c_str());
  }
};

SBenchHeader &header() {
  static SBenchHeader aHeader;
  return aHeader;
}

void BM_WriteXmlHeader(benchmark::State &theState) {
  SBenchHeader &aHeader = header();
  const std::string aFile = aHeader.mFile + ".sml";
  for (auto _ : theState)
    if (!aHeader.mDescription.writeXML(aFile.c_str(), true, true))
      theState.SkipWithError("write failed");
  std::FILE *aIn = std::fopen(aFile.c_str(), "rb");
  std::fseek(aIn, 0, SEEK_END);
  theState.counters["bytes"] = static_cast<double>(std::ftell(aIn));
  std::fclose(aIn);
}

void BM_ReadXmlHeader(benchmark::State &theState) {
  SBenchHeader &aHeader = header();
  const std::string aFile = aHeader.mFile + ".sml";
  aHeader.mDescription.writeXML(aFile.c_str(), true, true);
  CDescription aRead;
  buildHeader(aRead);
  for (auto _ : theState)
    if (!aRead.readXML(aFile.c_str(), true))
      theState.SkipWithError("read failed");
}

void BM_UpdateOneSection(benchmark::State &theState) {
  SBenchHeader &aHeader = header();
  const std::string aFile = aHeader.mFile + ".sml";
  aHeader.mDescription.writeXML(aFile.c_str(), true, true);
  CDescription aOne;
  auto aSection = std::make_unique<CDescriptionSection>();
  aSection->declareFromKeyFile((std::string(TLRX_BENCH_DATA_DIR) + "/key_files/Sensor.key").c_str(), "Sensor");
  aOne.addSection(std::move(aSection));
  aOne.copyFrom(aHeader.mDescription, true);
  for (auto _ : theState)
    if (!aOne.writeXML(aFile.c_str(), false, true))
      theState.SkipWithError("update failed");
}

void BM_WriteAndReadTextForm(benchmark::State &theState) {
  SBenchHeader &aHeader = header();
  const std::string aFile = aHeader.mFile + "_hdr";
  CDescription aRead;
  buildHeader(aRead);
  for (auto _ : theState) {
    std::remove(aFile.c_str());
    for (int32_t s = 0; s < aHeader.mDescription.getSectionCount(); ++s)
      fdfWriteTextSection(*aHeader.mDescription.getSection(s), aFile.c_str());
    for (int32_t s = 0; s < aRead.getSectionCount(); ++s)
      fdfReadTextSection(*aRead.getSection(s), aFile.c_str());
  }
}

} // namespace

BENCHMARK(BM_WriteXmlHeader)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_ReadXmlHeader)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_UpdateOneSection)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_WriteAndReadTextForm)->Unit(benchmark::kMillisecond);
BENCHMARK_MAIN();
