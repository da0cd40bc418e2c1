// The outermost guard of a command driver: a raised error passes through;
// any other exception escaping the driver is reported as 913920 with the
// current process name (the running step) as message, or with the
// exception's own text when theExceptionText. The results the driver writes
// are kept only when it succeeds.
#pragma once

#include <cstdint>

using TLRXDriverBody = int32_t (*)(const char *theArguments);

int32_t fdfRunGuardedDriver(TLRXDriverBody theBody, const char *theArguments, bool theExceptionText = false);
