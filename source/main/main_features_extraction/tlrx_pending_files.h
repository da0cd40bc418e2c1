// Files of a run that must not outlive its failure: temporary files, and
// results that are not complete yet. While a guard is alive, raising an
// error removes the files still registered with it, so a failed run leaves
// no half-written result that a reader could take for a finished one. With
// report-and-exit on, the removal runs from the error hook before the
// process ends; in throw mode, when the unwinding exception destroys the
// guard. One guard at a time; it owns the error hook while it lives.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

class CPendingFiles {
public:
  CPendingFiles();
  ~CPendingFiles();
  CPendingFiles(const CPendingFiles &) = delete;
  CPendingFiles &operator=(const CPendingFiles &) = delete;

  void addFile(const std::string &theName);
  // The data file and its header files ("_hdr", ".sml", ".hdr").
  void addRaster(const std::string &theName);
  // The header files only.
  void addHeaders(const std::string &theName);
  // Complete (or already removed): no longer removed on failure.
  void forgetFile(const std::string &theName);
  void forgetRaster(const std::string &theName);
  void forgetAll() { mFiles.clear(); }
  void removeAll();

private:
  static void onError(int32_t theCode);

  std::vector<std::string> mFiles;
  int mUncaught;
};

// Removes the header files of raster theName: its "_hdr", ".sml" and ".hdr".
void fdfRemoveHeaderFiles(const std::string &theName);
