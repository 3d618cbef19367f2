#include "toolkitutil/findfile.h"

#include <android-base/logging.h>
#include <dirent.h>
#include <limits.h>
#include <stdlib.h>

#include <algorithm>
#include <iterator>
#include <string_view>
#include <unordered_set>
#include <utility>

#include "common/streams.h"

namespace {

// A path still to be searched. Links are resolved only when their turn comes.
struct Pending {
  std::string path;
  bool is_link;
};

// Puts `paths` on top of the stack so that the first of them is taken first.
void push_all(std::vector<std::string>& paths, bool are_links, std::vector<Pending>& pending) {
  std::for_each(paths.rbegin(), paths.rend(), [&](std::string& path) {
    pending.push_back({std::move(path), are_links});
  });
}

// Replaces the path of a link by what it resolves to. Returns false if it does not resolve.
bool resolve(std::string& path) {
  char resolved[PATH_MAX];
  if (realpath(path.c_str(), resolved) == nullptr) {
    return false;
  }
  path = resolved;
  return true;
}

// Reads one directory. Returns the path of the wanted file at once if it is listed; otherwise the
// empty string, with what the directory leads to put on the stack.
std::string search_directory(const std::string& file_name, const std::string& directory,
                             std::vector<Pending>& pending) {
  const sentrova::Directory stream(opendir(directory.c_str()));
  if (stream == nullptr) {
    // No blank before the path: log readers know the line in this form.
    PLOG(ERROR) << "Find_File: Error opening" << directory;
    return {};
  }
  std::vector<std::string> subdirectories;
  std::vector<std::string> links;
  while (const dirent* entry = readdir(stream.get())) {
    const std::string_view name = entry->d_name;
    if (name == "." || name == "..") {
      continue;
    }
    const auto full_path = [&] { return std::string(directory).append("/").append(name); };
    if (entry->d_type == DT_REG && name == file_name) {
      return full_path();
    }
    if (entry->d_type == DT_DIR) {
      subdirectories.push_back(full_path());
    } else if (entry->d_type == DT_LNK) {
      links.push_back(full_path());
    }
  }
  push_all(links, true, pending);
  push_all(subdirectories, false, pending);
  return {};
}

}  // namespace

std::string Find_File::Find(const std::string& file_name, const std::string& start_directory) {
  return Find_File().Find_Internal(file_name, start_directory);
}

std::string Find_File::Find_Internal(const std::string& file_name, const std::string& directory) {
  // A stack of our own instead of recursion, and a set beside the list: depth must not cost call
  // stack, and many directories must not cost a scan of the list for each.
  std::unordered_set<std::string> entered(searched_dirs.begin(), searched_dirs.end());
  std::vector<Pending> pending{{directory, false}};
  while (!pending.empty()) {
    Pending next = std::move(pending.back());
    pending.pop_back();
    if ((next.is_link && !resolve(next.path)) || !entered.insert(next.path).second) {
      continue;
    }
    searched_dirs.push_back(std::move(next.path));
    std::string match = search_directory(file_name, searched_dirs.back(), pending);
    if (!match.empty()) {
      return match;
    }
  }
  return {};
}
