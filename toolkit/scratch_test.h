#pragma once

#include <android-base/file.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cstddef>
#include <filesystem>
#include <iterator>
#include <string>

namespace sentrova::toolkit {

// A test with a directory of its own that fails if it leaves a descriptor open.
class ScratchTest : public ::testing::Test {
 protected:
  ScratchTest() : descriptors_before_(count_descriptors()) {}
  ~ScratchTest() override {
    EXPECT_EQ(count_descriptors(), descriptors_before_);
    std::error_code error;
    std::filesystem::remove_all(root(), error);
  }

  std::string root() const { return directory_.path; }
  std::string path(const std::string& name) const { return root() + "/" + name; }

  std::string make_file(const std::string& name, const std::string& content) const {
    std::filesystem::create_directories(std::filesystem::path(path(name)).parent_path());
    EXPECT_TRUE(android::base::WriteStringToFile(content, path(name))) << path(name);
    return path(name);
  }
  std::string make_directory(const std::string& name) const {
    std::filesystem::create_directories(path(name));
    return path(name);
  }
  static std::string content_of(const std::string& file) {
    std::string content;
    return android::base::ReadFileToString(file, &content, true) ? content : "(unreadable)";
  }
  static mode_t mode_of(const std::string& file) {
    struct stat info = {};
    stat(file.c_str(), &info);
    return info.st_mode & 07777;
  }
  static bool exists(const std::string& file) {
    return std::filesystem::exists(std::filesystem::symlink_status(file));
  }
  // "a/a/a/...", `levels` long.
  static std::string deep_path(int levels) {
    std::string deep = "a";
    for (int level = 1; level < levels; ++level) {
      deep += "/a";
    }
    return deep;
  }

 private:
  static std::ptrdiff_t count_descriptors() {
    const std::filesystem::directory_iterator descriptors("/proc/self/fd");
    return std::distance(begin(descriptors), end(descriptors));
  }

  const std::ptrdiff_t descriptors_before_;
  TemporaryDir directory_;
};

// Names that a file system takes and careless code trips over.
inline const std::string kAwkwardNames[] = {"two words", "line\nbreak", "\xff\xfe\x80",
                                            "'quoted\"", "%s%n",        std::string(255, 'n')};

}  // namespace sentrova::toolkit
