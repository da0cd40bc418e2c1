#include "tlrx_step_common.h"

#include "tlrx_description_xml.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_standard_header.h"

#include <climits>
#include <cstring>

std::vector<std::string> fdfStartArgumentCommand(const char *theArguments, const char *theTitle) {
  const std::vector<std::string> aTokens = fdfReadArgumentFile(theArguments);
  std::vector<const char *> aArgv;
  for (const std::string &aToken : aTokens)
    aArgv.push_back(aToken.c_str());
  fdfStartProcess(aArgv.data(), static_cast<int>(aArgv.size()), theTitle, nullptr);
  return aTokens;
}

void fdfTraceTokens(const std::vector<std::string> &theTokens, size_t theCount) {
  for (size_t i = 0; i < theCount && i < theTokens.size(); ++i)
    fdfTraceMessage(" argv[%d] = %s\n", static_cast<int>(i), theTokens[i].c_str());
}

void fdfLoadInputHeader(const std::string &theRaster, CDescription &theHeader) {
  const std::string aHeaderName = fdfHeaderFileName(theRaster);
  if (!fdfExistFile(fdfXmlHeaderFileName(aHeaderName).c_str()) && !fdfExistFile(aHeaderName.c_str())) {
    fdfTraceMessage("Error: missing parameter file %s\n", aHeaderName.c_str());
    TLRX_RAISE(CTLRX_ERR_FILE_OPEN, aHeaderName.c_str());
  }
  fdfReadStandardHeader(theRaster.c_str(), theHeader);
}

bool fdfFindOtherInfo(const CDescription &theHeader, const char *theKey, std::string &theValue) {
  const CDescriptionField *aTable = theHeader.findField("RasterInfo.OtherInfo");
  if (aTable == nullptr || aTable->getColNbr() < 2)
    return false;
  const size_t aKeyLen = std::strlen(theKey);
  for (int32_t aRow = 0; aRow < aTable->getRowNbr(); ++aRow) {
    if (!aTable->isSet(aRow, 0))
      continue;
    if (std::strncmp(aTable->getString(aRow, 0), theKey, aKeyLen) == 0) {
      theValue = aTable->isSet(aRow, 1) ? aTable->getString(aRow, 1) : "";
      return true;
    }
  }
  return false;
}

int32_t fdfIntegerToken(const char *theToken, const char *theWhat, int32_t theCode) {
  int32_t aValue = 0;
  if (!fdfParseWholeInteger(theToken, aValue))
    TLRX_RAISE_F(theCode, "%s: not an integer [%.200s]", theWhat, theToken != nullptr ? theToken : "");
  return aValue;
}

double fdfRealToken(const char *theToken, const char *theWhat, int32_t theCode) {
  double aValue = 0.0;
  if (!fdfParseWholeDouble(theToken, aValue, true))
    TLRX_RAISE_F(theCode, "%s: not a number [%.200s]", theWhat, theToken != nullptr ? theToken : "");
  return aValue;
}

namespace {

// A result header without the field would silently lose the value: the
// readers' missing-field error (848642 naming the key) says so.
CDescriptionField &declaredField(CDescription &theHeader, const char *theKey) { return theHeader.getField(theKey); }

} // namespace

void fdfSetHeaderText(CDescription &theHeader, const char *theKey, const char *theValue) {
  declaredField(theHeader, theKey).setString(theValue);
}

void fdfSetHeaderNumber(CDescription &theHeader, const char *theKey, double theValue) {
  CDescriptionField &aField = declaredField(theHeader, theKey);
  if (aField.getValueType() != CTLRX_DS_INTEGER) {
    aField.setDouble(theValue);
    return;
  }
  // Converting a value outside the 32-bit range is undefined behaviour.
  if (!(theValue >= INT32_MIN && theValue <= INT32_MAX))
    TLRX_RAISE_F(CTLRX_ERR_DS_TYPE, "%.200s: %.17g is not a 32-bit integer", theKey, theValue);
  aField.setInteger(static_cast<int32_t>(theValue));
}

void fdfSetHeaderList(CDescription &theHeader, const char *theKey, const std::vector<std::string> &theNames) {
  CDescriptionField &aField = declaredField(theHeader, theKey);
  aField.setNumberOfElements(static_cast<int32_t>(theNames.size()));
  for (size_t i = 0; i < theNames.size(); ++i)
    aField.setString(static_cast<int32_t>(i), theNames[i].c_str());
}

void fdfWriteResultHeader(const std::string &theRaster, CDescription &theHeader, int32_t theCode) {
  if (fdfWriteStandardHeader(theRaster.c_str(), theHeader, false))
    return;
  const std::string aHeaderName = fdfHeaderFileName(theRaster);
  fdfTraceMessage("Error while writing parameter file %s\n", aHeaderName.c_str());
  TLRX_RAISE(theCode, aHeaderName.c_str());
}

void CLineProgress::update(int64_t theLine, int64_t theLines) {
  const int aPercent = static_cast<int>(static_cast<double>(theLine) / static_cast<double>(theLines) * mScale) + mOffset;
  if (aPercent != mLast && aPercent < 100) {
    getAndSetPerc(mLast, aPercent, nullptr);
    mLast = aPercent;
  }
}

namespace {

// Resets a copied layout field only where the input set it.
void resetIfSet(CDescription &theHeader, const char *theKey, double theValue) {
  const CDescriptionField *aField = theHeader.findField(theKey);
  if (aField != nullptr && aField->holdsValue())
    fdfSetHeaderNumber(theHeader, theKey, theValue);
}

} // namespace

void fdfMakeResultHeader(CDescription &theResult, const CDescription &theInput, const char *theCellType,
                         const char *theUnits, double theNull) {
  fdfDeclareStandardHeader(theResult);
  theResult = theInput;
  fdfSetHeaderNumber(theResult, "RasterInfo.HeaderOffset", 0);
  fdfSetHeaderNumber(theResult, "RasterInfo.RowPrefix", 0);
  fdfSetHeaderNumber(theResult, "RasterInfo.RowSuffix", 0);
  fdfSetHeaderText(theResult, "RasterInfo.CellType", theCellType);
  if (theUnits != nullptr)
    fdfSetHeaderText(theResult, "RasterInfo.DataUnits", theUnits);
  fdfSetHeaderNumber(theResult, "RasterInfo.NullCellValue", theNull);
  resetIfSet(theResult, "RasterInfo.FooterLen", 0);
  resetIfSet(theResult, "RasterInfo.RealScaleFactor", 1.0);
  resetIfSet(theResult, "RasterInfo.ImaginaryScaleFactor", 1.0);
}

void fdfStampPairHeaders(CDescription &theResult, const std::string &theFirstName, const CDescription &theFirst,
                         const std::string &theSecondName, const CDescription &theSecond) {
  fdfSetHeaderList(theResult, "RasterInfo.FilesList", {theFirstName, theSecondName});
  std::string aTime;
  if (fdfFindOtherInfo(theFirst, CTLRX_ACQUISITION_TIME_KEY, aTime)) {
    fdfStampOtherInfo(theResult, "ACQUISITION TIME", aTime.c_str());
    fdfStampOtherInfo(theResult, "MASTER ACQUISITION TIME", aTime.c_str());
  }
  if (fdfFindOtherInfo(theSecond, CTLRX_ACQUISITION_TIME_KEY, aTime))
    fdfStampOtherInfo(theResult, "SLAVE ACQUISITION TIME", aTime.c_str());
}
