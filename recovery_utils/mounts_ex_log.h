#pragma once

namespace sentrova::mounts_ex {

// Stands in brackets at the head of every line that this unit writes to standard output.
inline constexpr char kLogTag[] = "ZUNO_MOUNT";

}  // namespace sentrova::mounts_ex
