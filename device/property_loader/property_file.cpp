#include "device/property_loader/property_file.h"

#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/strings.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "common/read_at_most.h"

namespace sentrova::device {

using android::base::unique_fd;

namespace {

constexpr mode_t kPropertyFileMode = 0644;

bool is_regular(int fd) {
  struct stat status = {};
  if (fstat(fd, &status) != 0) {
    return false;
  }
  errno = EINVAL;
  return S_ISREG(status.st_mode);
}

// Returns what is wrong with a line, or an empty text with `property` set.
std::string parse_line(const std::string& line, Property& property) {
  const size_t equals = line.find('=');
  if (equals == std::string::npos) {
    return "no \"=\" in the line";
  }
  property = {android::base::Trim(line.substr(0, equals)),
              android::base::Trim(line.substr(equals + 1))};
  if (property.value.size() > kMaxPropertyValueBytes) {
    return "the value of " + property.name + " has " + std::to_string(property.value.size()) +
           " bytes, more than " + std::to_string(kMaxPropertyValueBytes);
  }
  return "";
}

}  // namespace

std::optional<std::string> read_property_text(const std::string& path) {
  // Non-blocking, as what stands there may be a pipe.
  const unique_fd file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
  if (!file.ok() || !is_regular(file.get())) {
    return std::nullopt;
  }
  return read_at_most(file.get(), kMaxPropertyFileBytes);
}

std::vector<Property> parse_property_text(std::string_view text, const std::string& path) {
  std::vector<Property> properties;
  int number = 0;
  for (const std::string& raw : android::base::Split(std::string(text), "\n")) {
    ++number;
    const std::string line = android::base::Trim(raw);
    if (line.empty() || line.front() == '#') {
      continue;
    }
    Property property;
    const std::string problem = parse_line(line, property);
    if (problem.empty()) {
      properties.push_back(std::move(property));
    } else {
      LOG(WARNING) << path << ":" << number << ": skipped: " << problem;
    }
  }
  return properties;
}

bool write_property_text(const std::string& path, const std::string& text) {
  const std::string fresh = path + ".new";
  unlink(fresh.c_str());
  const unique_fd file(
      open(fresh.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC | O_NOFOLLOW, kPropertyFileMode));
  return file.ok() && android::base::WriteStringToFd(text, file) &&
         fchmod(file.get(), kPropertyFileMode) == 0 && rename(fresh.c_str(), path.c_str()) == 0;
}

}  // namespace sentrova::device
