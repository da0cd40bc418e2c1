// Deferred deletion: removes the file named by its one argument after the
// program that started it has exited and released the file.
#include <cerrno>
#include <cstdio>
#include <sys/stat.h>
#include <unistd.h>

int main(int argc, char **argv) {
  if (argc < 2 || argv[1][0] == '\0') {
    std::fprintf(stderr, "usage: main_delete_file FILE\n");
    return 2;
  }
  // The parent may still hold the file for a moment: retry briefly.
  for (int aAttempt = 0; aAttempt < 20; ++aAttempt) {
    chmod(argv[1], S_IRUSR | S_IWUSR);
    if (unlink(argv[1]) == 0 || errno == ENOENT)
      return 0;
    usleep(250000);
  }
  std::perror(argv[1]);
  return 1;
}
