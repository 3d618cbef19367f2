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
constexpr off64_t kVolumeBytes = 160 << 20;

// Bytes that differ from block to block.
std::string block_content(size_t index) {
  std::string content(kBlock, static_cast<char>(index * 7));
  memcpy(content.data(), &index, sizeof(index));
  return content;
}

struct Volume {
  const char* type;
  size_t ranges;  // of a scattered file; f2fs takes a direct write for each
};

// A volume of 4096-byte blocks, mounted.
class MappedVolume : public ::testing::TestWithParam<Volume> {
 protected:
  void SetUp() override {
    SKIP_WITHOUT_PRIVATE_ROOT();
    ASSERT_EQ(is_ext4_ ? run_program({"/system/bin/mke2fs", "-q", "-F", "-t", "ext4", "-b", "4096",
                                      "-O", "^has_journal", loop_.path()})
                       : run_program({"/system/bin/make_f2fs", "-q", "-f", loop_.path()}),
              0);
    ASSERT_EQ(mount(loop_.path().c_str(), folder_.path, GetParam().type, MS_NOATIME, ""), 0);
  }
  void TearDown() override { umount2(folder_.path, MNT_DETACH); }

  std::string at(const char* name) const { return std::string(folder_.path) + "/" + name; }

  // Writes two files block by block in turns, past the page cache, so that their blocks are
  // allocated in turns too. The last block of the first is one byte short.
  void write_in_turns(const char* first, const char* second) const {
    const unique_fd files[] = {unique_fd(open(at(first).c_str(), kDirect, 0600)),
                               unique_fd(open(at(second).c_str(), kDirect, 0600))};
    alignas(kBlock) char buffer[kBlock];
    for (size_t i = 0; i < ranges_; ++i) {
      memcpy(buffer, block_content(i).data(), kBlock);
      for (const unique_fd& file : files) {
        ASSERT_EQ(pwrite64(file.get(), buffer, kBlock, static_cast<off64_t>(i * kBlock)),
                  static_cast<ssize_t>(kBlock));
      }
    }
    ASSERT_EQ(ftruncate64(files[0].get(), static_cast<off64_t>(ranges_ * kBlock - 1)), 0);
  }

  // Leaves free blocks only, but for a few, where each has used ones on both sides.
  void break_up_free_space() const {
    const unique_fd filler(open(at("filler").c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
    off64_t size = 0;
    for (off64_t step = 1 << 24; step >= static_cast<off64_t>(kBlock);) {
      if (fallocate64(filler.get(), 0, size, step) == 0) {
        size += step;
      } else {
        step /= 2;
      }
    }
    for (off64_t hole = 0; hole < static_cast<off64_t>(2 * (ranges_ + 100) * kBlock);
         hole += static_cast<off64_t>(2 * kBlock)) {
      ASSERT_EQ(fallocate64(filler.get(), FALLOC_FL_PUNCH_HOLE | FALLOC_FL_KEEP_SIZE, hole, kBlock),
                0);
    }
  }

  void write_scattered_file() const {
    if (!is_ext4_) {
      write_in_turns("scattered", "other");
      return;
    }
    break_up_free_space();
    std::string content;
    for (size_t i = 0; i < ranges_; ++i) {
      content += block_content(i);
    }
    content.pop_back();
    ASSERT_TRUE(WriteStringToFile(content, at("scattered")));
  }

  // Maps a file by its blocks and drops what the kernel has kept of the device.
  bool map(const sentrova::FileBlocks& blocks) {
    const unique_fd device(open(loop_.path().c_str(), O_RDONLY | O_CLOEXEC));
    return ioctl(device.get(), BLKFLSBUF) == 0 &&
           WriteStringToFile(sentrova::block_map_text(blocks.map), map_file_.path) &&
           mapping_.MapFile(std::string("@") + map_file_.path);
  }

  static constexpr int kDirect = O_WRONLY | O_CREAT | O_DIRECT | O_CLOEXEC;
  const bool is_ext4_ = std::string(GetParam().type) == "ext4";
  const size_t ranges_ = GetParam().ranges;
  const sentrova::testing::LoopDevice loop_{kVolumeBytes};
  const TemporaryDir folder_;
  const TemporaryFile map_file_;
  MemMapping mapping_;
};

TEST_P(MappedVolume, HasNoMapOfWhatWasNeverWritten) {
  ASSERT_TRUE(WriteStringToFile(std::string(kBlock, 'x'), at("prepared")));
  const unique_fd prepared(open(at("prepared").c_str(), O_WRONLY | O_CLOEXEC));
  ASSERT_EQ(fallocate64(prepared.get(), 0, kBlock, kBlock), 0);
  const sentrova::FileBlocks blocks = sentrova::find_file_blocks(at("prepared"));
  EXPECT_EQ(blocks.error, at("prepared") +
                              " cannot be mapped: its data from byte 4096 on was "
                              "allocated but never written");
  EXPECT_FALSE(blocks.map);
}

TEST_P(MappedVolume, GivesAScatteredFileByteForByte) {
  ASSERT_NO_FATAL_FAILURE(write_scattered_file());
  const sentrova::FileBlocks blocks = sentrova::find_file_blocks(at("scattered"));
  ASSERT_EQ(blocks.error, "");
  EXPECT_EQ(blocks.map.device_path, "/dev/block" + loop_.path().substr(strlen("/dev")));
  EXPECT_GT(blocks.map.block_ranges.size(), ranges_ * 9 / 10);
  ASSERT_TRUE(map(blocks));
  ASSERT_EQ(mapping_.length, ranges_ * kBlock - 1);
  for (size_t i = 0; i < ranges_; ++i) {
    const size_t size = std::min(kBlock, mapping_.length - i * kBlock);
    ASSERT_EQ(memcmp(mapping_.addr + i * kBlock, block_content(i).data(), size), 0) << i;
  }
}

INSTANTIATE_TEST_SUITE_P(FileSystems, MappedVolume,
                         ::testing::Values(Volume{"ext4", 10'000}, Volume{"f2fs", 1'000}));

}  // namespace
