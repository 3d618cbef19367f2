#include "device/zunofscrypt/key_file.h"

#include <android-base/file.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

namespace sentrova {
namespace {

using android::base::unique_fd;

bool fail(const std::string& path, const char* reason, std::string& error) {
  error = path + ": " + reason;
  return false;
}

bool read_whole(const std::string& path, void* bytes, size_t size, std::string& error) {
  // O_NONBLOCK: a FIFO in the file's place must not hold the caller up.
  const unique_fd file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
  struct stat status = {};
  if (!file.ok() || fstat(file.get(), &status) != 0) {
    return fail(path, strerror(errno), error);
  }
  if (!S_ISREG(status.st_mode) || status.st_size != static_cast<off_t>(size)) {
    return fail(path, "damaged: not a file of the right size", error);
  }
  return android::base::ReadFully(file.get(), bytes, size) || fail(path, strerror(errno), error);
}

bool write_whole(const std::string& path, const void* bytes, size_t size) {
  const unique_fd file(
      open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC | O_NOFOLLOW, 0600));
  return file.ok() && android::base::WriteFully(file.get(), bytes, size) && fsync(file.get()) == 0;
}

bool sync_folder_of(const std::string& path) {
  const unique_fd folder(
      open(android::base::Dirname(path).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  return folder.ok() && fsync(folder.get()) == 0;
}

}  // namespace

std::optional<WrappedKey> read_key_file(const std::string& path, std::string& error) {
  WrappedKey key;
  return read_whole(path, key.data(), key.size(), error) ? std::optional(key) : std::nullopt;
}

std::optional<WrappingKey> read_secret_file(const std::string& path, std::string& error) {
  std::optional<WrappingKey> secret(std::in_place);
  if (!read_whole(path, secret->data(), WrappingKey::size(), error)) {
    secret.reset();
  }
  return secret;
}

bool replace_file(const std::string& path, const void* bytes, size_t size, std::string& error) {
  const std::string beside = path + ".new";
  if (!write_whole(beside, bytes, size) || rename(beside.c_str(), path.c_str()) != 0) {
    const int reason = errno;
    unlink(beside.c_str());
    return fail(path, strerror(reason), error);
  }
  return sync_folder_of(path) || fail(path, strerror(errno), error);
}

}  // namespace sentrova
