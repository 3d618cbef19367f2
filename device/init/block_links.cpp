#include "device/init/block_links.h"

#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/strings.h>
#include <unistd.h>

#include <filesystem>
#include <set>

namespace sentrova::device {
namespace {

// Sorted, so that the same disk is the first one at every start.
std::set<std::string> folder_entries(const std::string& directory) {
  std::set<std::string> names;
  std::error_code error;
  for (std::filesystem::directory_iterator entry(directory, error), end; !error && entry != end;
       entry.increment(error)) {
    names.insert(entry->path().filename());
  }
  if (error) {
    LOG(ERROR) << "cannot list " << directory << ": " << error.message();
  }
  return names;
}

bool is_file_name(const std::string& name) {
  return !name.empty() && name != "." && name != ".." && name.find('/') == std::string::npos;
}

}  // namespace

std::optional<NamedPartition> parse_block_uevent(std::string_view text) {
  NamedPartition partition;
  for (const std::string& line : android::base::Split(std::string(text), "\n")) {
    const size_t equals = line.find('=');
    if (equals == std::string::npos) {
      continue;
    }
    const std::string key = line.substr(0, equals);
    if (key == "DEVNAME") {
      partition.device = line.substr(equals + 1);
    } else if (key == "PARTNAME") {
      partition.name = line.substr(equals + 1);
    }
  }
  if (!is_file_name(partition.device) || !is_file_name(partition.name)) {
    return std::nullopt;
  }
  return partition;
}

int link_partitions(const std::string& sys_class_block, const std::string& link_directory) {
  std::error_code error;
  std::filesystem::create_directories(link_directory, error);
  int links = 0;
  for (const std::string& device : folder_entries(sys_class_block)) {
    std::string text;
    if (!android::base::ReadFileToString(sys_class_block + "/" + device + "/uevent", &text)) {
      PLOG(ERROR) << "cannot read the uevent of " << device;
      continue;
    }
    const std::optional<NamedPartition> partition = parse_block_uevent(text);
    if (!partition) {
      continue;
    }
    const std::string link = link_directory + "/" + partition->name;
    if (symlink(("/dev/block/" + partition->device).c_str(), link.c_str()) == 0) {
      ++links;
    } else {
      PLOG(ERROR) << "cannot link " << link << " to " << partition->device;
    }
  }
  return links;
}

}  // namespace sentrova::device
