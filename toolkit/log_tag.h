#pragma once

namespace sentrova::toolkit {

// Stands in brackets at the head of every line that the toolkit writes to standard output.
inline constexpr char kLogTag[] = "ZunoFunc";

}  // namespace sentrova::toolkit
