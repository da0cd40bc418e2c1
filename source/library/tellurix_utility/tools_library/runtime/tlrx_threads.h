// Threads within a run. Work is cut into pieces whose bounds are absolute
// (line and column positions fixed by the data, never by the thread count),
// so any number of threads gives the results of one, bit for bit. Only the
// calling thread reads, writes, traces and reports progress; the pieces run
// in parallel compute into buffers of their own. Images go through in bands
// of lines (tlrx_line_bands.h, which takes fdfParallelFor as its loop).
#pragma once

#include <cstdint>
#include <functional>

// Upper bound of TELLURIX_THREADS.
constexpr int CTLRX_MAX_THREADS = 256;

// Threads of the run: TELLURIX_THREADS when set, else the CPUs the process
// may use (affinity and control-group quota). Read once; a value that is not
// an integer from 1 to CTLRX_MAX_THREADS raises 783360 naming the variable.
int fdfThreadCount();
// Forgets the count read, so the next call reads the variable again (tests).
void fdfResetThreadCount();

// Calls theBody(i, t) once for every i in [0, theCount), spread over the
// run's threads; t < fdfThreadCount() names the thread, for per-thread
// buffers. Returns when every call has ended. When calls throw, the calls of
// higher index that had not started are skipped and the exception of the
// lowest index is rethrown here, as one thread would have.
using TLRXPieceBody = std::function<void(int64_t theIndex, int theThread)>;
void fdfParallelFor(int64_t theCount, const TLRXPieceBody &theBody);
