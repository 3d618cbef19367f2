#include "cli/holders.h"

#include <android-base/file.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <unistd.h>

#include <string>
#include <utility>

#include "tests/support/holder.h"

namespace {

using sentrova::lies_in;
using sentrova::mapped_path;

TEST(MappedPath, IsWhatStandsBehindTheInode) {
  const std::pair<std::string, std::string> cases[] = {
      {"7f12-7f34 r-xp 00000000 fd:01 131 /data/lib.so", "/data/lib.so"},
      {"7f12-7f34 rw-s 00000000 00:05 9     /data/a b (deleted)", "/data/a b (deleted)"},
      {"7f12-7f34 rw-p 00000000 00:00 0 ", ""},
      {"7f12-7f34 rw-p 00000000 00:00 0", ""},
      {"7f12-7f34 rw-p 00000000 00:00 0 [anon: /data/x]", ""},
      {"/data/x", ""},
      {"", ""},
  };
  for (const auto& [line, path] : cases) {
    EXPECT_EQ(mapped_path(line), path) << line;
  }
}

TEST(LiesIn, GoesByWholeNames) {
  EXPECT_TRUE(lies_in("/data", "/data"));
  EXPECT_TRUE(lies_in("/data/x", "/data"));
  EXPECT_TRUE(lies_in("/data (deleted)", "/data"));
  EXPECT_TRUE(lies_in("/data", "/"));
  EXPECT_FALSE(lies_in("/data2/x", "/data"));
  EXPECT_FALSE(lies_in("/dat", "/data"));
  EXPECT_FALSE(lies_in("pipe:[1]", "/"));
  EXPECT_FALSE(lies_in("", "/"));
}

TEST(Holders, AreFoundByAllTheyHoldAndLive) {
  TemporaryDir volume;
  const std::string path = volume.path;
  const std::string file = path + "/a\nb";
  ASSERT_TRUE(android::base::WriteStringToFile("text", file));
  int descriptor = -1;
  const sentrova::testing::Holder process([&] {
    descriptor = open(file.c_str(), O_RDONLY | O_CLOEXEC);
    mmap(nullptr, 4, PROT_READ, MAP_PRIVATE, descriptor, 0);
    mmap(nullptr, 4, PROT_READ, MAP_SHARED, descriptor, 0);
    static_cast<void>(!chdir(path.c_str()));
  });
  const sentrova::HolderSearch search = sentrova::find_holders(path);
  ASSERT_EQ(search.holders.size(), 1u);
  EXPECT_GT(search.holders[0].pid, 0);
  EXPECT_NE(search.holders[0].name, "");
  std::string held;
  for (const sentrova::HeldPath& one : search.holders[0].held) {
    held += one.by + (one.descriptor >= 0 ? " n " : " ") + one.path.substr(path.size()) + ";";
  }
  // In the list of mappings the kernel writes line ends in octal.
  EXPECT_EQ(held, "cwd ;descriptor n /a\nb;mapping /a\\012b;");
  EXPECT_EQ(process.ended_by(), 0);
  EXPECT_TRUE(sentrova::find_holders(path + "2").holders.empty());
  const std::string beginning = path.substr(0, path.size() - 1);
  EXPECT_TRUE(sentrova::find_holders(beginning).holders.empty());
  EXPECT_EQ(sentrova::count_ended_by_force(beginning), 1u) << "force goes by the text";
  EXPECT_EQ(sentrova::find_own_hold(path), "");
  const android::base::unique_fd own(open(file.c_str(), O_RDONLY | O_CLOEXEC));
  EXPECT_NE(sentrova::find_own_hold(path), "");
  EXPECT_EQ(sentrova::find_holders(path).holders.size(), 1u) << "the caller is left out";
  unlink(file.c_str());
}

}  // namespace
