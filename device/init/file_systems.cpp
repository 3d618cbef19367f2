#include "device/init/file_systems.h"

#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

namespace sentrova::device {
namespace {

struct KernelFileSystem {
  const char* type;
  const char* mount_point;
  unsigned long flags;
  const char* options;
};

constexpr KernelFileSystem kKernelFileSystems[] = {
    {"proc", "/proc", MS_NOSUID | MS_NODEV | MS_NOEXEC, ""},
    {"sysfs", "/sys", MS_NOSUID | MS_NODEV | MS_NOEXEC, ""},
    {"devtmpfs", "/dev", MS_NOSUID, "mode=0755"},
    {"devpts", "/dev/pts", MS_NOSUID | MS_NOEXEC, "mode=0600,ptmxmode=0666"},
    {"tmpfs", "/tmp", MS_NOSUID | MS_NODEV, "mode=1777"},
};

constexpr char kHostFolderType[] = "9p";
// A large message size spares round trips; without a cache both sides see writes at once.
constexpr char kHostFolderOptions[] = "trans=virtio,version=9p2000.L,msize=262144,cache=none";
// The host's programs do not change while the device runs.
constexpr char kProgramFolderOptions[] = "trans=virtio,version=9p2000.L,msize=262144,cache=loose";

bool make_folder(const char* path) {
  return mkdir(path, 0755) == 0 || errno == EEXIST;
}

}  // namespace

bool mount_kernel_file_systems() {
  for (const KernelFileSystem& entry : kKernelFileSystems) {
    if (!make_folder(entry.mount_point) ||
        mount(entry.type, entry.mount_point, entry.type, entry.flags, entry.options) != 0) {
      return false;
    }
  }
  // The kernel keeps block devices in /dev itself; the link shows those that come later, too.
  return symlink(".", "/dev/block") == 0 && make_folder("/dev/__properties__");
}

bool mount_host_folders() {
  return mount("share", "/share", kHostFolderType, MS_NOSUID | MS_NODEV, kHostFolderOptions) == 0 &&
         mount("build", "/build", kHostFolderType, MS_RDONLY | MS_NOSUID | MS_NODEV,
               kProgramFolderOptions) == 0;
}

}  // namespace sentrova::device
