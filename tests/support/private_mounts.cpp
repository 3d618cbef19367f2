#include "tests/support/private_mounts.h"

#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/unique_fd.h>
#include <errno.h>
#include <fcntl.h>
#include <sched.h>
#include <string.h>
#include <sys/mount.h>
#include <unistd.h>

#include <filesystem>
#include <system_error>
#include <utility>

namespace fs = std::filesystem;

using android::base::unique_fd;

namespace sentrova::testing {
namespace {

constexpr char kShell[] = "/system/bin/sh";

// Where the new root is put together. Every machine has it, and no trace stays in it.
const fs::path kStaging = "/tmp";

std::string refusal(const std::string& what) {
  return "no private root here: " + what + ": " + strerror(errno);
}

bool write_file(const std::string& path, const std::string& text) {
  return android::base::WriteStringToFile(text, path);
}

// Root may have a mount namespace for the asking; others need a user namespace in which they are
// root, which the kernel gives to a process with one thread.
bool leave_namespace() {
  if (unshare(CLONE_NEWNS) == 0) {
    return true;
  }
  const uid_t uid = geteuid();
  const gid_t gid = getegid();
  return unshare(CLONE_NEWUSER | CLONE_NEWNS) == 0 && write_file("/proc/self/setgroups", "deny") &&
         write_file("/proc/self/uid_map", "0 " + std::to_string(uid) + " 1") &&
         write_file("/proc/self/gid_map", "0 " + std::to_string(gid) + " 1");
}

// Makes `entry` of the root appear in kStaging. `source` is the path to mount it from.
bool repeat_entry(const fs::directory_entry& entry, const std::string& source,
                  unsigned long flags) {
  const fs::path copy = kStaging / entry.path().filename();
  std::error_code error;
  if (entry.is_symlink()) {
    fs::copy_symlink(entry.path(), copy, error);
    return !error;
  }
  if (entry.is_directory()) {
    fs::create_directory(copy, error);
  } else if (!write_file(copy, "")) {
    return false;
  }
  return !error && mount(source.c_str(), copy.c_str(), nullptr, MS_BIND | flags, nullptr) == 0;
}

// Repeats every entry of the root in kStaging, which a tmpfs covers; `covered` is what lies below
// it.
std::string repeat_root(const unique_fd& covered) {
  std::error_code error;
  for (const fs::directory_entry& entry : fs::directory_iterator("/", error)) {
    const bool is_staging = entry.path() == kStaging;
    const std::string source =
        is_staging ? "/proc/self/fd/" + std::to_string(covered.get()) : entry.path().string();
    // What lies below counts the tmpfs on it among its own mounts, which must not come along.
    if (!repeat_entry(entry, source, is_staging ? 0 : MS_REC)) {
      return refusal("bind mount of " + entry.path().string());
    }
  }
  return error ? "no private root here: " + error.message() : "";
}

std::string build_private_root() {
  std::error_code error;
  const fs::path working_directory = fs::current_path(error);
  if (!leave_namespace()) {
    return refusal("mount namespace");
  }
  const unique_fd covered(open(kStaging.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  if (covered == -1) {
    return refusal(kStaging);
  }
  if (mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0 ||
      mount("tmpfs", kStaging.c_str(), "tmpfs", 0, "mode=0755") != 0) {
    return refusal("private tmpfs");
  }
  std::string result = repeat_root(covered);
  if (result.empty() && chroot(kStaging.c_str()) != 0) {
    result = refusal("chroot");
  }
  if (!result.empty()) {
    umount2(kStaging.c_str(), MNT_DETACH);
    return result;
  }
  fs::current_path(working_directory, error);
  return "";
}

}  // namespace

std::string enter_private_root() {
  static const std::string result = build_private_root();
  return result;
}

bool provide_shell() {
  std::error_code error;
  if (!fs::exists(kShell, error)) {
    // A machine's own /system is the old root's: the shell is added to a cover over it.
    fs::create_directory("/system", error);
    if (mount("tmpfs", "/system", "tmpfs", 0, "mode=0755") != 0) {
      return false;
    }
    fs::create_directory("/system/bin", error);
    fs::create_symlink("/bin/sh", kShell, error);
  }
  return access(kShell, X_OK) == 0;
}

ScopedTmpfs::ScopedTmpfs(std::string path) : path_(std::move(path)) {
  std::error_code error;
  fs::create_directories(path_, error);
  CHECK(mount("tmpfs", path_.c_str(), "tmpfs", 0, "mode=0755") == 0) << path_;
}

ScopedTmpfs::~ScopedTmpfs() {
  CHECK(umount2(path_.c_str(), MNT_DETACH) == 0) << path_;
}

}  // namespace sentrova::testing
