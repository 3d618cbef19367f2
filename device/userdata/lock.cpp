#include "device/userdata/lock.h"

#include <string.h>
#include <sys/mount.h>
#include <unistd.h>

#include <cerrno>

#include "device/zunofscrypt/crypt_mapping.h"
#include "device/zunofscrypt/user_storage.h"

namespace sentrova {
namespace {

bool is_file_encrypted(const Places& places) {
  return access(places.key_version().c_str(), F_OK) == 0;
}

bool lock_files(const Places& places, std::string& error) {
  return lock_folders(places.data, places.ce_folders(0), error) &&
         lock_folders(places.data, places.de_folders(), error);
}

// EINVAL: nothing is mounted there.
bool unmount(const std::string& mount_point, std::string& error) {
  if (umount(mount_point.c_str()) == 0 || errno == EINVAL) {
    return true;
  }
  error = "cannot unmount " + mount_point + ": " + strerror(errno);
  return false;
}

}  // namespace

bool lock_user_data(const Places& places, std::string& error) {
  return (!is_file_encrypted(places) || lock_files(places, error)) &&
         close_user_data(places, error);
}

bool close_user_data(const Places& places, std::string& error) {
  return unmount(places.data, error) && remove_mapping(places.mapping, error);
}

}  // namespace sentrova
