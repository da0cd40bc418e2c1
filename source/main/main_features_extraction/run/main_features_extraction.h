// Program entry: start-up, command dispatch and the closing of the run.
#pragma once

#include <cstdint>

// A command driver takes the argument text after the "#" and returns the
// run's error code (0 on success).
using TLRXCommandDriver = int32_t (*)(const char *theArguments);

struct STLRXCommand {
  const char *mPrefix;
  TLRXCommandDriver mDriver; // nullptr: recognised, answered as unknown
};

constexpr int CTLRX_COMMAND_COUNT = 7;
const STLRXCommand *fdfCommandTable();

// Index of the command whose prefix starts theCommandLine, or -1; on a match
// theArguments points just after the prefix.
int fdfMatchCommand(const char *theCommandLine, const char **theArguments);

const char *fdfProductBanner();

// Runs a whole command line: start-up, the command, and the report of its
// end, success or the one error that stopped it. Returns the exit status.
int main_features_extraction(const char *theCommandLine);
