// One search by the file finder, for bench/findfile: findfile_search DIRECTORY NAME
// Prints the seconds that the search took. Exits with 1 if the name was found, which would make the
// time meaningless, and with 2 if it was called wrongly.
#include <chrono>
#include <cstdio>

#include "toolkitutil/findfile.h"

int main(int argc, char** argv) {
  if (argc != 3) {
    std::fprintf(stderr, "usage: %s DIRECTORY NAME\n", argv[0]);
    return 2;
  }
  const auto start = std::chrono::steady_clock::now();
  const std::string match = Find_File::Find(argv[2], argv[1]);
  const std::chrono::duration<double> elapsed = std::chrono::steady_clock::now() - start;
  std::printf("%.6f\n", elapsed.count());
  return match.empty() ? 0 : 1;
}
