#pragma once

#include <string>

#include "common/export.h"

// The mounted volumes: a list taken from the kernel's table of mounted file systems on demand, the
// unmounting of its rows, and the release of what processes hold on a volume.
//
// There is one list in the process. It is empty until it is scanned and freed when the process
// ends. Nothing here takes a lock: use the list from one thread at a time. Unless stated otherwise,
// messages go to standard output, each beginning with "[ZUNO_MOUNT]".

// One mounted file system, as a line of /proc/mounts tells it, with the kernel's escapes ("\040"
// and the like) undone.
struct MountedVolume {
  std::string device;
  std::string mount_point;  // empty once the volume was unmounted through this unit
  std::string filesystem;   // the type
  std::string flags;        // the mount options, separated by commas
};

// Replaces the list with the kernel's table of this moment, in its order; stacked mounts have a row
// each, the lower one first. Frees all rows handed out before, even when it fails. Returns false,
// and leaves the list empty, if the table cannot be opened.
SENTROVA_API bool scan_mounted_volumes();

// Returns the first row of the last scan whose mount point is exactly `mount_point` (not null), or
// null. The row belongs to the list, until the next scan.
SENTROVA_API MountedVolume* find_mounted_volume_by_mount_point(const char* mount_point);

// Makes one attempt to unmount `volume` (not null), whose mount point it clears beforehand, so that
// a second call on the same row fails. Returns umount(2)'s result: 0, or -1 with its `errno`, after
// a warning in the base log.
SENTROVA_API int unmount_mounted_volume(MountedVolume* volume);

// Unmounts `volume`, with 30 attempts 100 milliseconds apart. A mount point on which nothing is
// mounted counts as unmounted. With `force`, the processes that reference the mount point get
// SIGTERM after the 21st failure and SIGKILL after the 26th. After the last failure those that
// still do are reported.
//
// Returns 0, with the row's mount point cleared, or -1: the volume is still busy after about three
// seconds, and the row is as it was; or `volume` is null. All outcomes are logged.
//
// With `force`, do not pass a row that is already unmounted: every path begins with its empty mount
// point, so that every process would be killed.
SENTROVA_API int unmount_mounted_volume(MountedVolume* volume, bool force);

namespace android::recovery {

// Looks through all processes of /proc for those that reference a path beginning with `path`: by a
// mapped file, the working directory, the root directory, the executable or an open descriptor.
// `path` is compared as plain text: "/data" stands for "/data2" too. Each reference is logged.
// Sends `signal` to each process found but the calling one; 0 sends nothing.
//
// Returns the number of processes found, the calling one included, or -1 if `path` is null or /proc
// cannot be opened. What cannot be read, as when a process ends meanwhile, is passed over; only a
// descriptor directory that cannot be opened is logged. Whether a signal arrived is not told.
SENTROVA_API int KillProcessesWithOpenFiles(const char* path, int signal);

// Returns whether `path` is a symbolic link whose target begins with `prefix`, and logs it if so.
SENTROVA_API bool checkSymlink(const std::string& path, const std::string& prefix);

}  // namespace android::recovery

// Asks init to stop the service "keystore", without waiting for it, and ends every process whose
// program path or first argument contains "keystore" (the calling one too) with SIGINT and, 5
// milliseconds later, SIGKILL, so that the files they hold are let go. Does only the first if /proc
// cannot be opened.
SENTROVA_API void force_progress_release_file();
