#pragma once

#include <stdint.h>

#include <string>

#include "common/export.h"

namespace android::dm {

// One target of a device-mapper table. Starts, sizes and offsets are sectors of 512 bytes.
class SENTROVA_API DmTarget {
 public:
  DmTarget(uint64_t start, uint64_t length) : start_(start), length_(length) {}
  virtual ~DmTarget() = default;
  DmTarget(const DmTarget&) = delete;
  DmTarget& operator=(const DmTarget&) = delete;

  uint64_t start() const { return start_; }
  uint64_t size() const { return length_; }

  // The kernel's name of the target.
  virtual std::string name() const = 0;

  // The kernel's parameters of the target (Documentation/admin-guide/device-mapper). May hold a
  // key: whoever calls this wipes the string.
  virtual std::string GetParameterString() const = 0;

  // Whether the parameters are usable. Whether the kernel takes them shows when the table is
  // loaded.
  virtual bool Valid() const { return true; }

 private:
  const uint64_t start_;
  const uint64_t length_;
};

// A slice of a block device.
class SENTROVA_API DmTargetLinear final : public DmTarget {
 public:
  DmTargetLinear(uint64_t start, uint64_t length, std::string block_device,
                 uint64_t physical_sector);

  std::string name() const override;
  std::string GetParameterString() const override;
  bool Valid() const override;

 private:
  const std::string block_device_;
  const uint64_t physical_sector_;
};

// A slice of a block device behind dm-crypt. `key` is the key in hexadecimal digits; the target
// wipes its own copy.
class SENTROVA_API DmTargetCrypt final : public DmTarget {
 public:
  DmTargetCrypt(uint64_t start, uint64_t length, std::string cipher, std::string key,
                uint64_t iv_sector_offset, std::string block_device, uint64_t block_device_sector);
  ~DmTargetCrypt() override;

  // Has the data encrypted in units of this many bytes, numbered in such units, instead of 512. The
  // device's size must be a multiple of it.
  void SetSectorSize(uint32_t sector_size_bytes) { sector_size_bytes_ = sector_size_bytes; }

  // Lets discards through to the device.
  void AllowDiscards() { allow_discards_ = true; }

  std::string name() const override;
  std::string GetParameterString() const override;
  bool Valid() const override;

 private:
  std::string option_string() const;

  const std::string cipher_;
  std::string key_;
  const uint64_t iv_sector_offset_;
  const std::string block_device_;
  const uint64_t block_device_sector_;
  uint32_t sector_size_bytes_ = 0;
  bool allow_discards_ = false;
};

}  // namespace android::dm
