#pragma once

#include <android-base/file.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>
#include <set>
#include <string>

#include "tests/support/descriptors.h"

namespace sentrova::toolkit {

// A test with a directory of its own that fails if it leaves a descriptor open.
class ScratchTest : public ::testing::Test {
 protected:
  ~ScratchTest() override {
    EXPECT_EQ(testing::count_descriptors(), descriptors_before_);
    std::error_code error;
    std::filesystem::remove_all(root(), error);
  }

  std::string root() const { return directory_.path; }
  std::string path(const std::string& name) const { return root() + "/" + name; }

  // These make the folders above too.
  std::string make_file(const std::string& name, const std::string& content = "") const {
    make_directory(std::filesystem::path(name).parent_path());
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
  static struct stat status_of(const std::string& file) {
    struct stat info = {};
    EXPECT_EQ(stat(file.c_str(), &info), 0) << file;
    return info;
  }
  static mode_t mode_of(const std::string& file) { return status_of(file).st_mode & 07777; }

  // All that is below a directory: "folder/", "folder/file=content", "other" for what is neither.
  static std::set<std::string> tree_of(const std::string& directory) {
    std::set<std::string> tree;
    for (const auto& entry : std::filesystem::recursive_directory_iterator(directory)) {
      const std::string name = entry.path().lexically_relative(directory);
      const auto type = entry.symlink_status().type();
      tree.insert(type == std::filesystem::file_type::directory ? name + "/"
                  : type == std::filesystem::file_type::regular
                      ? name + "=" + content_of(entry.path())
                      : name);
    }
    return tree;
  }

 private:
  const std::ptrdiff_t descriptors_before_ = testing::count_descriptors();
  TemporaryDir directory_;
};

}  // namespace sentrova::toolkit
