#pragma once

namespace sentrova::toolkit {

// The results of ZunoFunc::Dir_Status.
inline constexpr int kStatusAbsent = 0;
inline constexpr int kStatusDirectory = 1;
inline constexpr int kStatusOther = 2;

}  // namespace sentrova::toolkit
