// Threads of a run over OpenMP (see tlrx_threads.h).
#include "tlrx_threads.h"

#include "tlrx_errors.h"
#include "tlrx_platform.h"

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <climits>
#include <cstdlib>
#include <exception>
#include <mutex>

#ifdef _OPENMP
#include <omp.h>
#endif

namespace {

int sThreadCount = 0;

int fdfReadThreadCount() {
  const char *aText = std::getenv("TELLURIX_THREADS");
  if (aText == nullptr || aText[0] == '\0')
    return std::min(fdfUsableCpuCount(), CTLRX_MAX_THREADS);
  char *aEnd = nullptr;
  errno = 0;
  const long aValue = std::strtol(aText, &aEnd, 10);
  if (errno != 0 || aEnd == aText || *aEnd != '\0' || aValue < 1 || aValue > CTLRX_MAX_THREADS)
    TLRX_RAISE_F(CTLRX_ERR_SETTING_MISSING, "TELLURIX_THREADS = \"%.64s\" is not a thread count from 1 to %d",
                 aText, CTLRX_MAX_THREADS);
  return static_cast<int>(aValue);
}

// The first failure by index, kept while the other pieces end.
class CFirstFailure {
public:
  bool skips(int64_t theIndex) const { return theIndex > mIndex.load(std::memory_order_relaxed); }
  void keep(int64_t theIndex) {
    const std::lock_guard<std::mutex> aLock(mMutex);
    if (theIndex < mIndex.load(std::memory_order_relaxed)) {
      mIndex.store(theIndex, std::memory_order_relaxed);
      mError = std::current_exception();
    }
  }
  void rethrow() const {
    if (mError)
      std::rethrow_exception(mError);
  }

private:
  std::atomic<int64_t> mIndex{INT64_MAX};
  std::mutex mMutex;
  std::exception_ptr mError;
};

} // namespace

int fdfThreadCount() {
  if (sThreadCount == 0)
    sThreadCount = fdfReadThreadCount();
  return sThreadCount;
}

void fdfResetThreadCount() { sThreadCount = 0; }

void fdfParallelFor(int64_t theCount, const TLRXPieceBody &theBody) {
  const int aThreads = static_cast<int>(std::min<int64_t>(fdfThreadCount(), theCount));
  if (aThreads <= 1) {
    for (int64_t i = 0; i < theCount; ++i)
      theBody(i, 0);
    return;
  }
  CFirstFailure aFailure;
#pragma omp parallel for schedule(dynamic, 1) num_threads(aThreads)
  for (int64_t i = 0; i < theCount; ++i) {
    if (aFailure.skips(i))
      continue;
    try {
#ifdef _OPENMP
      theBody(i, omp_get_thread_num());
#else
      theBody(i, 0);
#endif
    } catch (...) {
      aFailure.keep(i);
    }
  }
  aFailure.rethrow();
}
