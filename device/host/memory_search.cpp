// Looks for a text in the memory of a process, as UTF-8 and as UTF-16 in this machine's byte order.
//
//   memory_search PID    the text, ASCII, is the first line of standard input
//
// Prints each region that holds it. Exit status: 0 when none does, 1 when one does, 2 for a wrong
// command line or when the memory cannot be read.

#include <android-base/file.h>
#include <android-base/parseint.h>
#include <android-base/strings.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <string.h>
#include <unistd.h>

#include <cinttypes>
#include <cstdio>
#include <iostream>
#include <optional>
#include <string>
#include <vector>

namespace {

enum ExitStatus : int { kAbsent = 0, kPresent = 1, kCannotTell = 2 };

struct Region {
  uint64_t begin;
  uint64_t end;
  std::string line;  // as the kernel lists it
};

// A line of /proc/PID/maps; nothing for a region that cannot be read at all.
std::optional<Region> parse_region(const std::string& line) {
  Region region = {0, 0, line};
  char readable = '-';
  if (sscanf(line.c_str(), "%" SCNx64 "-%" SCNx64 " %c", &region.begin, &region.end, &readable) !=
          3 ||
      readable != 'r') {
    return std::nullopt;
  }
  return region;
}

std::string as_utf16(const std::string& ascii) {
  std::string bytes;
  for (const char character : ascii) {
    bytes += {character, '\0'};
  }
  return bytes;
}

// As much of the region as can be read: the kernel's own pages in it cannot.
std::string read_region(int memory, const Region& region) {
  std::string content(region.end - region.begin, '\0');
  size_t length = 0;
  while (length < content.size()) {
    const ssize_t count = pread64(memory, content.data() + length, content.size() - length,
                                  static_cast<off64_t>(region.begin + length));
    if (count <= 0) {
      break;
    }
    length += static_cast<size_t>(count);
  }
  content.resize(length);
  return content;
}

int search(const std::string& process, const std::string& text) {
  const android::base::unique_fd memory(open((process + "/mem").c_str(), O_RDONLY | O_CLOEXEC));
  std::string maps;
  if (!memory.ok() || !android::base::ReadFileToString(process + "/maps", &maps)) {
    perror(process.c_str());
    return kCannotTell;
  }
  uint64_t searched_bytes = 0;
  int status = kAbsent;
  for (const std::string& line : android::base::Split(maps, "\n")) {
    const std::optional<Region> region = parse_region(line);
    const std::string content = region ? read_region(memory.get(), *region) : "";
    searched_bytes += content.size();
    for (const std::string& wanted : {text, as_utf16(text)}) {
      if (memmem(content.data(), content.size(), wanted.data(), wanted.size()) != nullptr) {
        printf("found as %s in %s\n", wanted == text ? "UTF-8" : "UTF-16", line.c_str());
        status = kPresent;
      }
    }
  }
  printf("searched %" PRIu64 " KiB\n", searched_bytes / 1024);
  return searched_bytes > 0 ? status : kCannotTell;
}

}  // namespace

int main(int argc, char** argv) {
  unsigned int pid = 0;
  std::string text;
  if (argc != 2 || !android::base::ParseUint(argv[1], &pid) || !std::getline(std::cin, text) ||
      text.empty()) {
    fprintf(stderr, "usage: memory_search PID, and the text on standard input\n");
    return kCannotTell;
  }
  return search("/proc/" + std::to_string(pid), text);
}
