#include <android-base/strings.h>
#include <libdm/dm_target.h>

#include <utility>
#include <vector>

#include "common/wipe.h"

namespace android::dm {

namespace {

// The kernel parts parameters at blanks.
bool is_one_word(const std::string& text) {
  return !text.empty() && text.find_first_of(" \t\n") == std::string::npos;
}

bool is_key(const std::string& text) {
  return !text.empty() && text.size() % 2 == 0 &&
         text.find_first_not_of("0123456789abcdefABCDEF") == std::string::npos;
}

}  // namespace

DmTargetLinear::DmTargetLinear(uint64_t start, uint64_t length, std::string block_device,
                               uint64_t physical_sector)
    : DmTarget(start, length),
      block_device_(std::move(block_device)),
      physical_sector_(physical_sector) {}

std::string DmTargetLinear::name() const {
  return "linear";
}

std::string DmTargetLinear::GetParameterString() const {
  return block_device_ + " " + std::to_string(physical_sector_);
}

bool DmTargetLinear::Valid() const {
  return is_one_word(block_device_);
}

DmTargetCrypt::DmTargetCrypt(uint64_t start, uint64_t length, std::string cipher, std::string key,
                             uint64_t iv_sector_offset, std::string block_device,
                             uint64_t block_device_sector)
    : DmTarget(start, length),
      cipher_(std::move(cipher)),
      key_(key),
      iv_sector_offset_(iv_sector_offset),
      block_device_(std::move(block_device)),
      block_device_sector_(block_device_sector) {
  sentrova::wipe(key);
}

DmTargetCrypt::~DmTargetCrypt() {
  sentrova::wipe(key_);
}

std::string DmTargetCrypt::name() const {
  return "crypt";
}

std::string DmTargetCrypt::option_string() const {
  std::vector<std::string> options;
  if (allow_discards_) {
    options.emplace_back("allow_discards");
  }
  if (sector_size_bytes_ != 0) {
    options.push_back("sector_size:" + std::to_string(sector_size_bytes_));
    options.emplace_back("iv_large_sectors");
  }
  return options.empty() ? ""
                         : " " + std::to_string(options.size()) + " " + base::Join(options, ' ');
}

std::string DmTargetCrypt::GetParameterString() const {
  const std::string tail = " " + std::to_string(iv_sector_offset_) + " " + block_device_ + " " +
                           std::to_string(block_device_sector_) + option_string();
  // One piece of memory from the start: growing would leave copies of the key behind.
  std::string parameters;
  parameters.reserve(cipher_.size() + 1 + key_.size() + tail.size());
  parameters.append(cipher_).append(" ").append(key_).append(tail);
  return parameters;
}

bool DmTargetCrypt::Valid() const {
  return is_one_word(cipher_) && is_one_word(block_device_) && is_key(key_);
}

}  // namespace android::dm
