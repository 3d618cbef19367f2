#pragma once

#include <android-base/unique_fd.h>
#include <stddef.h>
#include <sys/types.h>

#include <array>
#include <istream>
#include <streambuf>
#include <string>

namespace sentrova::toolkit {

// Each of these opens `path` close-on-exec, retries an interrupted open, and returns -1 with
// `errno` on failure. open_file takes open's flags and creation mode. open_to_write creates an
// absent file with mode 0666 less the umask; its `mode_flag` is O_TRUNC or O_APPEND.
android::base::unique_fd open_file(const std::string& path, int flags, mode_t creation_mode);
android::base::unique_fd open_to_read(const std::string& path);
android::base::unique_fd open_to_write(const std::string& path, int mode_flag);

// An input stream over a file, as the standard one but close-on-exec. Read errors end the stream.
class FileStream {
 public:
  explicit FileStream(const std::string& path)
      : fd_(open_to_read(path)), buffer_(fd_), stream_(&buffer_) {}

  bool is_open() const { return fd_.ok(); }
  std::istream& stream() { return stream_; }

 private:
  class Buffer : public std::streambuf {
   public:
    explicit Buffer(const android::base::unique_fd& fd) : fd_(fd) {}

   protected:
    int_type underflow() override;

   private:
    static constexpr size_t kBufferSize = 8192;
    const android::base::unique_fd& fd_;
    std::array<char, kBufferSize> bytes_;
  };

  const android::base::unique_fd fd_;
  Buffer buffer_;
  std::istream stream_;
};

}  // namespace sentrova::toolkit
