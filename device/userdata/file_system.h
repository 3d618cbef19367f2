#pragma once

#include <string>

namespace sentrova {

// Makes an empty file system of type "f2fs" or "ext4", able to encrypt files, on a block device.
// False, with the reason in `error`, where the tool fails.
bool make_file_system(const std::string& type, const std::string& block_device, std::string& error);

}  // namespace sentrova
