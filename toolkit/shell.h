#pragma once

namespace sentrova::toolkit {

// The device's shell, started as kShellArgumentZero with "-c" and the command line.
inline constexpr char kShellPath[] = "/system/bin/sh";
inline constexpr char kShellArgumentZero[] = "sh";

}  // namespace sentrova::toolkit
