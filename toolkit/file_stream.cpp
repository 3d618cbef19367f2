#include "toolkit/file_stream.h"

#include <android-base/macros.h>
#include <fcntl.h>
#include <unistd.h>

using android::base::unique_fd;

namespace sentrova::toolkit {

unique_fd open_file(const std::string& path, int flags, mode_t creation_mode) {
  const auto open_once = [&] { return open(path.c_str(), flags | O_CLOEXEC, creation_mode); };
  return unique_fd(static_cast<int>(TEMP_FAILURE_RETRY(open_once())));
}

unique_fd open_to_read(const std::string& path) {
  return open_file(path, O_RDONLY, 0);
}

unique_fd open_to_write(const std::string& path, int mode_flag) {
  constexpr mode_t kCreationMode = 0666;
  return open_file(path, O_WRONLY | O_CREAT | mode_flag, kCreationMode);
}

FileStream::Buffer::int_type FileStream::Buffer::underflow() {
  const ssize_t count = TEMP_FAILURE_RETRY(read(fd_.get(), bytes_.data(), bytes_.size()));
  if (count <= 0) {
    return traits_type::eof();
  }
  setg(bytes_.data(), bytes_.data(), bytes_.data() + count);
  return traits_type::to_int_type(bytes_.front());
}

}  // namespace sentrova::toolkit
