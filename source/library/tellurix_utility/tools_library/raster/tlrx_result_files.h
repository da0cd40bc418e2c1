// The results of a command and the files it reads. Before anything is
// written, a command lists both and refuses a result that would land on one
// of its inputs. A result raster is written under a temporary name in its
// folder and moved into place once complete, its header last, so a run that
// fails or is interrupted never leaves a result that claims to be complete.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "tlrx_pending_files.h"
#include "tlrx_raster_file.h"

class CDescription;

// The files a command reads and the results it writes.
class CRunFiles {
public:
  // A plain file read (argument, list or parameter file).
  void addRead(const std::string &theName) { mReads.push_back(theName); }
  // An input raster with its header files ("_hdr", ".sml", ".hdr").
  void addInput(const std::string &theName);
  // A plain file written (a parameter file the run updates).
  void addWrite(const std::string &theName) { mWrites.push_back(theName); }
  // A result raster with its header files and, when theTiff, its GeoTIFF
  // copy with the copy's header files.
  void addResult(const std::string &theName, bool theTiff);

  // Raises theCode naming the first file to be written that is one of the
  // files read (the same file however it is spelled), a result named like a
  // header file (its header would be written over it), or a result named
  // like another.
  void refuseClashes(int32_t theCode) const;

private:
  std::vector<std::string> mReads;
  std::vector<std::string> mResults;
  std::vector<std::string> mWrites;
};

// A result raster in progress: written under a temporary name beside its
// final one, removed on failure, moved into place by commit().
class CResultRaster {
public:
  CResultRaster(const std::string &theName, const CDescription &theHeader);
  CResultRaster(const CResultRaster &) = delete;
  CResultRaster &operator=(const CResultRaster &) = delete;

  CRasterFile &file() { return mRaster; }
  const std::string &name() const { return mName; }
  // Closes the raster, moves it into place and writes its header (failure:
  // theHeaderCode with the header name). The result then belongs to the run:
  // removed should the run fail later.
  void commit(CDescription &theHeader, int32_t theHeaderCode);

private:
  std::string mName;
  std::string mTemporary;
  CPendingFiles mPending;
  CRasterFile mRaster;
};

// A file name in the working folder unique to this run: theStem + "_" +
// process id. Temporaries there never take the name of a user's file.
std::string fdfRunTemporaryName(const char *theStem);

// Temporary name of the run beside theName: theName + ".part-" + process id.
std::string fdfPartName(const std::string &theName);
