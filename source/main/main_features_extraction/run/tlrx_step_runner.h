// The step runner shared by every command built from step programs: a table
// of named steps, a plan of step indices, and one loop that runs the plan.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

// A step program keeps the (count, vector) interface of a program: element 0
// is the process name; 0 means success.
using TLRXStepProgram = int (*)(int theArgc, char **theArgv);

struct STLRXStep {
  const char *mName;
  TLRXStepProgram mMain;
  TLRXStepProgram mClose; // runs after a successful main operation
};

// The closing operation of steps that have nothing to close.
int fdfStepNothingToClose(int theArgc, char **theArgv);

// Arguments 1.. of the step at plan position thePosition (table index theStep).
using TLRXStepArguments = std::function<std::vector<std::string>(int thePosition, int theStep)>;

class CStepRunner {
public:
  // theTotalLabel heads the total time line ("RATIO" gives "RATIO TOTAL TIME (s): ").
  CStepRunner(const std::vector<STLRXStep> &theTable, const char *theTotalLabel);

  // Runs the plan in order and stops at the first step whose main operation
  // fails; returns that status, or 0 when every step succeeded. Each step's
  // closing operation follows its success when theClose.
  int32_t run(const std::vector<int> &thePlan, const TLRXStepArguments &theArguments, bool theClose = true) const;

private:
  int32_t runStep(const STLRXStep &theStep, std::vector<std::string> theArguments, bool theClose) const;

  std::vector<STLRXStep> mTable;
  std::string mTotalLabel;
  long long mStartClock;
};
