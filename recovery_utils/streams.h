#pragma once

#include <dirent.h>
#include <stdio.h>
#include <stdlib.h>

#include <memory>
#include <optional>
#include <string_view>

namespace sentrova {

struct DirectoryCloser {
  void operator()(DIR* directory) const { closedir(directory); }
};
using Directory = std::unique_ptr<DIR, DirectoryCloser>;

struct FileCloser {
  void operator()(FILE* file) const { fclose(file); }
};
using File = std::unique_ptr<FILE, FileCloser>;

// Memory for one line of a text stream, which grows with the longest line.
class LineBuffer {
 public:
  LineBuffer() = default;
  ~LineBuffer() { free(text_); }
  LineBuffer(const LineBuffer&) = delete;
  LineBuffer& operator=(const LineBuffer&) = delete;

  // Returns the next line of `file` without its line end, valid until the next call, or nothing at
  // the end or on an error.
  std::optional<std::string_view> read(FILE* file) {
    const ssize_t length = getline(&text_, &capacity_, file);
    if (length < 0) {
      return std::nullopt;
    }
    std::string_view line(text_, static_cast<size_t>(length));
    if (line.ends_with('\n')) {
      line.remove_suffix(1);
    }
    return line;
  }

 private:
  char* text_ = nullptr;
  size_t capacity_ = 0;
};

}  // namespace sentrova
