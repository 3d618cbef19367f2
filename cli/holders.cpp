#include "cli/holders.h"

#include <android-base/file.h>
#include <android-base/parseint.h>
#include <android-base/strings.h>
#include <stdio.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <functional>
#include <set>

#include "common/streams.h"

namespace sentrova {
namespace {

constexpr char kProc[] = "/proc/";

// Calls `visit` with the number of each entry that is a number. Returns false, with `errno`, if the
// directory cannot be opened.
bool for_each_number(const std::string& path, const std::function<void(int)>& visit) {
  const Directory directory(opendir(path.c_str()));
  if (directory == nullptr) {
    return false;
  }
  int number = 0;
  while (const dirent* entry = readdir(directory.get())) {
    if (android::base::ParseInt(entry->d_name, &number, 0)) {
      visit(number);
    }
  }
  return true;
}

// Whether a path that a process holds is one of those that are looked for.
using IsWanted = std::function<bool(const std::string& held)>;

void add_link(const std::string& link, HeldPath held, const IsWanted& is_wanted, Holder& holder) {
  if (android::base::Readlink(link, &held.path) && is_wanted(held.path)) {
    holder.held.push_back(std::move(held));
  }
}

// A file's mappings count once.
void add_mappings(const std::string& maps_path, const IsWanted& is_wanted, Holder& holder) {
  std::string maps;
  android::base::ReadFileToString(maps_path, &maps);
  std::set<std::string> files;
  for (const std::string& line : android::base::Split(maps, "\n")) {
    const std::string file = mapped_path(line);
    if (is_wanted(file) && files.insert(file).second) {
      holder.held.push_back({.by = "mapping", .path = file});
    }
  }
}

// Returns false where the process may not be looked into.
bool read_holder(const IsWanted& is_wanted, Holder& holder) {
  const std::string base = kProc + std::to_string(holder.pid);
  for (const char* const by : {"cwd", "root", "exe"}) {
    add_link(base + "/" + by, {.by = by, .path = ""}, is_wanted, holder);
  }
  const std::string descriptors = base + "/fd";
  const bool is_open = for_each_number(descriptors, [&](int descriptor) {
    add_link(descriptors + "/" + std::to_string(descriptor),
             {.by = "descriptor", .descriptor = descriptor, .path = ""}, is_wanted, holder);
  });
  const bool may_look = is_open || errno != EACCES;
  add_mappings(base + "/maps", is_wanted, holder);
  return may_look;
}

// The first argument or, of a kernel thread, the name in brackets.
std::string read_name(pid_t pid) {
  const std::string base = kProc + std::to_string(pid);
  std::string text;
  android::base::ReadFileToString(base + "/cmdline", &text);
  const std::string program = text.c_str();
  if (!program.empty()) {
    return program;
  }
  android::base::ReadFileToString(base + "/comm", &text);
  return "[" + android::base::Trim(text) + "]";
}

HolderSearch search_processes(const IsWanted& is_wanted) {
  HolderSearch search;
  for_each_number(kProc, [&](int pid) {
    if (pid == getpid()) {
      return;
    }
    Holder holder;
    holder.pid = pid;
    if (!read_holder(is_wanted, holder)) {
      ++search.unreadable;
    }
    if (!holder.held.empty()) {
      holder.name = read_name(pid);
      search.holders.push_back(std::move(holder));
    }
  });
  std::sort(search.holders.begin(), search.holders.end(),
            [](const Holder& one, const Holder& other) { return one.pid < other.pid; });
  return search;
}

}  // namespace

HolderSearch find_holders(const std::string& path) {
  return search_processes([&path](const std::string& held) { return lies_in(held, path); });
}

size_t count_ended_by_force(const std::string& mount_point) {
  const auto is_wanted = [&mount_point](const std::string& held) {
    return held.starts_with(mount_point);
  };
  return search_processes(is_wanted).holders.size();
}

std::string find_own_hold(const std::string& path) {
  Holder self;
  self.pid = getpid();
  read_holder([&path](const std::string& held) { return lies_in(held, path); }, self);
  return self.held.empty()
             ? ""
             : path + " is held by this command, which was started there or is redirected there";
}

std::string mapped_path(const std::string& line) {
  // Addresses, rights, offset, device and inode stand before it; proc(5).
  int start = 0;
  if (sscanf(line.c_str(), "%*x-%*x %*s %*x %*x:%*x %*u %n", &start) == EOF || start <= 0) {
    return "";
  }
  const std::string path = line.substr(static_cast<size_t>(start));
  return path.starts_with('/') ? path : "";
}

bool lies_in(const std::string& held, const std::string& path) {
  if (path == "/") {
    return held.starts_with('/');
  }
  if (!held.starts_with(path)) {
    return false;
  }
  const std::string rest = held.substr(path.size());
  return rest.empty() || rest.front() == '/' || rest == " (deleted)";
}

}  // namespace sentrova
