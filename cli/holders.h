#pragma once

#include <sys/types.h>

#include <string>
#include <vector>

namespace sentrova {

// What a process holds of a path, and by what.
struct HeldPath {
  std::string by;       // "descriptor", "mapping", "cwd", "root" or "exe"
  int descriptor = -1;  // its number; -1 for the others
  std::string path;     // as the kernel tells it: with " (deleted)" at its end where that is so
};

struct Holder {
  pid_t pid = 0;
  std::string name;  // the program as it was called, else the kernel's name for the process
  std::vector<HeldPath> held;
};

struct HolderSearch {
  std::vector<Holder> holders;  // by process id; the calling process is not among them
  size_t unreadable = 0;        // processes that this one may not look into
};

// Looks through all processes for those that hold `path`, an absolute path without symbolic links,
// or something below it. Nothing is signalled. What ends meanwhile is passed over.
HolderSearch find_holders(const std::string& path);

// How many processes a forced unmount would end if none let go: it compares names as plain text, so
// that /data stands for /data2 too.
size_t count_ended_by_force(const std::string& mount_point);

// Why the path stays busy as long as the calling process runs, in words; empty where it does not.
std::string find_own_hold(const std::string& path);

// The path of a line of /proc/PID/maps; empty where the mapping has no file.
std::string mapped_path(const std::string& line);

// Whether `held` is the path or lies below it, a deleted file too.
bool lies_in(const std::string& held, const std::string& path);

}  // namespace sentrova
