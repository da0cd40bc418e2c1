// The step runner: names each step as the current process, resets its
// progress, builds its argument vector of owned copies, times it, and stops
// the plan at the first failing step.
#include "tlrx_step_runner.h"

#include "tlrx_enviroment.h"
#include "tlrx_platform.h"

#include <memory>

int fdfStepNothingToClose(int, char **) { return 1; }

CStepRunner::CStepRunner(const std::vector<STLRXStep> &theTable, const char *theTotalLabel)
    : mTable(theTable), mTotalLabel(theTotalLabel), mStartClock(fdfProcessClock()) {}

int32_t CStepRunner::run(const std::vector<int> &thePlan, const TLRXStepArguments &theArguments,
                         bool theClose) const {
  int32_t aStatus = 0;
  for (size_t aPosition = 0; aPosition < thePlan.size() && aStatus == 0; ++aPosition) {
    const STLRXStep &aStep = mTable.at(static_cast<size_t>(thePlan[aPosition]));
    fdfTraceMessage("\nStep (%d) %s\n", static_cast<int>(aPosition), aStep.mName);
    aStatus = runStep(aStep, theArguments(static_cast<int>(aPosition), thePlan[aPosition]), theClose);
  }
  fdfTraceMessage("%s TOTAL TIME (s): %f\n", mTotalLabel.c_str(),
                  static_cast<double>(fdfProcessClock() - mStartClock) / CTLRX_CLOCKS_PER_SEC);
  return aStatus;
}

int32_t CStepRunner::runStep(const STLRXStep &theStep, std::vector<std::string> theArguments, bool theClose) const {
  fdfSetProcessName(theStep.mName);
  getAndSetPerc(-1, 0, nullptr);
  theArguments.insert(theArguments.begin(), fdfGetProcessName());
  // The step may keep or edit its strings: each is an owned, writable copy.
  std::vector<std::unique_ptr<char[]>> aStrings;
  std::vector<char *> aArgv;
  for (size_t i = 0; i < theArguments.size(); ++i) {
    aStrings.emplace_back(new char[theArguments[i].size() + 1]);
    theArguments[i].copy(aStrings.back().get(), theArguments[i].size());
    aStrings.back()[theArguments[i].size()] = '\0';
    aArgv.push_back(aStrings.back().get());
    fdfTraceMessage("aArgv[%d] %s\n", static_cast<int>(i), aArgv.back());
  }
  aArgv.push_back(nullptr);
  const int aArgc = static_cast<int>(theArguments.size());
  const long long aStart = fdfProcessClock();
  const int aStatus = theStep.mMain(aArgc, aArgv.data());
  fdfTraceMessage("\nDURATION [%s]  (s) = %f\n\n%s  END  \n", fdfGetProcessName(),
                  static_cast<double>(fdfProcessClock() - aStart) / CTLRX_CLOCKS_PER_SEC, theStep.mName);
  if (aStatus == 0 && theClose)
    theStep.mClose(aArgc, aArgv.data());
  return aStatus;
}
