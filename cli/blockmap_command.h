#pragma once

#include "cli/output.h"

namespace CLI {
class App;
}

namespace sentrova {

// Adds `sentrova blockmap`, which writes the block map of a file, or reads a file through its map
// and prints its size and digest. When the command is given, `status` becomes the exit status: 0,
// or 2 if the file or the map cannot be used, or 4 if the map cannot be written or the device does
// not give its data. Both objects must outlive the parsing.
void add_blockmap_command(CLI::App& app, const Output& output, int& status);

}  // namespace sentrova
