#pragma once

namespace sentrova::device {

// Mounts what the kernel offers (/proc, /sys, /dev, /dev/pts, /tmp) and makes the folders that
// belong to /dev: /dev/block, which shows the device nodes, and the property store's. Returns false
// with `errno` when one of them cannot be had; the device is of no use then.
bool mount_kernel_file_systems();

// Mounts the folders that the host shares: /share, for the story and all that it leaves behind, and
// /build, read-only, the folder of the cross build with its test programs. Returns false with
// `errno` when one of them is not to be had.
bool mount_host_folders();

}  // namespace sentrova::device
