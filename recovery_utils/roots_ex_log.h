#pragma once

namespace sentrova::roots_ex {

// Stands in brackets at the head of every line that the vendor volume code writes to standard
// output.
inline constexpr char kLogTag[] = "ROOTS";

}  // namespace sentrova::roots_ex
