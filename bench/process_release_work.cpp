// The work that bench/process_release times:
//   hold PROCESSES DESCRIPTORS MAPPINGS FOLDER HELD   starts that many processes, each with so many
//     files of FOLDER open and pages of one mapped; HELD of them also have FOLDER/held/file open.
//     Prints a line when all are ready and keeps them until standard input ends.
//   walk PATH        KillProcessesWithOpenFiles(PATH, 0); the count goes to standard error
//   scan COUNT       scan_mounted_volumes, COUNT times
//   rounds COUNT PATH   scan, find and walk, COUNT times; prints what has become of the number of
//     open descriptors and of the bytes allocated between the tenth round and the last
// walk and scan print the seconds that they took as the last line of standard error. Exits with 2
// if it was called wrongly, with 1 if something failed.
#include <fcntl.h>
#include <malloc.h>
#include <signal.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <iterator>
#include <string>
#include <string_view>
#include <vector>

#include "recovery_utils/mounts_ex.h"

namespace {

using android::recovery::KillProcessesWithOpenFiles;

// `ready` is closed when all is held.
[[noreturn]] void be_held(int descriptors, int mappings, const std::string& folder, bool holds,
                          int ready) {
  prctl(PR_SET_PDEATHSIG, SIGKILL);
  const std::string file = folder + "/file";
  for (int i = 0; i < descriptors; ++i) {
    const bool last = i == descriptors - 1;
    const std::string& path = holds && last ? folder + "/held/file" : file;
    if (open(path.c_str(), O_RDONLY | O_CLOEXEC) == -1) {
      _exit(1);
    }
  }
  const int mapped = open(file.c_str(), O_RDONLY | O_CLOEXEC);
  for (int i = 0; i < mappings; ++i) {
    // The same page each time, so that neighbours are not joined to one line.
    mmap(nullptr, 1, PROT_READ, MAP_PRIVATE, mapped, 0);
  }
  close(mapped);
  close(ready);
  while (true) {
    pause();
  }
}

int hold(int processes, int descriptors, int mappings, const std::string& folder, int held) {
  int ready[2];
  if (pipe2(ready, O_CLOEXEC) != 0) {
    return 1;
  }
  std::vector<pid_t> children;
  for (int i = 0; i < processes; ++i) {
    const pid_t pid = fork();
    if (pid == -1) {
      std::perror("fork");
      return 1;
    }
    if (pid == 0) {
      close(ready[0]);
      be_held(descriptors, mappings, folder, i < held, ready[1]);
    }
    children.push_back(pid);
  }
  close(ready[1]);
  char byte;
  if (read(ready[0], &byte, 1) != 0) {  // ends when no process has its end open any more
    return 1;
  }
  std::puts("ready");
  std::fflush(stdout);
  std::getchar();
  for (const pid_t pid : children) {
    kill(pid, SIGKILL);
  }
  while (wait(nullptr) > 0) {
  }
  return 0;
}

void print_seconds(const std::function<void()>& work) {
  const auto start = std::chrono::steady_clock::now();
  work();
  const std::chrono::duration<double> elapsed = std::chrono::steady_clock::now() - start;
  std::fprintf(stderr, "%.6f\n", elapsed.count());
}

long count_descriptors() {
  const std::filesystem::directory_iterator descriptors("/proc/self/fd");
  return std::distance(begin(descriptors), end(descriptors));
}

int rounds(int count, const std::string& path) {
  constexpr int kWarmUp = 10;
  long descriptors = 0;
  size_t bytes = 0;
  for (int round = 1; round <= count; ++round) {
    if (!scan_mounted_volumes() || find_mounted_volume_by_mount_point("/proc") == nullptr ||
        KillProcessesWithOpenFiles(path.c_str(), 0) < 0) {
      return 1;
    }
    if (round == kWarmUp) {
      descriptors = count_descriptors();
      bytes = mallinfo2().uordblks;
    }
  }
  std::fprintf(stderr, "%ld %zd\n", count_descriptors() - descriptors,
               static_cast<ssize_t>(mallinfo2().uordblks - bytes));
  return 0;
}

}  // namespace

int main(int argc, char** argv) {
  const std::string_view work = argc > 1 ? argv[1] : "";
  if (work == "hold" && argc == 7) {
    return hold(std::atoi(argv[2]), std::atoi(argv[3]), std::atoi(argv[4]), argv[5],
                std::atoi(argv[6]));
  }
  if (work == "walk" && argc == 3) {
    print_seconds([&] { std::fprintf(stderr, "%d\n", KillProcessesWithOpenFiles(argv[2], 0)); });
    return 0;
  }
  if (work == "scan" && argc == 3) {
    bool good = true;
    print_seconds([&] {
      for (int i = 0; i < std::atoi(argv[2]); ++i) {
        good &= scan_mounted_volumes();
      }
    });
    return good ? 0 : 1;
  }
  if (work == "rounds" && argc == 4) {
    return rounds(std::atoi(argv[2]), argv[3]);
  }
  std::fprintf(stderr, "usage: see the head of %s\n", __FILE__);
  return 2;
}
