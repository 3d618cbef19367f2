#include <fcntl.h>
#include <fs_mgr_dm_linear.h>
#include <gtest/gtest.h>
#include <libdm/dm.h>
#include <unistd.h>

#include <cerrno>

#include "tests/support/loop_device.h"

namespace {

using android::dm::DeviceMapper;
using android::dm::DmDeviceState;
using android::fs_mgr::CreateLogicalPartition;
using android::fs_mgr::CreateLogicalPartitionParams;
using android::fs_mgr::DestroyLogicalPartition;
using sentrova::testing::LoopDevice;
using sentrova::testing::read_device;
using sentrova::testing::run_program;
using sentrova::testing::write_device;

constexpr char kName[] = "logical_test_a";
constexpr int64_t kSuperBytes = 4 << 20;
constexpr int64_t kSliceOffset = 1 << 20;
constexpr int64_t kSliceBytes = 1 << 20;

class LogicalPartitions : public testing::Test {
 protected:
  ~LogicalPartitions() override { DestroyLogicalPartition(kName); }

  int make_super(const std::string& slice) {
    return run_program({"/system/bin/make_super", super_.path(), slice, "logical_test_b=1M"});
  }

  int error_of(const CreateLogicalPartitionParams& params) {
    return CreateLogicalPartition(params, &path_) ? 0 : errno;
  }

  const LoopDevice super_{kSuperBytes};
  CreateLogicalPartitionParams params_ = {super_.path(), 0, kName, true,
                                          std::chrono::milliseconds(1000)};
  std::string path_;
};

TEST_F(LogicalPartitions, IsTheSliceThatWasFilledAndGoesWhenDestroyed) {
  const TemporaryFile contents;
  ASSERT_TRUE(android::base::WriteStringToFile("from the file", contents.path));
  EXPECT_EQ(make_super(std::string(kName) + "=3M"), 1) << "no room for both";
  EXPECT_EQ(error_of(params_), EINVAL) << "there is no table yet";
  ASSERT_EQ(make_super(std::string(kName) + "=1M:" + contents.path), 0);
  ASSERT_EQ(error_of(params_), 0);
  EXPECT_EQ(read_device(path_, 0, 13), "from the file");
  ASSERT_TRUE(write_device(path_, kSliceBytes - 4, "last"));
  EXPECT_EQ(read_device(super_.path(), kSliceOffset + kSliceBytes - 4, 4), "last");
  EXPECT_FALSE(write_device(path_, kSliceBytes, "beyond"));

  EXPECT_EQ(error_of(params_), EBUSY) << "it is mapped";
  {
    const android::base::unique_fd holder(open(path_.c_str(), O_RDONLY | O_CLOEXEC));
    EXPECT_FALSE(DestroyLogicalPartition(kName));
    EXPECT_EQ(errno, EBUSY);
  }
  EXPECT_TRUE(DestroyLogicalPartition(kName));
  EXPECT_EQ(DeviceMapper::Instance().GetState(kName), DmDeviceState::INVALID);
  EXPECT_TRUE(DestroyLogicalPartition(kName)) << "it is not mapped";

  params_.force_writable = false;
  params_.metadata_slot = 1;
  ASSERT_EQ(error_of(params_), 0);
  EXPECT_FALSE(write_device(path_, 0, "read-only"));
}

}  // namespace
