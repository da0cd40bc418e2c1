// Files of a run that must not outlive its failure: temporary files, results
// that are not complete yet, and the results of a run that has not finished.
// A guard destroyed by a raised error on its way to the entry point removes
// the files still registered with it, so a failed run leaves no result that
// a reader could take for a finished one. Guards nest: the run holds the outermost, a
// result in progress its own, which hands its files over to the run's once
// complete.
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
  // Moves the files to the run's (outermost) guard; forgotten when this is it.
  void handOver();
  void removeAll();

  // The run's guard: the outermost alive, nullptr when none.
  static CPendingFiles *outermost();

private:
  std::vector<std::string> mFiles;
  CPendingFiles *mEnclosing;
  int mUncaught;
};

// Registers a file with the run's (outermost) guard, when there is one.
void fdfAddPendingFile(const std::string &theName);

// The header files of raster theName: its "_hdr", ".sml" and ".hdr".
std::vector<std::string> fdfHeaderFiles(const std::string &theName);
// Removes the header files of raster theName.
void fdfRemoveHeaderFiles(const std::string &theName);
