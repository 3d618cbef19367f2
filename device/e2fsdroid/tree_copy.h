#pragma once

#include <string>

namespace sentrova::device {

// Copies what is in the directory `source` into the existing directory `target`, with owners,
// modes, times, extended attributes, links (of several names of a file one copy and its other
// names) and special files; the directory's own attributes too. Directories that are in the target
// already are filled. False, after a line on standard error, at the first thing that cannot be
// copied.
bool copy_tree(const std::string& source, const std::string& target);

}  // namespace sentrova::device
