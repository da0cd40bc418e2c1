#include "tlrx_acquisition_dates.h"

#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_features_common.h"

#include <utility>

STLRXDate fdfReadInputDate(const std::string &theName) {
  CDescription aHeader;
  fdfLoadInputHeader(theName, aHeader);
  std::string aText;
  if (!fdfFindOtherInfo(aHeader, CTLRX_ACQUISITION_TIME_KEY, aText)) {
    fdfLogMessage("Not found the field %s in %s\n\n", CTLRX_ACQUISITION_TIME_KEY, theName.c_str());
    TLRX_RAISE(CTLRX_ERR_DS_FIELD_MISSING, CTLRX_ACQUISITION_TIME_KEY);
  }
  STLRXDate aDate;
  // A date that cannot be read would put the image at a wrong place in time.
  if (!fdfParseAcquisitionDate(aText, aDate)) {
    fdfLogMessage("Invalid value [%s] of the field %s in %s\n\n", aText.c_str(), CTLRX_ACQUISITION_TIME_KEY,
                  theName.c_str());
    TLRX_RAISE(CTLRX_ERR_DS_FIELD_MISSING, CTLRX_ACQUISITION_TIME_KEY);
  }
  fdfTraceMessage("%s DATE = %s\n", theName.c_str(), aText.c_str());
  return aDate;
}

std::vector<STLRXDate> fdfOrderChronologically(std::vector<std::string> &theNames) {
  std::vector<STLRXDate> aDates;
  for (const std::string &aName : theNames)
    aDates.push_back(fdfReadInputDate(aName));
  for (size_t i = 0; i + 1 < aDates.size(); ++i)
    for (size_t j = i + 1; j < aDates.size(); ++j)
      if (fdfDateBefore(aDates[j], aDates[i])) {
        std::swap(aDates[i], aDates[j]);
        std::swap(theNames[i], theNames[j]);
      }
  for (size_t i = 0; i < aDates.size(); ++i)
    fdfTraceMessage("DATE = %s   NAME = %s\n", fdfDateTraceText(aDates[i]).c_str(), theNames[i].c_str());
  return aDates;
}
