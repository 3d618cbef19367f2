#include <android-base/file.h>
#include <android-base/properties.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>
#include <utils/String8.h>

#include <cerrno>
#include <filesystem>
#include <functional>

namespace {

using android::base::GetIntProperty;
using android::base::GetProperty;
using android::base::SetProperty;
using android::base::WriteStringToFile;

class Properties : public testing::Test {
 protected:
  Properties() { setenv("ANDROID_PROPERTY_DIR", folder_.path, 1); }
  ~Properties() override { unsetenv("ANDROID_PROPERTY_DIR"); }

  std::string path(const std::string& name) const { return folder_.path + ("/" + name); }

  size_t file_count() const {
    size_t count = 0;
    for ([[maybe_unused]] const auto& entry : std::filesystem::directory_iterator(folder_.path)) {
      ++count;
    }
    return count;
  }

  TemporaryDir folder_;
};

// How many of `count` processes at once got true from `body`.
int count_of_true(int count, const std::function<bool(int)>& body) {
  for (int i = 0; i < count; ++i) {
    if (fork() == 0) {
      _exit(body(i) ? 0 : 1);
    }
  }
  int true_count = 0;
  for (int status = -1; wait(&status) > 0;) {
    true_count += WIFEXITED(status) && WEXITSTATUS(status) == 0 ? 1 : 0;
  }
  return true_count;
}

TEST_F(Properties, WrittenAtOnceNeverShowAMixedValue) {
  const mode_t mask = umask(077);
  ASSERT_TRUE(SetProperty("test.shared", std::string(91, 'z')));
  umask(mask);
  EXPECT_EQ(std::filesystem::perms(0644),
            std::filesystem::status(path("test.shared")).permissions());
  EXPECT_EQ(4, count_of_true(4, [](int writer) {
              const std::string mine(91, static_cast<char>('a' + writer));
              for (int i = 0; i < 200; ++i) {
                const std::string seen = GetProperty("test.shared", "");
                if (seen.empty() || seen != std::string(91, seen[0]) ||
                    !SetProperty("test.shared", mine)) {
                  return false;
                }
              }
              return true;
            }));
  EXPECT_EQ(1u, file_count()) << "a writer left its new file behind";
}

TEST_F(Properties, ReadOnlyKeepTheFirstValueEvenAnEmptyOne) {
  constexpr int kNames = 60;
  EXPECT_EQ(4, count_of_true(4, [&](int writer) {
              for (int i = 0; i < kNames; ++i) {
                const std::string name = "ro.race." + std::to_string(i);
                const std::string mine = "writer" + std::to_string(writer);
                const bool wins = SetProperty(name, mine);
                if (wins != (GetProperty(name, "") == mine)) {
                  return false;
                }
              }
              return true;
            }));
  EXPECT_EQ(size_t{kNames}, file_count()) << "a loser left its new file behind";
  ASSERT_TRUE(SetProperty("ro.empty", ""));
  EXPECT_FALSE(SetProperty("ro.empty", "second"));
  EXPECT_EQ(EEXIST, errno);
  EXPECT_EQ("default", GetProperty("ro.empty", "default"));
}

// The program links a library that needs libbase before it links the store.
TEST_F(Properties, AreSeenByLibbasesOwnReadersWhateverElseIsLinked) {
  ASSERT_TRUE(WriteStringToFile(android::String8("42").string(), path("test.number")));
  EXPECT_EQ(42, GetIntProperty<int>("test.number", 0));
}

TEST_F(Properties, BadNamesChangeNothingAndReadAsTheDefault) {
  const std::string longest(255, 'n');
  for (const std::string& name : {std::string("A_b-C:d@e.9"), std::string("-x"), longest}) {
    EXPECT_TRUE(SetProperty(name, "v")) << name;
  }
  const std::string outside = "../" + android::base::Basename(folder_.path) + ".x";
  const std::string bad_names[] = {"",    ".",   ".a",    "a.",          "a..b",
                                   "a/b", "a b", outside, longest + "n", std::string("a\0b", 3)};
  for (const std::string& name : bad_names) {
    errno = 0;
    EXPECT_FALSE(SetProperty(name, "v")) << name;
    EXPECT_EQ(EINVAL, errno) << name;
    EXPECT_EQ("default", GetProperty(name, "default")) << name;
  }
  EXPECT_EQ(3u, file_count());
  EXPECT_FALSE(std::filesystem::exists(path(outside)));
}

TEST_F(Properties, ValuesUpToTheLimitOfTheirKind) {
  const struct {
    const char* name;
    size_t limit;
  } cases[] = {{"test.value", 91}, {"ro.value", 4096}};
  for (const auto& [name, limit] : cases) {
    errno = 0;
    EXPECT_FALSE(SetProperty(name, std::string(limit + 1, 'v')));
    EXPECT_EQ(EINVAL, errno);
    EXPECT_FALSE(SetProperty(name, std::string("a\0b", 3)));
    EXPECT_EQ("unset", GetProperty(name, "unset"));
    EXPECT_TRUE(SetProperty(name, std::string(limit, 'v')));
    EXPECT_EQ(std::string(limit, 'v'), GetProperty(name, ""));
  }
}

TEST_F(Properties, HostileStoreReadsAsTheDefault) {
  ASSERT_TRUE(WriteStringToFile(std::string(92, 'x'), path("test.long")));
  ASSERT_TRUE(WriteStringToFile(std::string("a\0b", 3), path("test.nul")));
  ASSERT_TRUE(WriteStringToFile("", path("test.huge")));
  ASSERT_EQ(0, truncate(path("test.huge").c_str(), off_t{1} << 40));
  ASSERT_TRUE(WriteStringToFile("secret", path("target")));
  ASSERT_EQ(0, symlink("target", path("test.link").c_str()));
  ASSERT_EQ(0, mkfifo(path("test.fifo").c_str(), 0600));
  ASSERT_EQ(0, mkdir(path("test.folder").c_str(), 0700));
  for (const char* name :
       {"test.long", "test.nul", "test.huge", "test.link", "test.fifo", "test.folder"}) {
    EXPECT_EQ("default", GetProperty(name, "default")) << name;
  }
  const size_t count = file_count();
  EXPECT_FALSE(SetProperty("test.folder", "v"));
  EXPECT_TRUE(SetProperty("test.link", "v"));
  EXPECT_EQ("secret", GetProperty("target", "")) << "a set went through a symbolic link";
  EXPECT_EQ(count, file_count());
}

TEST(PropertiesWithoutFolder, AreTheProcesssOwn) {
  const TemporaryDir parent;
  const std::string folder = parent.path + std::string("/absent");
  setenv("ANDROID_PROPERTY_DIR", folder.c_str(), 1);
  ASSERT_TRUE(SetProperty("test.own", "mine"));
  ASSERT_TRUE(SetProperty("ro.own", "first"));
  EXPECT_TRUE(SetProperty("ro.own", "second"));
  EXPECT_EQ("mine", GetProperty("test.own", ""));
  EXPECT_EQ("second", GetProperty("ro.own", ""));
  EXPECT_FALSE(std::filesystem::exists(folder));
  ASSERT_EQ(0, mkdir(folder.c_str(), 0755));
  EXPECT_EQ("unset", GetProperty("test.own", "unset"));
  unsetenv("ANDROID_PROPERTY_DIR");
}

}  // namespace
