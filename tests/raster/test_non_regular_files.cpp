// Readers refuse what is not a regular file (a FIFO would block the open, a
// link to /dev/zero would be read forever) with their own numbered error.
// Each read runs in a child under alarm() and a file-size limit, so that a
// regression fails the test instead of hanging it.
#include "tlrx_description_section.h"
#include "tlrx_description_xml.h"
#include "tlrx_command_test_support.h"
#include "tlrx_generic_utility.h"
#include "tlrx_raster_file.h"
#include "tlrx_standard_header.h"
#include "tlrx_test_support.h"
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

namespace {

constexpr unsigned CTLRX_TEST_SECONDS = 5;

struct SBoundedRun {
  bool mEnded = false; // false: killed by the alarm or the size limit
  int32_t mCode = 0;
  std::string mMessage;
};

// Runs theBody in a child; its error code and message come back through a pipe.
SBoundedRun runBounded(const std::function<void()> &theBody) {
  int aPipe[2];
  if (pipe(aPipe) != 0)
    return {};
  const pid_t aChild = fork();
  if (aChild == 0) {
    close(aPipe[0]);
    alarm(CTLRX_TEST_SECONDS);
    const rlimit aLimit = {1 << 20, 1 << 20};
    setrlimit(RLIMIT_FSIZE, &aLimit);
    std::string aMessage;
    const std::string aReport = std::to_string(tlrxRaisedCode(theBody, &aMessage)) + "\n" + aMessage;
    _exit(write(aPipe[1], aReport.data(), aReport.size()) == static_cast<ssize_t>(aReport.size()) ? 0 : 1);
  }
  close(aPipe[1]);
  std::string aReport;
  char aBuffer[4096];
  for (ssize_t aRead; (aRead = read(aPipe[0], aBuffer, sizeof aBuffer)) > 0;)
    aReport.append(aBuffer, static_cast<size_t>(aRead));
  close(aPipe[0]);
  int aStatus = 0;
  waitpid(aChild, &aStatus, 0);
  SBoundedRun aRun;
  aRun.mEnded = WIFEXITED(aStatus) && WEXITSTATUS(aStatus) == 0 && aReport.find('\n') != std::string::npos;
  if (aRun.mEnded) {
    aRun.mCode = std::stoi(aReport.substr(0, aReport.find('\n')));
    aRun.mMessage = aReport.substr(aReport.find('\n') + 1);
  }
  return aRun;
}

class SpecialFilesTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }
  // theName as a FIFO, or as a link to /dev/zero.
  std::string special(const std::string &theName, bool theFifo) {
    const std::string aPath = mDir.file(theName);
    EXPECT_EQ(theFifo ? mkfifo(aPath.c_str(), 0644) : symlink("/dev/zero", aPath.c_str()), 0);
    return aPath;
  }
};

} // namespace

TEST_F(SpecialFilesTest, EveryReaderRefusesFifosAndDevicesWithItsOwnError) {
  STLRXTestRaster aRaster;
  aRaster.mValues.assign(static_cast<size_t>(aRaster.mLines * aRaster.mPixels), 1.0);
  tlrxWriteTestRaster(mDir.file("data"), aRaster);
  std::remove(mDir.file("data").c_str());
  const std::string aData = special("data", false), aFifoHeader = special("f.sml", true);
  const std::string aZeroHeader = special("z.sml", false), aTextHeader = special("t_hdr", true);
  const std::string aList = special("list.txt", true), aArguments = special("args.txt", false);
  const std::string aParameters = special("par.xml", true), aKeys = special("Sec.key", true);
  const auto aHeader = [&](const char *theName) {
    return [this, theName] { CDescription aRead; fdfReadStandardHeader(mDir.file(theName).c_str(), aRead); };
  };
  const std::string aNotRegular = " is not a regular file";
  struct SCase {
    const char *mWhat;
    std::function<void()> mRead;
    int32_t mCode;
    std::string mMessage;
  } const aCases[] = {
      {"XML header FIFO", aHeader("f"), 261122, aFifoHeader + aNotRegular},
      {"XML header on /dev/zero", aHeader("z"), 261122, aZeroHeader + aNotRegular},
      {"text header FIFO", aHeader("t"), 261122, aTextHeader + aNotRegular},
      {"data file on /dev/zero", [&] { CRasterFile aFile; aFile.open_read(aData.c_str()); }, 261122,
       aData + aNotRegular},
      {"list file FIFO", [&] { fdfReadNameList(aList.c_str()); }, 261122, aList + aNotRegular},
      {"argument file on /dev/zero", [&] { fdfReadArgumentFile(aArguments.c_str()); }, 261122,
       aArguments + aNotRegular},
      {"parameter file FIFO",
       [&] { CDescription aRead; fdfDeclareStandardHeader(aRead); aRead.readXML(aParameters.c_str(), true); },
       261121, aParameters},
      {"key file FIFO", [&] { CDescriptionSection aSection; aSection.declareFromKeyFile(aKeys.c_str(), "Sec"); },
       261122, aKeys},
  };
  for (const SCase &aCase : aCases) {
    SCOPED_TRACE(aCase.mWhat);
    const SBoundedRun aRun = runBounded(aCase.mRead);
    EXPECT_TRUE(aRun.mEnded) << "did not end within " << CTLRX_TEST_SECONDS << " s";
    EXPECT_EQ(aRun.mCode, aCase.mCode);
    EXPECT_EQ(aRun.mMessage, aCase.mMessage);
  }
}
