// Deferred deletion: removes the file named by its one argument after the
// program that started it has exited and released the file.
#include "tlrx_platform.h"

#include <cerrno>
#include <cstdio>
#include <cstring>

int main(int argc, char **argv) {
  if (argc < 2 || argv[1][0] == '\0') {
    std::fprintf(stderr, "usage: main_delete_file FILE\n");
    return 2;
  }
  // The parent may still hold the file for a moment: retry briefly. A link
  // is removed itself; a directory is never ours to remove.
  int aError = 0;
  for (int aAttempt = 0; aAttempt < 20; ++aAttempt) {
    aError = fdfRemoveFileEntry(argv[1]);
    if (aError == 0 || aError == ENOENT)
      return 0;
    if (aError == EISDIR)
      break;
    fdfSleep(0.25);
  }
  std::fprintf(stderr, "main_delete_file: %s: %s\n", argv[1], std::strerror(aError));
  return 1;
}
