# The one list of warnings, all of them errors, for g++ and clang++ alike.
add_library(sentrova_warnings INTERFACE)
target_compile_options(sentrova_warnings INTERFACE
  -Werror -Wall -Wextra -Wshadow -Wconversion -Wsign-conversion -Wold-style-cast -Wcast-qual
  -Wformat=2 -Wundef -Wdouble-promotion -Wimplicit-fallthrough -Woverloaded-virtual
  -Wmissing-declarations -Wvla)
