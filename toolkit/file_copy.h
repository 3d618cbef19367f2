#pragma once

#include <android-base/unique_fd.h>

namespace sentrova::toolkit {

// Copies everything from the position of `source` on to `destination`, inside the kernel where the
// file systems can do that, and leaves the holes of a file with holes as holes. Files whose size
// reads as 0 or wrong (/proc, /sys) are copied by what they yield. Ends without a word at the first
// error.
void copy_contents(android::base::borrowed_fd source, android::base::borrowed_fd destination);

}  // namespace sentrova::toolkit
