#pragma once

#include <dirent.h>
#include <stdio.h>

#include <memory>

namespace sentrova {

// Directories and text streams that close themselves.

struct DirectoryCloser {
  void operator()(DIR* directory) const { closedir(directory); }
};
using Directory = std::unique_ptr<DIR, DirectoryCloser>;

struct FileCloser {
  void operator()(FILE* file) const { fclose(file); }
};
using File = std::unique_ptr<FILE, FileCloser>;

}  // namespace sentrova
