#include "device/zunofscrypt/metadata_encryption.h"

#include <fs_mgr.h>
#include <string.h>
#include <sys/stat.h>

#include <cerrno>
#include <optional>

#include "device/zunofscrypt/crypt_mapping.h"
#include "device/zunofscrypt/key_file.h"

namespace sentrova {
namespace {

// Whether the file system on this device is the one that the directory belongs to.
bool is_mounted_at(const std::string& device, const std::string& directory) {
  struct stat node = {};
  struct stat top = {};
  return stat(device.c_str(), &node) == 0 && stat(directory.c_str(), &top) == 0 &&
         S_ISBLK(node.st_mode) && node.st_rdev == top.st_dev;
}

bool mount_mapping(const std::string& node, const std::string& mount_point,
                   android::fs_mgr::FstabEntry row, std::string& error) {
  if (is_mounted_at(node, mount_point)) {
    return true;
  }
  row.blk_device = node;
  if (fs_mgr_do_mount_one(row, mount_point) != FS_MGR_DOMNT_SUCCESS) {
    error = "cannot mount " + node + " at " + mount_point + ": " + strerror(errno);
    return false;
  }
  return true;
}

std::optional<std::string> make_metadata_mapping(const Places& places,
                                                 const android::fs_mgr::FstabEntry& data_row,
                                                 std::string& error) {
  const std::optional<WrappedKey> wrapped = read_key_file(metadata_key_path(data_row), error);
  const std::optional<WrappingKey> secret =
      wrapped ? read_secret_file(places.device_secret(), error) : std::nullopt;
  const std::optional<MasterKey> key =
      secret ? unwrap_with_device_secret(*wrapped, *secret, kMetadataPurpose, error) : std::nullopt;
  return key ? make_mapping(places.mapping, data_row.blk_device, 0, *key, error) : std::nullopt;
}

}  // namespace

std::string metadata_key_path(const android::fs_mgr::FstabEntry& data_row) {
  return data_row.metadata_key_dir + "/key";
}

bool unlock_metadata(const Places& places, const android::fs_mgr::FstabEntry& data_row,
                     std::string& error) {
  const std::optional<std::string> found = find_mapping(places.mapping, error);
  if (!found) {
    return false;
  }
  if (!found->empty()) {
    return mount_mapping(*found, places.data, data_row, error);
  }
  const std::optional<std::string> made = make_metadata_mapping(places, data_row, error);
  if (!made) {
    return false;
  }
  if (mount_mapping(*made, places.data, data_row, error)) {
    return true;
  }
  std::string ignored;  // the mount's reason is the one to be told
  remove_mapping(places.mapping, ignored);
  return false;
}

}  // namespace sentrova
