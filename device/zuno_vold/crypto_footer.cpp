#include "device/zuno_vold/crypto_footer.h"

#include <android-base/file.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <string.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <vector>

#include "device/zunofscrypt/crypt_mapping.h"
#include "device/zunofscrypt/places.h"

namespace sentrova {
namespace {

using android::base::unique_fd;

bool fail(const std::string& block_device, std::string& error) {
  error = block_device + ": " + strerror(errno);
  return false;
}

std::optional<off64_t> footer_offset(const std::string& block_device, std::string& error) {
  const std::optional<uint64_t> bytes = block_device_bytes(block_device, error);
  if (!bytes) {
    return std::nullopt;
  }
  if (*bytes < kFooterBytes) {
    error = block_device + ": too small for a footer";
    return std::nullopt;
  }
  return static_cast<off64_t>(*bytes - kFooterBytes);
}

}  // namespace

std::optional<WrappedKey> read_footer(const std::string& block_device, std::string& error) {
  const std::optional<off64_t> offset = footer_offset(block_device, error);
  if (!offset) {
    return std::nullopt;
  }
  const unique_fd device(open(block_device.c_str(), O_RDONLY | O_CLOEXEC));
  WrappedKey key;
  if (!device.ok() ||
      !android::base::ReadFullyAtOffset(device.get(), key.data(), key.size(), *offset)) {
    fail(block_device, error);
    return std::nullopt;
  }
  return key;
}

bool write_footer(const std::string& block_device, const WrappedKey& key, std::string& error) {
  const std::optional<off64_t> offset = footer_offset(block_device, error);
  if (!offset) {
    return false;
  }
  std::vector<uint8_t> footer(kFooterBytes);
  std::copy(key.begin(), key.end(), footer.begin());
  const unique_fd device(open(block_device.c_str(), O_WRONLY | O_CLOEXEC));
  return (device.ok() && lseek64(device.get(), *offset, SEEK_SET) == *offset &&
          android::base::WriteFully(device.get(), footer.data(), footer.size()) &&
          fsync(device.get()) == 0) ||
         fail(block_device, error);
}

bool unlock_full_disk(const std::string& mapping, const std::string& block_device,
                      std::string& error) {
  const std::optional<std::string> found = find_mapping(mapping, error);
  if (!found || !found->empty()) {
    return found.has_value();
  }
  const std::optional<WrappedKey> wrapped = read_footer(block_device, error);
  const std::optional<MasterKey> key =
      wrapped ? unwrap_with_credential(*wrapped, kAbsentCredential, kFullDiskPurpose, error)
              : std::nullopt;
  return key && make_mapping(mapping, block_device, kFooterBytes, *key, error);
}

}  // namespace sentrova
