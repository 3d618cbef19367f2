#include <errno.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <limits>

#include "tests/support/captured_stdout.h"
#include "tests/support/descriptor_limit.h"
#include "tests/support/loop_device.h"
#include "tests/support/private_mounts.h"
#include "toolkit/scratch_test.h"
#include "toolkit/zuno_func.h"

namespace fs = std::filesystem;

using android::base::unique_fd;
using sentrova::testing::CapturedStdout;
using sentrova::testing::DescriptorLimit;
using sentrova::testing::ScopedTmpfs;
using sentrova::toolkit::kAwkwardNames;
using testing::ElementsAre;

namespace {

// The writes to one descriptor: their sizes, and how many bytes each may write; -1 stands for an
// interruption. Once the script is used up, each writes all.
struct WriteScript {
  int fd = -1;
  std::vector<ssize_t> outcomes = {};
  std::vector<size_t> sizes = {};
};

WriteScript& write_script() {
  static WriteScript script;
  return script;
}

}  // namespace

ssize_t write(int fd, const void* bytes, size_t count) {
  WriteScript& script = write_script();
  if (fd == script.fd) {
    script.sizes.push_back(count);
    if (script.sizes.size() <= script.outcomes.size()) {
      const ssize_t outcome = script.outcomes[script.sizes.size() - 1];
      if (outcome < 0) {
        errno = EINTR;
        return -1;
      }
      count = static_cast<size_t>(outcome);
    }
  }
  return syscall(SYS_write, fd, bytes, count);
}

