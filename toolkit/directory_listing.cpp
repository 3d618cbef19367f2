#include "toolkit/directory_listing.h"

#include <dirent.h>

#include <string_view>

#include "common/streams.h"

namespace sentrova::toolkit {

std::optional<std::vector<DirectoryEntry>> list_directory(const std::string& directory) {
  const Directory stream(opendir(directory.c_str()));
  if (stream == nullptr) {
    return std::nullopt;
  }
  std::vector<DirectoryEntry> entries;
  while (const dirent* entry = readdir(stream.get())) {
    const std::string_view name = entry->d_name;
    if (name != "." && name != "..") {
      entries.push_back({std::string(name), entry->d_type});
    }
  }
  return entries;
}

}  // namespace sentrova::toolkit
