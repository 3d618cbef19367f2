#pragma once

#include <string>
#include <vector>

#include "common/export.h"

// Searches a directory tree for a regular file by name.
//
// The tree is searched depth first, entries in the order in which each directory lists them: first
// the files of a directory, then its real subdirectories, then the directories that its symbolic
// links resolve to. Entry types are those that the listing reports: a link to a file of the wanted
// name is no match, and entries of unknown type are ignored.
//
// One directory is open at a time, and neither depth nor width is limited but by the length of a
// path (PATH_MAX): a longer one cannot be opened. The tree may change during a search; what stays
// in place is found.
//
// A finder serves one search, on one thread. Searches by different finders are independent.
class Find_File {
 public:
  Find_File() = default;

  // Searches with a new finder; see Find_Internal.
  SENTROVA_API static std::string Find(const std::string& file_name,
                                       const std::string& start_directory);

  // Searches `directory` and all below it, except directories that this finder has entered before
  // under the same spelling of the path, for a file whose whole name is `file_name`, byte for byte.
  //
  // Returns the directory's path as it was reached, "/" and the name; a directory given with a "/"
  // at its end so yields a doubled one. Returns the empty string if nothing matches. A directory
  // that cannot be opened is logged as an error with the system's reason, and the search goes on
  // without it.
  SENTROVA_API std::string Find_Internal(const std::string& file_name,
                                         const std::string& directory);

  // The path of every directory entered, in that order, opened or not. To be read only.
  std::vector<std::string> searched_dirs;
};
