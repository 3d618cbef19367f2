#include <errno.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <unistd.h>

#include <limits>

#include "tests/support/captured_stdout.h"
#include "tests/support/loop_device.h"
#include "tests/support/private_mounts.h"
#include "tests/support/signals.h"
#include "toolkit/scratch_test.h"
#include "toolkit/zuno_func.h"

namespace fs = std::filesystem;

using android::base::unique_fd;
using sentrova::testing::CapturedStdout;
using testing::ElementsAre;

namespace {

constexpr off_t kMiB = 1 << 20;
constexpr int kLargest = std::numeric_limits<int>::max();

class ZunoFuncFile : public sentrova::toolkit::ScratchTest {
 protected:
  // A file that begins with `head` and is `size` bytes long, a hole for the rest, before `tail`.
  std::string make_holed_file(const std::string& name, const std::string& head, off_t size,
                              const std::string& tail = "") const {
    make_file(name, head);
    EXPECT_EQ(truncate(path(name).c_str(), size), 0);
    EXPECT_EQ(ZunoFunc::append_to_file(path(name), tail), 0);
    return path(name);
  }
};

TEST_F(ZunoFuncFile, CopiesContentsOfAnyKindWithAMode) {
  SKIP_WITHOUT_PRIVATE_ROOT();
  std::string bytes(300'000, '\0');
  for (size_t i = 0; i < bytes.size(); ++i) {
    bytes[i] = static_cast<char>(i * 31 / 7);
  }
  const std::string plain = make_file("plain", bytes);
  const std::string holed[] = {make_holed_file("all", "", 8 * kMiB),
                               make_holed_file("end", "head", 8 * kMiB),
                               make_holed_file("start", "", 8 * kMiB, "tail"),
                               make_holed_file("middle", "head", 8 * kMiB, "tail")};
  const sentrova::testing::ScopedTmpfs other("/other");
  CapturedStdout output;
  for (const std::string& copy : {make_file("copy", bytes + "longer"), std::string("/other/f")}) {
    // Files of the kernel's read as longer or shorter than their size.
    for (const std::string& source : {plain, std::string("/proc/filesystems"),
                                      std::string("/sys/kernel/fscaps"), copy + "no", path("")}) {
      EXPECT_EQ(ZunoFunc::copy_file(source, copy, 04711), 0);
      const bool is_file = fs::is_regular_file(source);  // all else is as empty
      EXPECT_EQ(content_of(copy), is_file ? content_of(source) : "") << source;
      EXPECT_EQ(mode_of(copy), 04711U);
    }
    for (const std::string& source : holed) {
      EXPECT_EQ(ZunoFunc::copy_file(source, copy, 0600), 0);
      EXPECT_TRUE(content_of(copy) == content_of(source)) << source;
      EXPECT_LT(status_of(copy).st_blocks * 512, kMiB) << source;
    }
  }
  output.take();
  CapturedStdout failure;
  EXPECT_EQ(ZunoFunc::copy_file(plain, path("no/place"), 0600), -1);
  EXPECT_EQ(failure.take(),
            "[ZunoFunc]I: Copying file '" + plain + "' to '" + path("no/place") + "'\n");
}

TEST_F(ZunoFuncFile, CopiesTailsAndShortens) {
  const std::string ten = "0123456789";
  struct Row {
    int bytes, copied;
    std::string tail;
    int shortened;
    std::string head, rest;
  };
  for (const Row& row : {Row{4, 0, "6789", 0, "0123", "6789"}, Row{0, -1, "old", 0, "", ""},
                         Row{10, 0, ten, -1, ten, ten}, Row{11, 0, ten, -1, ten, ten},
                         Row{-1, -1, "old", -1, ten, ten}, Row{kLargest, 0, ten, -1, ten, ten}}) {
    SCOPED_TRACE(row.bytes);
    fs::remove(path("tail"));
    const std::string file = make_file("f", ten);
    const std::string tail = make_file("tail", "old");
    EXPECT_EQ(ZunoFunc::copy_file_tail(file, tail, row.bytes, 0640), row.copied);
    EXPECT_EQ(content_of(tail), row.tail);
    EXPECT_EQ(mode_of(tail) == 0640, row.copied == 0);
    EXPECT_EQ(ZunoFunc::resize_file(file, row.bytes, true), row.shortened);
    EXPECT_EQ(content_of(file), row.head);
    EXPECT_EQ(ZunoFunc::resize_file(make_file("f", ten), row.bytes, false), row.shortened);
    EXPECT_EQ(content_of(file), row.rest);
  }
  for (const std::string& source : {make_file("empty"), path("missing"), std::string()}) {
    EXPECT_EQ(ZunoFunc::copy_file_tail(source, path("new"), 4, 0640), -1);
    EXPECT_EQ(ZunoFunc::resize_file(source, 0, true), -1);
  }
  CapturedStdout output;
  EXPECT_EQ(ZunoFunc::copy_file_tail(make_file("f", ten), path("no/such"), 4, 0640), 0);
  EXPECT_EQ(output.take(), "fail to chmod " + path("no/such") + " permission\n");
  EXPECT_EQ(ZunoFunc::copy_file_tail(path("f"), path("f"), 3, 0640), 0);
  EXPECT_EQ(content_of(path("f")), "789");
}

TEST_F(ZunoFuncFile, TakesSizesModuloTwoToThe32) {
  const std::string two = make_holed_file("two", "abcdefghijkl", 2048 * kMiB);
  EXPECT_EQ(ZunoFunc::copy_file_tail(two, path("tail"), 4, 0600), -1);
  EXPECT_EQ(ZunoFunc::resize_file(two, 4, false), -1);
  EXPECT_EQ(status_of(two).st_size, 2048 * kMiB);
  const std::string four = make_holed_file("four", "abcdefghijkl", 4096 * kMiB + 10);
  EXPECT_EQ(ZunoFunc::copy_file_tail(four, path("tail"), 4, 0600), 0);
  EXPECT_EQ(ZunoFunc::resize_file(four, 10, true), -1);
  EXPECT_EQ(ZunoFunc::resize_file(four, 4, false), 0);
  EXPECT_EQ(content_of(path("tail")) + content_of(four), "ghijghij");
}

TEST_F(ZunoFuncFile, CutsGrowsAndEmptiesWhatExists) {
  const std::string file = make_file("f", "0123");
  EXPECT_TRUE(ZunoFunc::resize_file(file, 2UL));
  EXPECT_TRUE(ZunoFunc::resize_file(file, 4UL));
  EXPECT_EQ(content_of(file), std::string("01\0\0", 4));
  EXPECT_FALSE(ZunoFunc::resize_file("", 4UL));
  CapturedStdout output;
  EXPECT_FALSE(ZunoFunc::resize_file(path("missing"), 4UL));
  EXPECT_EQ(errno, ENOENT);
  EXPECT_EQ(output.take(),
            "[ZunoFunc]E: Fail to resize file " + path("missing") + ":No such file or directory\n");
  chmod(file.c_str(), 0600);
  EXPECT_TRUE(ZunoFunc::empty_file(file));
  EXPECT_FALSE(ZunoFunc::empty_file(""));
  EXPECT_FALSE(ZunoFunc::empty_file(path("missing")));
  EXPECT_FALSE(ZunoFunc::empty_file(root()));
  EXPECT_EQ(errno, EISDIR);
  EXPECT_THAT(tree_of(root()), ElementsAre("f="));
  EXPECT_EQ(mode_of(file), 0600U);
}

TEST_F(ZunoFuncFile, CopiesTreesButForHiddenDirectoriesForTheSystemUser) {
  make_file("from/f", "f");
  make_file("from/bad", "b");
  make_file("from/sub/.hidden", "h");
  make_file("from/.cache/f", "f");
  fs::create_symlink("nowhere", path("from/dangling"));
  fs::create_directory_symlink("sub", path("from/linked"));
  make_directory("new/to");
  fs::create_symlink("no/such/place", path("new/to/bad"));
  CapturedStdout output;
  EXPECT_EQ(ZunoFunc::copy_dir(path("from/"), path("new/to/")), 0);
  EXPECT_THAT(output.take(), testing::HasSubstr("Copy From " + path("from/bad") + " To " +
                                                path("new/to/bad") + " FAILED\n"));
  EXPECT_THAT(tree_of(path("new/to")), ElementsAre("bad", "dangling=", "f=f", "linked/",
                                                   "linked/.hidden=h", "sub/", "sub/.hidden=h"));
  const bool may_change_owners = chown(make_file("probe").c_str(), 1000, 1000) == 0;
  for (const std::string made : {"new/to/sub", "new/to/f"}) {
    const struct stat info = status_of(path(made));
    EXPECT_EQ(info.st_mode & 07777, 0755U) << made;
    EXPECT_EQ(info.st_uid, may_change_owners ? 1000U : geteuid()) << made;
    EXPECT_EQ(info.st_gid, may_change_owners ? 1000U : getegid()) << made;
  }
}

TEST_F(ZunoFuncFile, SaysWhyATreeIsNotCopied) {
  const std::string file = make_file("f");
  CapturedStdout output;
  EXPECT_EQ(ZunoFunc::copy_dir(path("missing"), path("to")), 0);
  EXPECT_EQ(ZunoFunc::copy_dir(file, path("to")), -1);
  EXPECT_EQ(ZunoFunc::copy_dir(root(), file), -1);
  EXPECT_EQ(output.take(), "[ZunoFunc]E: Failed to opendir:" + path("missing") +
                               " (No such file or directory)\n" + "Create Dir " + file +
                               " Failed...\n");
  EXPECT_THAT(tree_of(root()), ElementsAre("f="));
}

TEST_F(ZunoFuncFile, ReadsAWordANumberAndLines) {
  using Lines = std::vector<std::string>;
  constexpr unsigned long kLargestNumber = std::numeric_limits<unsigned long>::max();
  struct Row {
    std::string content, word;
    unsigned long number;
    Lines lines;
  };
  const std::string long_word(20'000, 'w');
  const std::string too_large = "99999999999999999999";
  for (const Row& row : {Row{" 42 x\n", "42", 42, {"before", " 42 x"}},
                         Row{too_large, too_large, kLargestNumber, {"before", too_large}},
                         Row{"", "old", 5, {"before"}}, Row{"\n\n", "old", 5, {"before", "", ""}},
                         Row{std::string("a \0b\r\nc", 7), "a", 0, {"before", {"a \0b\r", 5}, "c"}},
                         Row{long_word + " x", long_word, 0, {"before", long_word + " x"}}}) {
    const std::string file = make_file("f", row.content);
    std::string word = "old";
    unsigned long number = 5;
    Lines lines = {"before"};
    EXPECT_EQ(ZunoFunc::read_file(file, word), 0);
    EXPECT_EQ(ZunoFunc::read_file(file, number), 0);
    EXPECT_EQ(ZunoFunc::read_file(file, lines), 0);
    EXPECT_EQ(std::tie(word, number, lines), std::tie(row.word, row.number, row.lines));
  }
}

TEST_F(ZunoFuncFile, WritesAndAppendsAndSaysWhichFileItCannotFind) {
  const std::string content("one\0two", 7);
  EXPECT_EQ(ZunoFunc::write_to_file(path("f"), content + content), 0);
  EXPECT_EQ(ZunoFunc::write_to_file(path("f"), content), 0);
  EXPECT_EQ(ZunoFunc::append_to_file(path("f"), "!"), 0);
  EXPECT_EQ(ZunoFunc::write_to_file(path("f"), ""), 0);
  EXPECT_EQ(ZunoFunc::append_to_file(path("none"), ""), 0);
  EXPECT_EQ(ZunoFunc::append_to_file(path("new"), "x"), 0);
  EXPECT_THAT(tree_of(root()), ElementsAre("f=" + content + "!", "new=x"));
  const std::string absent = path("no/f");
  std::string word;
  std::vector<std::string> lines;
  unsigned long number = 0;
  CapturedStdout output;
  EXPECT_EQ(ZunoFunc::read_file(absent, word), -1);
  EXPECT_EQ(ZunoFunc::read_file(absent, lines), -1);
  EXPECT_EQ(ZunoFunc::read_file(absent, number), -1);
  EXPECT_EQ(ZunoFunc::write_to_file(absent, "x"), -1);
  EXPECT_EQ(ZunoFunc::append_to_file(absent, "x"), -1);
  const std::string line = "[ZunoFunc]I: Cannot find file " + absent + "\n";
  EXPECT_EQ(output.take(), line + line + line + line + line);
}

TEST_F(ZunoFuncFile, ZeroesExactlyTheStretchUpToTheFirstFailure) {
  const unique_fd file(open(make_file("f", std::string(3000, 'x')).c_str(), O_RDWR | O_CLOEXEC));
  const unique_fd full(open("/dev/full", O_WRONLY | O_CLOEXEC));
  EXPECT_TRUE(ZunoFunc::overwrite_with_zeros(file.get(), 100, 2500));
  EXPECT_TRUE(ZunoFunc::overwrite_with_zeros(file.get(), 0, 0));
  EXPECT_TRUE(ZunoFunc::overwrite_with_zeros(file.get(), 0, -5));
  EXPECT_EQ(content_of(path("f")),
            std::string(100, 'x') + std::string(2500, '\0') + std::string(400, 'x'));
  CapturedStdout output;
  EXPECT_FALSE(ZunoFunc::overwrite_with_zeros(full.get(), 0, 1));
  EXPECT_EQ(errno, ENOSPC);
  EXPECT_FALSE(ZunoFunc::overwrite_with_zeros(file.get(), -1, 1));
  EXPECT_EQ(errno, EINVAL);
  EXPECT_FALSE(ZunoFunc::overwrite_with_zeros(-1, 0, 1));
  EXPECT_EQ(output.take(),
            "[ZunoFunc]E: Write of zeroes failed: (No space left on device)\n"
            "[ZunoFunc]E: Seek failed for zero overwrite: (Invalid argument)\n"
            "[ZunoFunc]E: Seek failed for zero overwrite: (Bad file descriptor)\n");

  // The file may end 500 bytes after its 3000: the last write is short, and then none succeeds.
  const sentrova::testing::ScopedSignalAction no_signal(SIGXFSZ, SIG_IGN);
  rlimit before, lowered = {3500, RLIM_INFINITY};
  getrlimit(RLIMIT_FSIZE, &before);
  lowered.rlim_max = before.rlim_max;
  setrlimit(RLIMIT_FSIZE, &lowered);
  CapturedStdout short_output;
  EXPECT_FALSE(ZunoFunc::overwrite_with_zeros(file.get(), 3000, 1000));
  EXPECT_EQ(errno, EFBIG);
  setrlimit(RLIMIT_FSIZE, &before);
  EXPECT_EQ(status_of(path("f")).st_size, 3500);
}

TEST_F(ZunoFuncFile, AsksTheDeviceBelowDevBlockInAnyCaseForItsSize) {
  SKIP_WITHOUT_PRIVATE_ROOT();
  EXPECT_EQ(ZunoFunc::file_size(make_file("f", "12345")), 5U);
  EXPECT_EQ(ZunoFunc::file_size(path("missing")), 0U);
  fs::create_directories("/DEV/Block");
  fs::create_symlink(path("f"), "/DEV/Block/plain");
  EXPECT_EQ(ZunoFunc::file_size("/DEV/Block/plain"), 0U);
  CapturedStdout output;
  EXPECT_EQ(ZunoFunc::IOCTL_Get_Block_Size("/absent"), 0U);
  EXPECT_EQ(ZunoFunc::IOCTL_Get_Block_Size("/dev/null"), 0U);
  EXPECT_EQ(output.take(),
            "[ZunoFunc]I: Find_Partition_Size: Failed to open '/absent', (No such file or "
            "directory)\n"
            "[ZunoFunc]I: Find_Partition_Size: ioctl error: (Inappropriate ioctl for device)\n");
  constexpr int64_t kThreeSectors = 3 * 512;
  const sentrova::testing::LoopDevice loop(kThreeSectors);
  if (loop.path().empty()) {
    GTEST_SKIP() << "this process may not attach loop devices";
  }
  fs::create_symlink(loop.path(), "/DEV/Block/disk");
  EXPECT_EQ(ZunoFunc::file_size("/DEV/Block/disk"), uint64_t{kThreeSectors});
  EXPECT_EQ(ZunoFunc::IOCTL_Get_Block_Size(loop.path().c_str()), uint64_t{kThreeSectors});
}

}  // namespace