namespace {

constexpr off_t kTwoGiB = off_t{2} << 30;

class ZunoFuncFile : public sentrova::toolkit::ScratchTest {
 protected:
  // A file that begins with `head` and is `size` bytes long, a hole for the rest.
  std::string make_holed_file(const std::string& name, const std::string& head, off_t size) const {
    make_file(name, head);
    EXPECT_EQ(truncate(path(name).c_str(), size), 0);
    return path(name);
  }
  static off_t size_of(const std::string& file) {
    struct stat info = {};
    return stat(file.c_str(), &info) == 0 ? info.st_size : -1;
  }
  static off_t allocated_bytes(const std::string& file) {
    struct stat info = {};
    return stat(file.c_str(), &info) == 0 ? info.st_blocks * 512 : -1;
  }
};

TEST_F(ZunoFuncFile, CopiesContentsAndSetsTheMode) {
  std::string content(300'000, '\0');
  for (size_t i = 0; i < content.size(); ++i) {
    content[i] = static_cast<char>(i * 31 / 7);
  }
  const std::string source = make_file("source", content);
  const std::string destination = make_file("destination", content + "longer");
  CapturedStdout output;
  EXPECT_EQ(ZunoFunc::copy_file(source, destination, 04711), 0);
  EXPECT_EQ(output.take(), "[ZunoFunc]I: Copying file '" + source + "' to '" + destination + "'\n");
  EXPECT_EQ(content_of(destination), content);
  EXPECT_EQ(mode_of(destination), 04711U);
}

TEST_F(ZunoFuncFile, CopiesAMissingSourceAsAnEmptyFile) {
  const std::string destination = make_file("d", "old");
  CapturedStdout output;
  EXPECT_EQ(ZunoFunc::copy_file(path("missing"), destination, 0600), 0);
  EXPECT_EQ(ZunoFunc::copy_file(root(), path("new"), 0600), 0);
  EXPECT_EQ(ZunoFunc::copy_file(destination, path("no/such/place"), 0600), -1);
  EXPECT_EQ(size_of(destination), 0);
  EXPECT_EQ(size_of(path("new")), 0);
}

TEST_F(ZunoFuncFile, CopiesFilesWhoseSizeIsNotTheirLength) {
  CapturedStdout output;
  for (const std::string source :
       {"/proc/filesystems", "/sys/kernel/fscaps", "/proc/self/limits"}) {
    const std::string expected = content_of(source);
    ASSERT_NE(size_of(source), static_cast<off_t>(expected.size())) << source;
    EXPECT_EQ(ZunoFunc::copy_file(source, path("copy"), 0600), 0);
    EXPECT_EQ(content_of(path("copy")), expected) << source;
  }
}

TEST_F(ZunoFuncFile, CopiesBetweenFileSystems) {
  SKIP_WITHOUT_PRIVATE_ROOT();
  const ScopedTmpfs other("/other");
  CapturedStdout output;
  const std::string content(1'000'000, 'x');
  EXPECT_EQ(ZunoFunc::copy_file(make_file("source", content), "/other/copy", 0600), 0);
  EXPECT_EQ(content_of("/other/copy"), content);
  EXPECT_EQ(ZunoFunc::copy_file("/other/copy", path("back"), 0600), 0);
  EXPECT_EQ(content_of(path("back")), content);
}

TEST_F(ZunoFuncFile, KeepsHolesAndWhatLiesBetweenThem) {
  CapturedStdout output;
  struct Row {
    std::string name, head, tail;
  };
  for (const Row& row : {Row{"all", "", ""}, Row{"end", "head", ""}, Row{"start", "", "tail"},
                         Row{"middle", "head", "tail"}}) {
    constexpr off_t kMiB = 1 << 20;
    const std::string source = make_holed_file(row.name, row.head, 8 * kMiB);
    EXPECT_EQ(ZunoFunc::append_to_file(source, row.tail), 0);
    EXPECT_EQ(ZunoFunc::copy_file(source, path("copy"), 0600), 0);
    EXPECT_TRUE(content_of(path("copy")) == content_of(source)) << row.name;
    EXPECT_LT(allocated_bytes(path("copy")), kMiB) << row.name;
  }
}

TEST_F(ZunoFuncFile, CopiesTails) {
  struct Row {
    std::string source;
    int max_bytes, result;
    std::string copied;
  };
  const std::string ten = make_file("ten", "0123456789");
  const std::string empty = make_file("empty", "");
  const Row rows[] = {{ten, 4, 0, "6789"},
                      {ten, 10, 0, "0123456789"},
                      {ten, 100, 0, "0123456789"},
                      {ten, 0, -1, ""},
                      {ten, -3, -1, ""},
                      {empty, 4, -1, ""},
                      {"", 4, -1, ""},
                      {path("missing"), 4, -1, ""},
                      {ten, std::numeric_limits<int>::max(), 0, "0123456789"}};
  for (const Row& row : rows) {
    SCOPED_TRACE(row.source + " " + std::to_string(row.max_bytes));
    EXPECT_EQ(ZunoFunc::copy_file_tail(row.source, path("tail"), row.max_bytes, 0640), row.result);
    EXPECT_EQ(exists(path("tail")), row.result == 0);
    if (row.result == 0) {
      EXPECT_EQ(content_of(path("tail")), row.copied);
      EXPECT_EQ(mode_of(path("tail")), 0640U);
      fs::remove(path("tail"));
    }
  }
  CapturedStdout output;
  EXPECT_EQ(ZunoFunc::copy_file_tail(ten, path("no/such"), 4, 0640), 0);
  EXPECT_EQ(output.take(), "fail to chmod " + path("no/such") + " permission\n");
  EXPECT_EQ(ZunoFunc::copy_file_tail(ten, ten, 3, 0640), 0);
  EXPECT_EQ(content_of(ten), "789");
}

TEST_F(ZunoFuncFile, TakesSizesModuloTwoToThe32) {
  const std::string two = make_holed_file("two", "abcdefghijkl", kTwoGiB);
  EXPECT_EQ(ZunoFunc::copy_file_tail(two, path("tail"), 4, 0600), -1);
  EXPECT_EQ(ZunoFunc::resize_file(two, 4, false), -1);
  EXPECT_EQ(size_of(two), kTwoGiB);

  const std::string four = make_holed_file("four", "abcdefghijkl", 2 * kTwoGiB + 10);
  EXPECT_EQ(ZunoFunc::copy_file_tail(four, path("tail"), 4, 0600), 0);
  EXPECT_EQ(content_of(path("tail")), "ghij");
  EXPECT_EQ(ZunoFunc::resize_file(four, 10, true), -1);
  EXPECT_EQ(ZunoFunc::resize_file(four, 4, false), 0);
  EXPECT_EQ(content_of(four), "ghij");
}

TEST_F(ZunoFuncFile, ShortensByRewriting) {
  struct Row {
    int new_size;
    bool keep_head;
    int result;
    std::string left;
  };
  const std::string file = path("f");
  for (const Row& row : {Row{4, true, 0, "0123"}, Row{4, false, 0, "6789"}, Row{0, true, 0, ""},
                         Row{10, true, -1, "0123456789"}, Row{11, false, -1, "0123456789"},
                         Row{-1, true, -1, "0123456789"},
                         Row{std::numeric_limits<int>::max(), true, -1, "0123456789"}}) {
    make_file("f", "0123456789");
    EXPECT_EQ(ZunoFunc::resize_file(file, row.new_size, row.keep_head), row.result) << row.new_size;
    EXPECT_EQ(content_of(file), row.left);
  }
  EXPECT_EQ(ZunoFunc::resize_file(path("missing"), 0, true), -1);
  EXPECT_EQ(ZunoFunc::resize_file("", 0, true), -1);
}

TEST_F(ZunoFuncFile, CutsAndGrowsToALength) {
  const std::string file = make_file("f", "0123");
  EXPECT_TRUE(ZunoFunc::resize_file(file, 2UL));
  EXPECT_TRUE(ZunoFunc::resize_file(file, 4UL));
  EXPECT_EQ(content_of(file), std::string("01\0\0", 4));
  EXPECT_FALSE(ZunoFunc::resize_file("", 4UL));
  CapturedStdout output;
  EXPECT_FALSE(ZunoFunc::resize_file(path("missing"), 4UL));
  EXPECT_EQ(errno, ENOENT);
  EXPECT_FALSE(ZunoFunc::resize_file(file, std::numeric_limits<unsigned long>::max()));
  EXPECT_EQ(output.take(), "[ZunoFunc]E: Fail to resize file " + path("missing") +
                               ":No such file or directory\n" +
                               "[ZunoFunc]E: Fail to resize file " + file + ":Invalid argument\n");
}

TEST_F(ZunoFuncFile, CopiesTreesButForHiddenDirectoriesForTheSystemUser) {
  make_file("from/f", "f");
  make_file("from/sub/.hidden", "h");
  make_file("from/.cache/f", "f");
  fs::create_symlink("nowhere", path("from/dangling"));
  fs::create_directory_symlink("sub", path("from/linked"));
  for (const std::string& name : kAwkwardNames) {
    make_file("from/sub/" + name, name);
  }
  CapturedStdout output;
  EXPECT_EQ(ZunoFunc::copy_dir(path("from/"), path("new/to/")), 0);
  const std::string to = path("new/to");
  EXPECT_EQ(content_of(to + "/f"), "f");
  EXPECT_EQ(content_of(to + "/sub/.hidden"), "h");
  EXPECT_EQ(size_of(to + "/dangling"), 0);
  EXPECT_FALSE(exists(to + "/.cache"));
  for (const std::string& name : kAwkwardNames) {
    EXPECT_EQ(content_of(to + "/sub/" + name), name);
    EXPECT_EQ(content_of(to + "/linked/" + name), name);
  }

  const bool may_change_owners = chown(make_file("probe", "").c_str(), 1000, 1000) == 0;
  for (const std::string made : {"new", "new/to", "new/to/sub", "new/to/f"}) {
    struct stat info = {};
    ASSERT_EQ(stat(path(made).c_str(), &info), 0) << made;
    EXPECT_EQ(info.st_mode & 07777, 0755U) << made;
    EXPECT_EQ(info.st_uid, may_change_owners ? 1000U : geteuid()) << made;
    EXPECT_EQ(info.st_gid, may_change_owners ? 1000U : getegid()) << made;
  }
}

TEST_F(ZunoFuncFile, GoesOnAfterAnEntryThatCannotBeCopied) {
  for (const std::string name : {"a", "bad", "z"}) {
    make_file("from/" + name, name);
  }
  make_directory("to");
  fs::create_symlink("no/such/place", path("to/bad"));
  CapturedStdout output;
  EXPECT_EQ(ZunoFunc::copy_dir(path("from"), path("to")), 0);
  EXPECT_THAT(output.take(), testing::HasSubstr("Copy From " + path("from/bad") + " To " +
                                                path("to/bad") + " FAILED\n"));
  EXPECT_EQ(content_of(path("to/a")) + content_of(path("to/z")), "az");
}

TEST_F(ZunoFuncFile, SaysWhyATreeIsNotCopied) {
  const std::string file = make_file("f", "");
  const std::string from = make_directory("from");
  CapturedStdout output;
  EXPECT_EQ(ZunoFunc::copy_dir(path("missing"), path("to")), 0);
  EXPECT_EQ(ZunoFunc::copy_dir(file, path("to")), -1);
  EXPECT_EQ(ZunoFunc::copy_dir(from, file), -1);
  EXPECT_EQ(output.take(), "[ZunoFunc]E: Failed to opendir:" + path("missing") +
                               " (No such file or directory)\n" + "Create Dir " + file +
                               " Failed...\n");
  EXPECT_FALSE(exists(path("to")));
}

TEST_F(ZunoFuncFile, CopiesDeepTreesWithFewDescriptors) {
  make_file("from/" + deep_path(200) + "/f", "deep");
  CapturedStdout output;
  {
    const DescriptorLimit few(4);
    EXPECT_EQ(ZunoFunc::copy_dir(path("from"), path("to")), 0);
  }
  EXPECT_EQ(content_of(path("to/" + deep_path(200) + "/f")), "deep");
}

TEST_F(ZunoFuncFile, ReadsTheFirstWord) {
  const std::pair<std::string, std::string> rows[] = {
      {"  hello world\n", "hello"}, {"", "old"}, {" \n", "old"}};
  for (const auto& [content, expected] : rows) {
    std::string word = "old";
    EXPECT_EQ(ZunoFunc::read_file(make_file("f", content), word), 0);
    EXPECT_EQ(word, expected) << content;
  }
  std::string long_word;
  EXPECT_EQ(ZunoFunc::read_file(make_file("f", std::string(20'000, 'w') + " x"), long_word), 0);
  EXPECT_EQ(long_word, std::string(20'000, 'w'));
}

TEST_F(ZunoFuncFile, ReadsLines) {
  using Lines = std::vector<std::string>;
  const std::pair<std::string, Lines> rows[] = {{"a\nb", {"a", "b"}},
                                                {"a\n", {"a"}},
                                                {"", {}},
                                                {"\n\n", {"", ""}},
                                                {std::string("a\0b\r\n", 5), {{"a\0b\r", 4}}}};
  for (const auto& [content, expected] : rows) {
    Lines lines;
    EXPECT_EQ(ZunoFunc::read_file(make_file("f", content), lines), 0);
    EXPECT_EQ(lines, expected);
  }
  Lines lines = {"before"};
  EXPECT_EQ(ZunoFunc::read_file(make_file("f", "after"), lines), 0);
  EXPECT_THAT(lines, ElementsAre("before", "after"));
}

TEST_F(ZunoFuncFile, ReadsNumbers) {
  const std::pair<std::string, unsigned long> rows[] = {
      {" 42\n", 42}, {"99999999999999999999", 18446744073709551615UL}, {"up", 0}, {"", 5}};
  for (const auto& [content, expected] : rows) {
    unsigned long number = 5;
    EXPECT_EQ(ZunoFunc::read_file(make_file("f", content), number), 0);
    EXPECT_EQ(number, expected) << content;
  }
}

TEST_F(ZunoFuncFile, SaysWhichFileItCannotFind) {
  std::string word;
  std::vector<std::string> lines;
  unsigned long number = 0;
  CapturedStdout output;
  EXPECT_EQ(ZunoFunc::read_file(path("no"), word), -1);
  EXPECT_EQ(ZunoFunc::read_file(path("no"), lines), -1);
  EXPECT_EQ(ZunoFunc::read_file(path("no"), number), -1);
  EXPECT_EQ(ZunoFunc::write_to_file(path("no/f"), "x"), -1);
  EXPECT_EQ(ZunoFunc::append_to_file(path("no/f"), "x"), -1);
  const std::string read = "[ZunoFunc]I: Cannot find file " + path("no") + "\n";
  const std::string write = "[ZunoFunc]I: Cannot find file " + path("no/f") + "\n";
  EXPECT_EQ(output.take(), read + read + read + write + write);
}

TEST_F(ZunoFuncFile, WritesAndAppends) {
  const std::string content("one\0two", 7);
  EXPECT_EQ(ZunoFunc::write_to_file(path("f"), content + content), 0);
  EXPECT_EQ(ZunoFunc::write_to_file(path("f"), content), 0);
  EXPECT_EQ(ZunoFunc::append_to_file(path("f"), "!"), 0);
  EXPECT_EQ(ZunoFunc::write_to_file(path("f"), ""), 0);
  EXPECT_EQ(content_of(path("f")), content + "!");
  EXPECT_EQ(ZunoFunc::append_to_file(path("none"), ""), 0);
  EXPECT_FALSE(exists(path("none")));
  EXPECT_EQ(ZunoFunc::append_to_file(path("new"), "x"), 0);
  EXPECT_EQ(content_of(path("new")), "x");
}

TEST_F(ZunoFuncFile, ZeroesExactlyTheStretch) {
  const std::string file = make_file("f", std::string(3000, 'x'));
  const unique_fd fd(open(file.c_str(), O_RDWR | O_CLOEXEC));
  write_script() = {.fd = fd.get()};
  EXPECT_TRUE(ZunoFunc::overwrite_with_zeros(fd.get(), 100, 2500));
  EXPECT_THAT(write_script().sizes, ElementsAre(1024U, 1024U, 452U));
  EXPECT_EQ(content_of(file),
            std::string(100, 'x') + std::string(2500, '\0') + std::string(400, 'x'));

  write_script() = {.fd = fd.get(), .outcomes = {1000, 1}};
  EXPECT_TRUE(ZunoFunc::overwrite_with_zeros(fd.get(), 0, 1500));
  EXPECT_THAT(write_script().sizes, ElementsAre(1024U, 500U, 499U));

  write_script() = {.fd = fd.get()};
  EXPECT_TRUE(ZunoFunc::overwrite_with_zeros(fd.get(), 0, 0));
  EXPECT_TRUE(ZunoFunc::overwrite_with_zeros(fd.get(), 0, -5));
  EXPECT_TRUE(write_script().sizes.empty());
  write_script() = {};
}

TEST_F(ZunoFuncFile, StopsZeroingAtTheFirstFailure) {
  const unique_fd file(open(make_file("f", "x").c_str(), O_RDWR | O_CLOEXEC));
  const unique_fd full(open("/dev/full", O_WRONLY | O_CLOEXEC));
  CapturedStdout output;
  write_script() = {.fd = file.get(), .outcomes = {1024, -1}};
  EXPECT_FALSE(ZunoFunc::overwrite_with_zeros(file.get(), 0, 5000));
  EXPECT_EQ(errno, EINTR);
  EXPECT_EQ(write_script().sizes.size(), 2U);
  write_script() = {};
  EXPECT_FALSE(ZunoFunc::overwrite_with_zeros(full.get(), 0, 1));
  EXPECT_EQ(errno, ENOSPC);
  EXPECT_FALSE(ZunoFunc::overwrite_with_zeros(file.get(), -1, 1));
  EXPECT_EQ(errno, EINVAL);
  EXPECT_FALSE(ZunoFunc::overwrite_with_zeros(-1, 0, 1));
  EXPECT_EQ(output.take(),
            "[ZunoFunc]E: Write of zeroes failed: (Interrupted system call)\n"
            "[ZunoFunc]E: Write of zeroes failed: (No space left on device)\n"
            "[ZunoFunc]E: Seek failed for zero overwrite: (Invalid argument)\n"
            "[ZunoFunc]E: Seek failed for zero overwrite: (Bad file descriptor)\n");
  EXPECT_EQ(size_of(path("f")), 1024);
}

TEST_F(ZunoFuncFile, AsksTheDeviceBelowDevBlockInAnyCaseForItsSize) {
  SKIP_WITHOUT_PRIVATE_ROOT();
  EXPECT_EQ(ZunoFunc::file_size(make_file("f", "12345")), 5U);
  EXPECT_EQ(ZunoFunc::file_size(path("missing")), 0U);
  fs::create_directories("/DEV/Block");
  EXPECT_TRUE(android::base::WriteStringToFile("no device", "/DEV/Block/plain"));
  EXPECT_EQ(ZunoFunc::file_size("/DEV/Block/plain"), 0U);

  constexpr int64_t kThreeSectors = 3 * 512;
  const sentrova::testing::LoopDevice loop(kThreeSectors);
  if (loop.path().empty()) {
    GTEST_SKIP() << "this process may not attach loop devices";
  }
  fs::create_symlink(loop.path(), "/DEV/Block/disk");
  EXPECT_EQ(ZunoFunc::file_size("/DEV/Block/disk"), uint64_t{kThreeSectors});
  EXPECT_EQ(ZunoFunc::IOCTL_Get_Block_Size(loop.path().c_str()), uint64_t{kThreeSectors});
}

TEST_F(ZunoFuncFile, EmptiesOnlyWhatExists) {
  const std::string file = make_file("f", "content");
  chmod(file.c_str(), 0600);
  EXPECT_TRUE(ZunoFunc::empty_file(file));
  EXPECT_EQ(size_of(file), 0);
  EXPECT_EQ(mode_of(file), 0600U);
  EXPECT_FALSE(ZunoFunc::empty_file(path("missing")));
  EXPECT_FALSE(exists(path("missing")));
  EXPECT_FALSE(ZunoFunc::empty_file(""));
  EXPECT_FALSE(ZunoFunc::empty_file(root()));
  EXPECT_EQ(errno, EISDIR);
}

}  // namespace
