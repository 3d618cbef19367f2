#include "toolkitutil/findfile.h"

#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/unique_fd.h>
#include <dirent.h>
#include <dlfcn.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <pthread.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <filesystem>
#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "tests/support/descriptor_limit.h"

using sentrova::testing::DescriptorLimit;
using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::StartsWith;

namespace {

// What a test sees and changes of the finder's directory reads; null where the real ones suffice.
thread_local std::vector<std::string>* opened_paths = nullptr;
thread_local const std::function<void(dirent*)>* on_entry = nullptr;

}  // namespace

// These stand in front of the C library's functions for the whole test program.
extern "C" DIR* opendir(const char* path) {
  static const auto real = reinterpret_cast<DIR* (*)(const char*)>(dlsym(RTLD_NEXT, "opendir"));
  if (opened_paths != nullptr) {
    opened_paths->push_back(path);
  }
  return real(path);
}

extern "C" dirent* readdir(DIR* stream) {
  static const auto real = reinterpret_cast<dirent* (*)(DIR*)>(dlsym(RTLD_NEXT, "readdir"));
  dirent* entry = real(stream);
  if (entry != nullptr && on_entry != nullptr) {
    (*on_entry)(entry);
  }
  return entry;
}

namespace {

struct LogLine {
  android::base::LogSeverity severity;
  std::string file;
  std::string message;
};

class FindFile : public ::testing::Test {
 protected:
  void SetUp() override {
    // The folder's own path may run through a link; the tests count on a resolved one.
    ASSERT_TRUE(android::base::Realpath(folder_.path, &root_));
    android::base::SetLogger([this](auto, auto severity, auto, auto file, auto, auto message) {
      log_.push_back({severity, file, message});
    });
  }

  void TearDown() override { android::base::SetLogger(android::base::StderrLogger); }

  std::string at(const std::string& path) const { return root_ + "/" + path; }
  void make_directory(const std::string& path) const {
    ASSERT_TRUE(std::filesystem::create_directories(at(path)));
  }
  void make_file(const std::string& path) const {
    ASSERT_TRUE(android::base::WriteStringToFile("", at(path)));
  }
  void make_link(const std::string& target, const std::string& path) const {
    ASSERT_EQ(0, symlink(target.c_str(), at(path).c_str())) << strerror(errno);
  }

  // Searches and notes the directories that were opened, in order.
  std::string find(const std::string& name, const std::string& start) {
    opened_.clear();
    opened_paths = &opened_;
    std::string match = Find_File::Find(name, start);
    opened_paths = nullptr;
    return match;
  }

