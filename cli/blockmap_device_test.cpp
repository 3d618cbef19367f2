#include <android-base/file.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <linux/fs.h>
#include <sys/ioctl.h>
#include <sys/mount.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <string>

#include "cli/file_blocks.h"
#include "otautil/sysutil.h"
#include "tests/support/loop_device.h"
#include "tests/support/private_mounts.h"

namespace {

using android::base::unique_fd;
using android::base::WriteStringToFile;
using sentrova::testing::run_program;

constexpr size_t kBlock = 4096;
constexpr size_t kRanges = 1000;
constexpr int kDirect = O_WRONLY | O_CREAT | O_DIRECT | O_CLOEXEC;

// Bytes that differ from block to block.
std::string block_content(size_t index) {
  std::string content(kBlock, static_cast<char>(index * 7));
  memcpy(content.data(), &index, sizeof(index));
  return content;
}

// A volume that takes a direct write of a block where it comes, mounted.
class MappedVolume : public ::testing::Test {
 protected:
  void SetUp() override {
    SKIP_WITHOUT_PRIVATE_ROOT();
    ASSERT_EQ(run_program({"/system/bin/make_f2fs", "-q", "-f", loop_.path()}), 0);
    ASSERT_EQ(mount(loop_.path().c_str(), folder_.path, "f2fs", MS_NOATIME, ""), 0);
  }
  void TearDown() override { umount2(folder_.path, MNT_DETACH); }

  std::string at(const char* name) const { return std::string(folder_.path) + "/" + name; }

  // Writes two files block by block in turns, so that their blocks are allocated in turns too. The
  // last block of the first is one byte short.
  void write_in_turns(const char* first, const char* second) const {
    const unique_fd files[] = {unique_fd(open(at(first).c_str(), kDirect, 0600)),
                               unique_fd(open(at(second).c_str(), kDirect, 0600))};
    alignas(kBlock) char buffer[kBlock];
    for (size_t i = 0; i < kRanges; ++i) {
      memcpy(buffer, block_content(i).data(), kBlock);
      for (const unique_fd& file : files) {
        ASSERT_EQ(pwrite64(file.get(), buffer, kBlock, static_cast<off64_t>(i * kBlock)),
                  static_cast<ssize_t>(kBlock));
      }
    }
    ASSERT_EQ(ftruncate64(files[0].get(), static_cast<off64_t>(kRanges * kBlock - 1)), 0);
  }

  const sentrova::testing::LoopDevice loop_{160 << 20};
  const TemporaryDir folder_;
};

TEST_F(MappedVolume, HasNoMapOfWhatWasNeverWritten) {
  ASSERT_TRUE(WriteStringToFile(std::string(kBlock, 'x'), at("prepared")));
  const unique_fd prepared(open(at("prepared").c_str(), O_WRONLY | O_CLOEXEC));
  ASSERT_EQ(fallocate64(prepared.get(), 0, kBlock, kBlock), 0);
  const sentrova::FileBlocks blocks = sentrova::find_file_blocks(at("prepared"));
  EXPECT_EQ(blocks.error, at("prepared") +
                              " cannot be mapped: its data from byte 4096 on was "
                              "allocated but never written");
  EXPECT_FALSE(blocks.map);
}

TEST_F(MappedVolume, GivesAScatteredFileByteForByte) {
  ASSERT_NO_FATAL_FAILURE(write_in_turns("scattered", "other"));
  const sentrova::FileBlocks blocks = sentrova::find_file_blocks(at("scattered"));
  ASSERT_EQ(blocks.error, "");
  EXPECT_EQ(blocks.map.device_path, "/dev/block" + loop_.path().substr(strlen("/dev")));
  EXPECT_GT(blocks.map.block_ranges.size(), kRanges * 9 / 10);
  const unique_fd device(open(loop_.path().c_str(), O_RDONLY | O_CLOEXEC));
  ASSERT_EQ(ioctl(device.get(), BLKFLSBUF), 0);  // drops what the kernel has kept of it
  const TemporaryFile map_file;
  ASSERT_TRUE(WriteStringToFile(sentrova::block_map_text(blocks.map), map_file.path));
  MemMapping mapping;
  ASSERT_TRUE(mapping.MapFile(std::string("@") + map_file.path));
  ASSERT_EQ(mapping.length, kRanges * kBlock - 1);
  for (size_t i = 0; i < kRanges; ++i) {
    const size_t size = std::min(kBlock, mapping.length - i * kBlock);
    ASSERT_EQ(memcmp(mapping.addr + i * kBlock, block_content(i).data(), size), 0) << i;
  }
}

}  // namespace
