#pragma once

#include <string>

namespace sentrova::device {

// Writes the kernel's log to a file. Returns false with `errno` when it cannot be read or written.
bool save_kernel_log(const std::string& path);

// Leaves a result for the host: the text appears under `path` whole, or not at all. Returns false
// with `errno` when it cannot be written.
bool publish(const std::string& path, const std::string& text);

}  // namespace sentrova::device
