#include "tlrx_acquisition_dates.h"

#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_step_common.h"

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

namespace {

bool fdfComesAfter(const STLRXDate &theFirst, const STLRXDate &theSecond, ETLRXDateOrder theOrder) {
  return theOrder == ETLRXDateOrder::kDayNumber ? theFirst.mDay > theSecond.mDay : fdfDateBefore(theSecond, theFirst);
}

std::vector<STLRXDate> fdfReadAndOrder(std::vector<std::string> &theNames, ETLRXDateOrder theOrder) {
  std::vector<STLRXDate> aDates;
  for (const std::string &aName : theNames)
    aDates.push_back(fdfReadInputDate(aName));
  fdfSortByDate(aDates, theNames, theOrder);
  for (size_t i = 0; i < aDates.size(); ++i)
    fdfTraceMessage("DATE = %s   NAME = %s\n", fdfDateTraceText(aDates[i]).c_str(), theNames[i].c_str());
  return aDates;
}

} // namespace

void fdfSortByDate(std::vector<STLRXDate> &theDates, std::vector<std::string> &theNames, ETLRXDateOrder theOrder) {
  for (size_t i = 0; i + 1 < theDates.size(); ++i)
    for (size_t j = i + 1; j < theDates.size(); ++j)
      if (fdfComesAfter(theDates[i], theDates[j], theOrder)) {
        std::swap(theDates[i], theDates[j]);
        std::swap(theNames[i], theNames[j]);
      }
}

std::vector<STLRXDate> fdfOrderChronologically(std::vector<std::string> &theNames) {
  return fdfReadAndOrder(theNames, ETLRXDateOrder::kDayThenSeconds);
}

std::vector<STLRXDate> fdfOrderByDayNumber(std::vector<std::string> &theNames) {
  return fdfReadAndOrder(theNames, ETLRXDateOrder::kDayNumber);
}
