#include "device/zunofscrypt/crypt_mapping.h"

#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <libdm/dm.h>
#include <linux/fs.h>
#include <string.h>
#include <sys/ioctl.h>

#include <cerrno>
#include <chrono>
#include <utility>

namespace sentrova {
namespace {

using android::dm::DeviceMapper;
using android::dm::DmDeviceState;
using android::dm::DmTable;
using android::dm::DmTargetCrypt;

constexpr char kCipher[] = "aes-xts-plain64";
constexpr uint64_t kSectorBytes = 512;
constexpr uint32_t kUnitBytes = 4096;
constexpr uint64_t kSectorsPerUnit = kUnitBytes / kSectorBytes;
constexpr std::chrono::seconds kNodeTimeout(5);

bool fail(const std::string& name, std::string& error) {
  error = "device-mapper device " + name + ": " + strerror(errno);
  return false;
}

// In hexadecimal digits. The target that takes the text wipes it.
std::string hexadecimal(const MasterKey& key) {
  static constexpr char kDigits[] = "0123456789abcdef";
  std::string text;
  text.reserve(2 * MasterKey::size());  // or growth would leave copies behind
  for (size_t i = 0; i < MasterKey::size(); ++i) {
    text.push_back(kDigits[key.data()[i] >> 4]);
    text.push_back(kDigits[key.data()[i] & 0xf]);
  }
  return text;
}

}  // namespace

std::optional<std::string> find_mapping(const std::string& name, std::string& error) {
  DeviceMapper& mapper = DeviceMapper::Instance();
  std::string node;
  if (mapper.GetState(name) != DmDeviceState::ACTIVE) {
    return node;
  }
  if (!mapper.GetDmDevicePathByName(name, &node)) {
    fail(name, error);
    return std::nullopt;
  }
  return node;
}

std::optional<std::string> make_mapping(const std::string& name, const std::string& block_device,
                                        uint64_t reserved_bytes, const MasterKey& key,
                                        std::string& error) {
  const std::optional<uint64_t> bytes = block_device_bytes(block_device, error);
  if (!bytes) {
    return std::nullopt;
  }
  if (*bytes < reserved_bytes + kUnitBytes) {
    error = block_device + ": too small";
    return std::nullopt;
  }
  const uint64_t sectors = (*bytes - reserved_bytes) / kUnitBytes * kSectorsPerUnit;
  auto target =
      std::make_unique<DmTargetCrypt>(0U, sectors, kCipher, hexadecimal(key), 0U, block_device, 0U);
  target->SetSectorSize(kUnitBytes);
  DmTable table;
  table.AddTarget(std::move(target));
  DeviceMapper& mapper = DeviceMapper::Instance();
  std::string node;
  if ((mapper.GetState(name) == DmDeviceState::SUSPENDED && !mapper.DeleteDevice(name)) ||
      !mapper.CreateDevice(name, table, &node, kNodeTimeout)) {
    fail(name, error);
    return std::nullopt;
  }
  return node;
}

bool remove_mapping(const std::string& name, std::string& error) {
  return DeviceMapper::Instance().DeleteDeviceIfExists(name) || fail(name, error);
}

std::optional<uint64_t> block_device_bytes(const std::string& path, std::string& error) {
  const android::base::unique_fd fd(open(path.c_str(), O_RDONLY | O_CLOEXEC));
  uint64_t bytes = 0;
  if (!fd.ok() || ioctl(fd.get(), BLKGETSIZE64, &bytes) != 0) {
    error = path + ": " + strerror(errno);
    return std::nullopt;
  }
  return bytes;
}

}  // namespace sentrova
