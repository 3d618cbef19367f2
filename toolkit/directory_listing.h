#pragma once

#include <optional>
#include <string>
#include <vector>

namespace sentrova::toolkit {

struct DirectoryEntry {
  std::string name;
  unsigned char type;  // DT_REG, DT_DIR, ... as the file system tells it; DT_UNKNOWN if it does not
};

// Returns the entries of `directory` but for "." and "..", in the directory's own order, or nothing
// with opendir's `errno`. No descriptor stays open, so that a caller that goes down a tree holds
// none for the levels above. Entries may vanish before the caller looks at them.
std::optional<std::vector<DirectoryEntry>> list_directory(const std::string& directory);

}  // namespace sentrova::toolkit
