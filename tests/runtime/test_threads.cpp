// Threads within a run: the thread count from TELLURIX_THREADS or the CPUs,
// and the parallel loop's coverage and failure rule.
#include "tlrx_description_test_support.h"
#include "tlrx_errors.h"
#include "tlrx_platform.h"
#include "tlrx_test_support.h"
#include "tlrx_threads.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstdlib>
#include <unistd.h>
#include <vector>

TEST(Threads, CountFromTheVariableOrTheCpus) {
  {
    CTestThreads aSetting("");
    EXPECT_EQ(fdfThreadCount(), fdfUsableCpuCount());
    EXPECT_GE(fdfUsableCpuCount(), 1);
    EXPECT_LE(fdfUsableCpuCount(), sysconf(_SC_NPROCESSORS_CONF));
  }
  for (const char *aValue : {"1", "3", "256"}) {
    CTestThreads aSetting(aValue);
    EXPECT_EQ(fdfThreadCount(), std::atoi(aValue));
  }
  for (const char *aValue : {"0", "-2", "257", "abc", "2x", " ", "99999999999999999999"}) {
    CTestThreads aSetting(aValue);
    std::string aMessage;
    EXPECT_EQ(tlrxCodeOf([] { fdfThreadCount(); }, &aMessage), CTLRX_ERR_SETTING_MISSING) << aValue;
    EXPECT_NE(aMessage.find("TELLURIX_THREADS = \"" + std::string(aValue) + "\""), std::string::npos) << aMessage;
  }
}

TEST(Threads, ParallelForCallsEachIndexOnceOnTheRunsThreads) {
  for (const char *aThreads : {"1", "3"}) {
    CTestThreads aSetting(aThreads);
    for (int64_t aCount : {0, 1, 2, 97}) {
      std::vector<std::atomic<int>> aCalls(static_cast<size_t>(aCount));
      std::atomic<int> aBadThread{0};
      fdfParallelFor(aCount, [&](int64_t i, int theThread) {
        ++aCalls[static_cast<size_t>(i)];
        aBadThread += theThread < 0 || theThread >= fdfThreadCount() ? 1 : 0;
      });
      for (const auto &aCall : aCalls)
        EXPECT_EQ(aCall.load(), 1) << aThreads << " threads, " << aCount << " pieces";
      EXPECT_EQ(aBadThread.load(), 0);
    }
  }
}

// Pieces 40 and 70 fail: whatever the threads, the caller sees piece 40's
// error, and every piece below it has run.
TEST(Threads, ParallelForRethrowsTheFailureOfTheLowestIndex) {
  for (const char *aThreads : {"1", "2", "3"}) {
    CTestThreads aSetting(aThreads);
    std::vector<std::atomic<int>> aCalls(100);
    std::string aMessage;
    const int32_t aCode = tlrxCodeOf(
        [&] {
          fdfParallelFor(100, [&](int64_t i, int) {
            ++aCalls[static_cast<size_t>(i)];
            if (i == 70)
              TLRX_RAISE(CTLRX_ERR_FILE_READ, "piece 70");
            if (i == 40)
              TLRX_RAISE(CTLRX_ERR_FILE_WRITE, "piece 40");
          });
        },
        &aMessage);
    EXPECT_EQ(aCode, CTLRX_ERR_FILE_WRITE) << aThreads;
    EXPECT_EQ(aMessage, "piece 40");
    for (int i = 0; i <= 40; ++i)
      EXPECT_EQ(aCalls[static_cast<size_t>(i)].load(), 1) << i;
  }
}
