// One copy by the toolkit, for bench/copy_file: copy_file_copy SOURCE DESTINATION
// Exits with 1 if the copy could not be given its mode, and with 2 if it was called wrongly.
#include <cstdio>

#include "toolkit/zuno_func.h"

int main(int argc, char** argv) {
  if (argc != 3) {
    std::fprintf(stderr, "usage: %s SOURCE DESTINATION\n", argv[0]);
    return 2;
  }
  constexpr int kMode = 0644;
  return ZunoFunc::copy_file(argv[1], argv[2], kMode) == 0 ? 0 : 1;
}
