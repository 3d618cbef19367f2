#pragma once

namespace sentrova::roots_ex {

// The device-mapper device behind which encrypted user data lie, and the node that is taken for it
// where the mapper names none.
inline constexpr char kUserdataMapping[] = "userdata";
inline constexpr char kFirstMapping[] = "/dev/block/dm-0";

// Returns whether user data lie behind the mapping, as the properties about encryption tell it.
// File-based encryption alone works within the file system and maps nothing.
bool data_is_mapped();

}  // namespace sentrova::roots_ex