  TemporaryDir folder_;
  std::string root_;
  std::vector<std::string> opened_;
  std::vector<LogLine> log_;
};

// Makes `levels` directories named `name`, each in the one before, below `folder`, and an empty
// file "target" in the last.
void make_deep_tree(const std::string& folder, const std::string& name, int levels) {
  android::base::unique_fd level(open(folder.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  for (int i = 0; i < levels; ++i) {
    ASSERT_EQ(0, mkdirat(level.get(), name.c_str(), 0755)) << strerror(errno);
    level.reset(openat(level.get(), name.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  }
  ASSERT_NE(-1, android::base::unique_fd(
                    openat(level.get(), "target", O_CREAT | O_WRONLY | O_CLOEXEC, 0644))
                    .get());
}

// Runs `body` on a thread with a stack of the given size.
void run_on_stack(size_t stack_bytes, std::function<void()> body) {
  pthread_attr_t attributes;
  ASSERT_EQ(0, pthread_attr_init(&attributes));
  ASSERT_EQ(0, pthread_attr_setstacksize(&attributes, stack_bytes));
  pthread_t thread;
  const auto run = [](void* argument) -> void* {
    (*static_cast<std::function<void()>*>(argument))();
    return nullptr;
  };
  ASSERT_EQ(0, pthread_create(&thread, &attributes, run, &body));
  pthread_join(thread, nullptr);
  pthread_attr_destroy(&attributes);
}

TEST_F(FindFile, MatchesOnlyARegularFileWithExactlyThatName) {
  make_directory("a/wanted");
  make_directory("b");
  ASSERT_EQ(0, mkfifo(at("b/wanted").c_str(), 0600));
  make_file("a/Wanted");
  make_file("a/wanted.zip");
  make_file("a/unwanted");
  make_link(at("a/Wanted"), "wanted");
  for (const char* name : {"wanted", "want", "", ".", "..", "a/Wanted"}) {
    EXPECT_EQ("", find(name, root_)) << name;
  }
  make_file("a/wanted/wanted");
  EXPECT_EQ(at("a/wanted/wanted"), find("wanted", root_));
  EXPECT_EQ(at("a/Wanted"), find("Wanted", root_));
}

TEST_F(FindFile, TakesFilesThenSubdirectoriesThenLinksInListedOrder) {
  // The tree is searched in the order: root, sub1, sub1/below, sub2, then what the links lead to.
  for (const char* path : {"tree/sub1/below", "tree/sub2", "aside1", "aside2/sub"}) {
    make_directory(path);
  }
  make_link("../aside1", "tree/link1");
  make_link(at("aside2"), "tree/link2");
  ASSERT_EQ("", find("absent", at("tree")));

  std::vector<std::string> subdirectories;
  std::vector<std::string> links;
  const std::function<void(dirent*)> note = [&](const dirent* entry) {
    if (entry->d_name[0] == 's') {
      subdirectories.push_back(at("tree/") + entry->d_name);
    } else if (entry->d_name[0] == 'l') {
      links.push_back(at("aside") + entry->d_name[4]);
    }
  };
  std::vector<std::string> expected{at("tree")};
  on_entry = &note;
  const std::unique_ptr<DIR, int (*)(DIR*)> listing(opendir(at("tree").c_str()), closedir);
  while (readdir(listing.get()) != nullptr) {
  }
  on_entry = nullptr;
  for (const auto& paths : {subdirectories, links}) {
    for (const std::string& path : paths) {
      expected.push_back(path);
      if (path == at("tree/sub1")) {
        expected.push_back(path + "/below");
      } else if (path == at("aside2")) {
        expected.push_back(path + "/sub");
      }
    }
  }
  ASSERT_EQ(7u, expected.size());
  EXPECT_EQ(expected, opened_);
  EXPECT_THAT(log_, IsEmpty());
}

TEST_F(FindFile, LogsWhatItCannotOpen) {
  make_file("file");
  make_directory("tree");
  make_directory("tree/sub");
  make_link("../file", "tree/link1");
  make_link("../nowhere", "tree/link2");
  make_link("link3", "tree/link3");
  struct Case {
    std::string start;
    std::string message;
  };
  const Case cases[] = {
      {at("absent"), "Find_File: Error opening" + at("absent") + ": No such file or directory"},
      {at("file"), "Find_File: Error opening" + at("file") + ": Not a directory"},
      {"", "Find_File: Error opening: No such file or directory"},
      // Of the links, the one to a file fails to open; those that do not resolve say nothing.
      {at("tree"), "Find_File: Error opening" + at("file") + ": Not a directory"},
  };
  for (const Case& c : cases) {
    log_.clear();
    EXPECT_EQ("", find("file", c.start)) << c.start;
    ASSERT_EQ(1u, log_.size()) << c.start;
    EXPECT_EQ(android::base::ERROR, log_[0].severity);
    EXPECT_THAT(log_[0].file, HasSubstr("findfile"));
    EXPECT_EQ(c.message, log_[0].message);
  }
}

TEST_F(FindFile, EntersEachSpellingOfAPathOnce) {
  make_directory("tree/sub");
  make_link("..", "tree/sub/up");
  make_link(".", "tree/self");
  make_link("tree", "alias");
  const std::string tree = at("tree");
  EXPECT_EQ("", find("absent", tree));
  EXPECT_THAT(opened_, ElementsAre(tree, tree + "/sub"));
  // The links resolve to a path that was not entered yet, so the tree is searched once more.
  for (const std::string& start : {at("alias"), tree + "/"}) {
    EXPECT_EQ("", find("absent", start));
    EXPECT_THAT(opened_, ElementsAre(start, start + "/sub", tree, tree + "/sub"));
  }
  EXPECT_THAT(log_, IsEmpty());
}

TEST_F(FindFile, AFinderRemembersWhatItEntered) {
  make_directory("sub");
  make_file("sub/first");
  make_file("second");
  Find_File finder;
  EXPECT_EQ(at("sub/first"), finder.Find_Internal("first", root_));
  EXPECT_EQ("", finder.Find_Internal("second", root_));
  EXPECT_EQ("", finder.Find_Internal("first", at("sub")));
  EXPECT_EQ(root_ + "//second", finder.Find_Internal("second", root_ + "/"));
  EXPECT_THAT(finder.searched_dirs, ElementsAre(root_, at("sub"), root_ + "/"));
}

TEST_F(FindFile, IgnoresEntriesOfUnknownType) {
  make_directory("sub");
  make_file("wanted");
  make_file("sub/wanted");
  make_link("sub", "link");
  const std::function<void(dirent*)> hide_type = [](dirent* entry) { entry->d_type = DT_UNKNOWN; };
  on_entry = &hide_type;
  EXPECT_EQ("", find("wanted", root_));
  on_entry = nullptr;
  EXPECT_THAT(opened_, ElementsAre(root_));
  EXPECT_THAT(log_, IsEmpty());
}

TEST_F(FindFile, TakesNamesAsBytes) {
  const std::string odd_directory = "\xff\xc3 line\nbreak\t";
  for (const std::string& name :
       {std::string("\xfe\x80.zip"), std::string("a b\n"), std::string(NAME_MAX, '\xe2')}) {
    std::filesystem::create_directories(at(odd_directory));
    make_file(odd_directory + "/" + name);
    EXPECT_EQ(at(odd_directory + "/" + name), find(name, root_));
  }
  EXPECT_EQ("", find(std::string("a b\n\0", 5), root_));
}

TEST_F(FindFile, DepthCostsNeitherDescriptorsNorStack) {
  constexpr int kLevels = 1000;
  constexpr size_t kStackBytes = 128 * 1024;  // a call for each level would need more
  make_directory("tree/deep");
  make_deep_tree(at("tree/deep"), "d", kLevels);
  make_directory("aside");
  make_file("aside/wanted");
  make_link("../aside", "tree/link");  // searched after the deepest directory
  std::string match;
  {
    const DescriptorLimit one_more_descriptor(1);
    run_on_stack(kStackBytes, [&] { match = find("wanted", at("tree")); });
  }
  EXPECT_EQ(at("aside/wanted"), match);
  EXPECT_EQ(size_t{kLevels} + 3, opened_.size());
  EXPECT_THAT(log_, IsEmpty());
}

TEST_F(FindFile, PassesOverPathsTooLongToOpen) {
  make_directory("tree/long");
  make_directory("aside");
  make_link("../aside", "tree/link");
  make_file("aside/wanted");
  make_deep_tree(at("tree/long"), std::string(NAME_MAX, 'n'), 20);
  EXPECT_EQ("", find("target", at("tree/long")));
  EXPECT_EQ(at("aside/wanted"), find("wanted", at("tree")));
  EXPECT_EQ(2u, log_.size());
  for (const LogLine& line : log_) {
    EXPECT_THAT(line.message, StartsWith("Find_File: Error opening" + at("tree/long/nnn")));
    EXPECT_THAT(line.message, EndsWith(": File name too long"));
  }
  std::filesystem::remove_all(at("tree"));  // TemporaryDir goes by path and could not
}

TEST_F(FindFile, PassesOverWhatVanishesAfterItWasListed) {
  // What the link leads to is searched last, after the directory that is gone by then.
  make_directory("tree/gone");
  make_directory("aside");
  make_link("../aside", "tree/gone_link");
  make_link("../aside", "tree/link");
  make_file("aside/wanted");
  const std::function<void(dirent*)> remove_entry = [&](const dirent* entry) {
    if (std::string_view(entry->d_name).substr(0, 4) == "gone") {
      std::filesystem::remove(at("tree/") + entry->d_name);
    }
  };
  on_entry = &remove_entry;
  EXPECT_EQ(at("aside/wanted"), find("wanted", at("tree")));
  on_entry = nullptr;
  ASSERT_EQ(1u, log_.size());
  EXPECT_EQ("Find_File: Error opening" + at("tree/gone") + ": No such file or directory",
            log_[0].message);
}

TEST_F(FindFile, FindsWhatStaysWhileAnotherBranchIsDeleted) {
  constexpr int kSearches = 300;
  android::base::SetLogger([](auto...) {});  // entries that vanish in the other branch are expected
  // Links come last, so that each search goes through what there is of the other branch first.
  make_directory("tree");
  make_directory("kept/sub");
  make_file("kept/sub/wanted");
  make_link("../kept", "tree/link");
  std::atomic<bool> done = false;
  std::atomic<int> deletions = 0;
  std::thread deleter([&] {
    while (!done) {
      for (int i = 0; i < 50; ++i) {
        std::filesystem::create_directories(at("tree/doomed/sub" + std::to_string(i) + "/below"));
      }
      std::filesystem::remove_all(at("tree/doomed"));
      ++deletions;
    }
  });
  for (int i = 0; i < kSearches || deletions < 3; ++i) {
    const std::string match = Find_File::Find("wanted", at("tree"));
    EXPECT_EQ(at("kept/sub/wanted"), match);
  }
  done = true;
  deleter.join();
}

}  // namespace
