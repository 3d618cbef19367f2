#pragma once

namespace sentrova::device {

// Makes the file that the host left the device's default fstab, if there is one, and mounts its
// rows that are marked "first_stage_mount". What cannot be done is logged: a rescue device also
// starts with a damaged disk.
void mount_early_volumes();

}  // namespace sentrova::device
