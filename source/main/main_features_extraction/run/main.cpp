// Executable entry: the command line is argv[1..] joined by single blanks.
#include "main_features_extraction.h"

#include <string>

int main(int argc, char **argv) {
  std::string aCommandLine;
  for (int i = 1; i < argc; ++i) {
    if (i > 1)
      aCommandLine += ' ';
    aCommandLine += argv[i];
  }
  return main_features_extraction(aCommandLine.c_str());
}
