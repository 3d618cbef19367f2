#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>

#include <optional>

#include "toolkit/directory_listing.h"
#include "toolkit/log_tag.h"
#include "toolkit/zuno_func.h"

using sentrova::toolkit::DirectoryEntry;
using sentrova::toolkit::kLogTag;
using sentrova::toolkit::list_directory;

std::vector<std::string> ZunoFunc::Files_In_Dir(std::string dir) {
  const std::optional<std::vector<DirectoryEntry>> entries = list_directory(dir);
  if (!entries.has_value()) {
    if (errno != ENOENT) {
      fprintf(stdout, "[%s]I: Failed to opendir %s (%s)\n", kLogTag, dir.c_str(), strerror(errno));
    }
    return {};
  }
  std::vector<std::string> paths;
  for (const DirectoryEntry& entry : *entries) {
    const std::string path = dir + "/" + entry.name;
    struct stat info;
    if (stat(path.c_str(), &info) != 0) {
      fprintf(stdout, "[%s]I: Failed to stat %s (%s)\n", kLogTag, path.c_str(), strerror(errno));
      continue;
    }
    paths.push_back(path);
  }
  return paths;
}

bool ZunoFunc::GetMatchFileFromDir(const std::string& dir, std::vector<std::string>& names,
                                   std::function<bool(const std::string&)> match) {
  if (dir.empty()) {
    return false;
  }
  const std::optional<std::vector<DirectoryEntry>> entries = list_directory(dir);
  if (!entries.has_value()) {
    if (errno != ENOENT) {
      fprintf(stdout, "[%s]E: Failed to opendir:%s (%s)\n", kLogTag, dir.c_str(), strerror(errno));
    }
    return false;
  }
  for (const DirectoryEntry& entry : *entries) {
    if (Path_Exists(dir + "/" + entry.name) && match(entry.name)) {
      names.push_back(entry.name);
    }
  }
  return true;
}
