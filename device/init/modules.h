#pragma once

#include <string>

namespace sentrova::device {

// Loads the kernel modules that stand in `directory`, in the order of its load.list (a file name a
// line, as the image's build resolved them). A module that is there already is no error. Each
// failure is logged; returns the number of modules that could not be loaded.
int load_modules(const std::string& directory);

}  // namespace sentrova::device
