#include "cli/search_commands.h"

#include <sys/stat.h>
#include <unistd.h>

#include <nlohmann/json.hpp>

#include "cli/library_messages.h"
#include "cli/printable.h"
#include "cli/progress.h"
#include "cli/volume_table.h"
#include "recovery_utils/roots_ex.h"
#include "toolkitutil/findfile.h"

namespace sentrova {
namespace {

std::string without_slashes_at_end(std::string path) {
  while (path.size() > 1 && path.back() == '/') {
    path.pop_back();
  }
  return path;
}

bool is_directory(const std::string& path) {
  struct stat status = {};
  return stat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
}

}  // namespace

ExitStatus find_file(const std::string& name, const std::string& directory, const Output& output) {
  if (name.empty() || name.find('/') != std::string::npos) {
    output.error("a file's name without its folder is wanted");
    return kExitUsage;
  }
  const std::string start = without_slashes_at_end(directory);
  if (!is_directory(start)) {
    output.error(start + " is not a directory");
    return kExitUsage;
  }
  std::string path;
  {
    const LibraryMessagesToStderr messages;
    const Progress progress("searching");
    path = Find_File::Find(name, start);
  }
  if (path.empty()) {
    output.error("no file of that name was found", {{"path", nullptr}});
    return kExitAnswerIsNo;
  }
  // For programs the path as it is.
  output.result(output.to_terminal() ? printable(path) : path, {{"path", path}});
  return kExitSuccess;
}

ExitStatus find_otg_disk(const Output& output) {
  if (!load_volumes(output)) {
    return kExitServiceFailed;
  }
  bool is_found = false;
  {
    const LibraryMessagesToStderr messages;
    const Progress progress("waiting for a USB disk");
    is_found = zuno_enable_otg_device();
  }
  if (!is_found) {
    output.error("no USB disk came, or the port cannot be switched", {{"found", false}});
    return kExitAnswerIsNo;
  }
  // The library takes other disks than the table's, too, of which it only says that one is there.
  const std::string device = blkdevice_for_mount_point("/otg");
  const bool is_known = access(device.c_str(), F_OK) == 0;
  output.result(is_known ? "a USB disk is there: " + device : "a USB disk is there",
                {{"found", true}, {"device", is_known ? nlohmann::json(device) : nullptr}});
  return kExitSuccess;
}

ExitStatus find_sd_card(const Output& output) {
  if (!load_volumes(output)) {
    return kExitServiceFailed;
  }
  std::string device;
  {
    const LibraryMessagesToStderr messages;
    device = zuno_search_sdcard_device();
  }
  if (device.empty()) {
    output.error("there is no SD card", {{"device", nullptr}});
    return kExitAnswerIsNo;
  }
  output.result(device, {{"device", device}});
  return kExitSuccess;
}

}  // namespace sentrova
