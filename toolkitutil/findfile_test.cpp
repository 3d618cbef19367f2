#include "toolkitutil/findfile.h"

#include <android-base/file.h>
#include <android-base/logging.h>
#include <dirent.h>
#include <dlfcn.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "tests/support/descriptors.h"

using sentrova::testing::DescriptorLimit;
using ::testing::AllOf;
using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::StartsWith;

namespace {

// May change an entry, or the tree, as the finder lists it; null where the real ones suffice.
const std::function<void(dirent*)>* on_entry = nullptr;

}  // namespace

// Stands in front of the C library's function for the whole test program.
extern "C" dirent* readdir(DIR* stream) {
  static const auto real = reinterpret_cast<dirent* (*)(DIR*)>(dlsym(RTLD_NEXT, "readdir"));
  dirent* entry = real(stream);
  if (entry != nullptr && on_entry != nullptr) {
    (*on_entry)(entry);
  }
  return entry;
}

namespace {

class FindFile : public ::testing::Test {
 protected:
  void SetUp() override {
    // The folder's own path may run through a link; the tests count on a resolved one.
    ASSERT_TRUE(android::base::Realpath(folder_.path, &root_));
    android::base::SetLogger([this](auto, auto severity, auto, auto file, auto, auto message) {
      EXPECT_EQ(android::base::ERROR, severity);
      EXPECT_THAT(file, HasSubstr("findfile"));
      log_.push_back(message);
    });
  }
  void TearDown() override { android::base::SetLogger(android::base::StderrLogger); }

  std::string at(const std::string& path) const { return root_ + "/" + path; }

  // Each makes the directories above it too.
  void make_file(const std::string& path) const {
    std::filesystem::create_directories(std::filesystem::path(at(path)).parent_path());
    ASSERT_TRUE(android::base::WriteStringToFile("", at(path)));
  }
  void make_link(const std::string& target, const std::string& path) const {
    std::filesystem::create_directories(std::filesystem::path(at(path)).parent_path());
    ASSERT_EQ(0, symlink(target.c_str(), at(path).c_str())) << strerror(errno);
  }

  // Searches and notes the directories that were entered, in order, and what was logged.
  std::string find(
      const std::string& name, const std::string& start,
      const std::function<void(dirent*)>& entry_seen = [](dirent*) {}) {
    log_.clear();
    on_entry = &entry_seen;
    Find_File finder;
    std::string match = finder.Find_Internal(name, start);
    on_entry = nullptr;
    entered_ = finder.searched_dirs;
    return match;
  }

