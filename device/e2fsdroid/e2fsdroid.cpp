// Fills an ext4 file system from a directory. It takes the place of the platform's tool of this
// name and is called as
//   e2fsdroid -e -f DIRECTORY -a MOUNT_POINT DEVICE
// "-e" says that the device is no sparse image. The mount point serves a file-context look-up,
// which the virtual device has no policy for; files keep the labels that they have.
//
// The kernel writes the file system: it is mounted where no other process sees it. Exit status: 0
// when everything is on the device, 1 after a line on standard error, 2 for a wrong command line.
#include <errno.h>
#include <sched.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mount.h>
#include <unistd.h>

#include <string>

#include "device/e2fsdroid/tree_copy.h"

namespace {

struct Arguments {
  std::string directory;
  std::string device;
};

bool read_arguments(int argc, char** argv, Arguments& arguments) {
  for (int option; (option = getopt(argc, argv, "ef:a:")) != -1;) {
    if (option == 'f') {
      arguments.directory = optarg;
    } else if (option != 'e' && option != 'a') {
      return false;
    }
  }
  if (arguments.directory.empty() || optind != argc - 1) {
    return false;
  }
  arguments.device = argv[optind];
  return true;
}

bool fail(const std::string& what) {
  fprintf(stderr, "e2fsdroid: %s: %s\n", what.c_str(), strerror(errno));
  return false;
}

bool fill(const Arguments& arguments, const char* mount_point) {
  if (mount(arguments.device.c_str(), mount_point, "ext4", 0, "") != 0) {
    return fail("mount of " + arguments.device);
  }
  const bool copied = sentrova::device::copy_tree(arguments.directory, mount_point);
  if (umount(mount_point) != 0) {
    return fail("unmount of " + arguments.device);
  }
  return copied;
}

bool fill_in_private(const Arguments& arguments) {
  if (unshare(CLONE_NEWNS) != 0 ||
      mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0) {
    return fail("private mounts");
  }
  char mount_point[] = "/tmp/e2fsdroid.XXXXXX";
  if (mkdtemp(mount_point) == nullptr) {
    return fail(mount_point);
  }
  const bool filled = fill(arguments, mount_point);
  rmdir(mount_point);
  return filled;
}

}  // namespace

int main(int argc, char** argv) {
  Arguments arguments;
  if (!read_arguments(argc, argv, arguments)) {
    fprintf(stderr, "usage: e2fsdroid -e -f DIRECTORY -a MOUNT_POINT DEVICE\n");
    return 2;
  }
  return fill_in_private(arguments) ? 0 : 1;
}
