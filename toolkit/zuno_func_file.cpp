#include <android-base/errno_restorer.h>
#include <android-base/file.h>
#include <fcntl.h>
#include <stdio.h>

#include <istream>

#include "toolkit/file_stream.h"
#include "toolkit/log_tag.h"
#include "toolkit/zuno_func.h"

using android::base::unique_fd;
using sentrova::toolkit::FileStream;
using sentrova::toolkit::kLogTag;
using sentrova::toolkit::open_to_write;

namespace {

void report_missing(const std::string& path) {
  const android::base::ErrnoRestorer keep_errno;
  fprintf(stdout, "[%s]I: Cannot find file %s\n", kLogTag, path.c_str());
}

template <typename Value>
int read_first_value(const std::string& path, Value& value) {
  FileStream file(path);
  if (!file.is_open()) {
    report_missing(path);
    return -1;
  }
  file.stream() >> value;
  return 0;
}

int write_content(const std::string& path, const std::string& content, int mode_flag) {
  if (content.empty()) {
    return 0;
  }
  const unique_fd file = open_to_write(path, mode_flag);
  if (!file.ok()) {
    report_missing(path);
    return -1;
  }
  // A short write is not reported: callers rely on 0 for every file that could be opened.
  android::base::WriteFully(file, content.data(), content.size());
  return 0;
}

}  // namespace

int ZunoFunc::read_file(std::string path, std::string& word) {
  return read_first_value(path, word);
}

int ZunoFunc::read_file(std::string path, unsigned long& number) {
  return read_first_value(path, number);
}

int ZunoFunc::read_file(std::string path, std::vector<std::string>& lines) {
  FileStream file(path);
  if (!file.is_open()) {
    report_missing(path);
    return -1;
  }
  for (std::string line; std::getline(file.stream(), line);) {
    lines.push_back(line);
  }
  return 0;
}

int ZunoFunc::write_to_file(const std::string& path, const std::string& content) {
  return write_content(path, content, O_TRUNC);
}

int ZunoFunc::append_to_file(const std::string& path, const std::string& content) {
  return write_content(path, content, O_APPEND);
}