  TemporaryDir folder_;
  std::string root_;
  std::vector<std::string> entered_;
  std::vector<std::string> log_;
};

TEST_F(FindFile, MatchesOnlyARegularFileWithExactlyThatName) {
  std::filesystem::create_directories(at("a/wanted"));
  std::filesystem::create_directories(at("b"));
  ASSERT_EQ(0, mkfifo(at("b/wanted").c_str(), 0600));
  for (const char* file : {"a/Wanted", "a/wanted.zip", "a/unwanted"}) {
    make_file(file);
  }
  make_link(at("a/Wanted"), "wanted");
  for (const std::string name : {"wanted", "want", "", ".", "..", "a/Wanted"}) {
    EXPECT_EQ("", find(name, root_)) << name;
  }
  for (const std::string& path :
       {std::string("a/wanted/wanted"), std::string("\xff\xc3 line\nbreak\t/\xfe\x80 b\n"),
        "a/" + std::string(NAME_MAX, '\xe2')}) {
    make_file(path);
    EXPECT_EQ(at(path), find(path.substr(path.rfind('/') + 1), root_));
  }
  EXPECT_EQ("", find(std::string("Wanted\0", 7), root_));
  EXPECT_EQ("", find("Wanted", root_, [](dirent* entry) { entry->d_type = DT_UNKNOWN; }));
  EXPECT_THAT(entered_, ElementsAre(root_));
  EXPECT_THAT(log_, IsEmpty());
}

TEST_F(FindFile, TakesFilesThenSubdirectoriesThenLinksInListedOrder) {
  for (const char* path : {"tree/sub1/below", "tree/sub2", "aside1", "aside2/sub"}) {
    std::filesystem::create_directories(at(path));
  }
  make_link("../aside1", "tree/link1");
  make_link(at("aside2"), "tree/link2");
  std::vector<std::string> subdirectories = {at("tree")};
  std::vector<std::string> links;
  ASSERT_EQ(
      "", find("absent", at("tree"), [&](const dirent* entry) {
        const std::string name = entry->d_name;
        if (name == "sub1") {
          subdirectories.insert(subdirectories.end(), {at("tree/sub1"), at("tree/sub1/below")});
        } else if (name == "sub2") {
          subdirectories.push_back(at("tree/sub2"));
        } else if (name == "link1") {
          links.push_back(at("aside1"));
        } else if (name == "link2") {
          links.insert(links.end(), {at("aside2"), at("aside2/sub")});
        }
      }));
  subdirectories.insert(subdirectories.end(), links.begin(), links.end());
  EXPECT_EQ(subdirectories, entered_);
  EXPECT_EQ(7u, entered_.size());
  EXPECT_THAT(log_, IsEmpty());
}

TEST_F(FindFile, LogsWhatItCannotOpenAndGoesOn) {
  make_file("file");
  make_link("../file", "tree/link1");
  make_link("../nowhere", "tree/link2");
  make_link("link3", "tree/link3");
  const std::pair<std::string, std::string> rows[] = {
      {at("absent"), at("absent") + ": No such file or directory"},
      {at("file"), at("file") + ": Not a directory"},
      {"", ": No such file or directory"},
      // Of the links, the one to a file fails to open; those that do not resolve say nothing.
      {at("tree"), at("file") + ": Not a directory"},
  };
  for (const auto& [start, message] : rows) {
    EXPECT_EQ("", find("file", start)) << start;
    EXPECT_THAT(log_, ElementsAre("Find_File: Error opening" + message));
  }

  // What a link leads to is searched last, after the directory that is gone by then.
  make_file("aside/wanted");
  std::filesystem::create_directories(at("changing/gone"));
  make_link("../aside", "changing/gone_link");
  make_link("../aside", "changing/link");
  EXPECT_EQ(at("aside/wanted"), find("wanted", at("changing"), [&](const dirent* entry) {
              if (std::string_view(entry->d_name).starts_with("gone")) {
                std::filesystem::remove(at("changing/") + entry->d_name);
              }
            }));
  EXPECT_THAT(log_, ElementsAre("Find_File: Error opening" + at("changing/gone") +
                                ": No such file or directory"));
}

TEST_F(FindFile, EntersEachSpellingOfAPathOnce) {
  make_link("..", "tree/sub/up");
  make_link(".", "tree/self");
  make_link("tree", "alias");
  const std::string tree = at("tree");
  EXPECT_EQ("", find("absent", tree));
  EXPECT_THAT(entered_, ElementsAre(tree, tree + "/sub"));
  // The links resolve to a path that was not entered yet, so the tree is searched once more.
  for (const std::string& start : {at("alias"), tree + "/"}) {
    EXPECT_EQ("", find("absent", start));
    EXPECT_THAT(entered_, ElementsAre(start, start + "/sub", tree, tree + "/sub"));
  }
  EXPECT_THAT(log_, IsEmpty());
}

TEST_F(FindFile, AFinderRemembersWhatItEntered) {
  make_file("sub/first");
  make_file("second");
  Find_File finder;
  EXPECT_EQ(at("sub/first"), finder.Find_Internal("first", root_));
  EXPECT_EQ("", finder.Find_Internal("second", root_));
  EXPECT_EQ("", finder.Find_Internal("first", at("sub")));
  EXPECT_EQ(at("sub/first"), Find_File::Find("first", at("sub")));
  EXPECT_EQ(root_ + "//second", finder.Find_Internal("second", root_ + "/"));
  EXPECT_THAT(finder.searched_dirs, ElementsAre(root_, at("sub"), root_ + "/"));
}

TEST_F(FindFile, DepthCostsNoDescriptorsUpToThePathThatIsTooLongToOpen) {
  std::string deep;
  for (int level = 0; level < 90; ++level) {
    deep += "/" + std::string(30, 'd');
  }
  make_file("more" + deep + "/target");
  std::filesystem::create_directories(at("tree" + deep));
  ASSERT_EQ(0, rename(at("more").c_str(), at("tree" + deep + "/more").c_str()));
  make_file("aside/wanted");
  make_link("../aside", "tree/link");  // searched after the deepest directory
  {
    const DescriptorLimit one_more_descriptor(1);
    EXPECT_EQ(at("aside/wanted"), find("wanted", at("tree")));
  }
  EXPECT_GT(entered_.size(), 100u);
  EXPECT_THAT(log_, ElementsAre(AllOf(StartsWith("Find_File: Error opening" + at("tree/ddd")),
                                      EndsWith(": File name too long"))));
  EXPECT_EQ("", find("target", at("tree")));
  std::filesystem::remove_all(at("tree"));  // TemporaryDir goes by path and could not
}

}  // namespace
