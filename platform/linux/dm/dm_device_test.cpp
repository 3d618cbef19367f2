#include <fcntl.h>
#include <gtest/gtest.h>
#include <libdm/dm.h>
#include <stdlib.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <fstream>

#include "tests/support/loop_device.h"

namespace {

using android::dm::DeviceMapper;
using android::dm::DmDeviceState;
using android::dm::DmTable;
using android::dm::DmTargetCrypt;
using android::dm::DmTargetLinear;
using sentrova::testing::LoopDevice;
using sentrova::testing::read_device;
using sentrova::testing::run_program;
using sentrova::testing::write_device;
using std::chrono::seconds;

constexpr char kName[] = "dm_test";
constexpr char kCipher[] = "aes-xts-plain64";
constexpr int64_t kSectorBytes = 512;
constexpr uint64_t kSectors = 2048;

class DeviceMapperTest : public testing::Test {
 protected:
  DeviceMapperTest() { setenv("DM_DISABLE_UDEV", "1", 1); }
  ~DeviceMapperTest() override { mapper_.DeleteDeviceIfExists(kName); }

  bool create_linear(uint64_t length, uint64_t physical_sector, bool read_only = false) {
    DmTable table;
    table.set_readonly(read_only);
    table.Emplace<DmTargetLinear>(0U, length, loop_.path(), physical_sector);
    return mapper_.CreateDevice(kName, table, &path_, seconds(5));
  }

  bool create_crypt(const std::string& key) {
    auto target = std::make_unique<DmTargetCrypt>(0U, kSectors, kCipher, key, 0U, loop_.path(), 0U);
    target->SetSectorSize(4096);
    DmTable table;
    table.AddTarget(std::move(target));
    return mapper_.CreateDevice(kName, table, &path_, seconds(5));
  }

  const LoopDevice loop_{kSectors * kSectorBytes};
  DeviceMapper& mapper_ = DeviceMapper::Instance();
  std::string path_;
};

TEST_F(DeviceMapperTest, ADeviceIsMadeFoundSuspendedAndRemoved) {
  EXPECT_EQ(mapper_.GetState(kName), DmDeviceState::INVALID);
  path_ = "as it was";
  EXPECT_FALSE(mapper_.GetDmDevicePathByName(kName, &path_));
  EXPECT_EQ(errno, ENXIO);
  EXPECT_EQ(path_, "as it was");

  ASSERT_TRUE(create_linear(kSectors - 8, 8)) << strerror(errno);
  EXPECT_EQ(path_.rfind("/dev/block/dm-", 0), 0U) << path_;
  std::string found;
  EXPECT_TRUE(mapper_.GetDmDevicePathByName(kName, &found));
  EXPECT_EQ(found, path_);
  EXPECT_EQ(mapper_.GetState(kName), DmDeviceState::ACTIVE);
  ASSERT_TRUE(write_device(path_, 0, std::string(4096, 'x')));
  EXPECT_EQ(read_device(loop_.path(), 8 * kSectorBytes, 4096), std::string(4096, 'x'));
  EXPECT_EQ(read_device(loop_.path(), 0, 4096), std::string(4096, '\0'));

  ASSERT_EQ(run_program({"/system/bin/dmsetup", "suspend", kName}), 0);
  EXPECT_EQ(mapper_.GetState(kName), DmDeviceState::SUSPENDED);
  ASSERT_EQ(run_program({"/system/bin/dmsetup", "resume", kName}), 0);
  EXPECT_EQ(mapper_.GetState(kName), DmDeviceState::ACTIVE);

  EXPECT_TRUE(mapper_.DeleteDevice(kName));
  EXPECT_EQ(mapper_.GetState(kName), DmDeviceState::INVALID);
  EXPECT_NE(access(path_.c_str(), F_OK), 0);
  ASSERT_TRUE(create_linear(kSectors, 0, true));
  EXPECT_FALSE(write_device(path_, 0, "read-only"));
}

TEST_F(DeviceMapperTest, WhatTheKernelRefusesLeavesItsReasonAndNothingElse) {
  EXPECT_FALSE(create_linear(kSectors + 1, 0)) << "past the end of the device";
  EXPECT_EQ(errno, EINVAL);
  EXPECT_FALSE(create_crypt("0123")) << "no length for this cipher";
  EXPECT_EQ(errno, EINVAL);
  EXPECT_EQ(mapper_.GetState(kName), DmDeviceState::INVALID);

  ASSERT_TRUE(create_linear(kSectors, 0));
  EXPECT_FALSE(create_linear(8, 0)) << "the name is taken";
  EXPECT_EQ(errno, EBUSY);
  {
    const android::base::unique_fd holder(open(path_.c_str(), O_RDONLY | O_CLOEXEC));
    EXPECT_FALSE(mapper_.DeleteDeviceIfExists(kName));
    EXPECT_EQ(errno, EBUSY);
    EXPECT_EQ(mapper_.GetState(kName), DmDeviceState::ACTIVE);
  }
  EXPECT_TRUE(mapper_.DeleteDeviceIfExists(kName));
  EXPECT_TRUE(mapper_.DeleteDeviceIfExists(kName)) << "there is none";
  EXPECT_FALSE(mapper_.DeleteDevice(kName));
  EXPECT_EQ(errno, ENXIO);
}

// Whether `text`, whose bytes are given as their complements, stands in this process's heap.
bool is_in_heap(const std::string& complements) {
  const auto is_complement = [](char a, char b) { return a == static_cast<char>(~b); };
  std::ifstream maps("/proc/self/maps");
  for (std::string line; std::getline(maps, line);) {
    uintptr_t start = 0;
    uintptr_t end = 0;
    if (line.find("[heap]") != line.npos && sscanf(line.c_str(), "%lx-%lx", &start, &end) == 2) {
      const char* const last = reinterpret_cast<const char*>(end);
      return std::search(reinterpret_cast<const char*>(start), last, complements.begin(),
                         complements.end(), is_complement) != last;
    }
  }
  return false;
}

TEST_F(DeviceMapperTest, NoKeyIsLeftInMemory) {
  std::string key(128, '\0');
  std::string complements;
  for (char& digit : key) {
    digit = "0123456789abcdef"[arc4random_uniform(16)];
    complements += static_cast<char>(~digit);
  }
  complements = complements.substr(40, 32);
  ASSERT_TRUE(is_in_heap(complements)) << "the search finds what is there";
  ASSERT_TRUE(create_crypt(key));
  explicit_bzero(key.data(), key.size());
  EXPECT_FALSE(is_in_heap(complements));
}

}  // namespace
