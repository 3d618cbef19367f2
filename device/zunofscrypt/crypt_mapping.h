#pragma once

#include <stdint.h>

#include <optional>
#include <string>

#include "device/zunofscrypt/key_bytes.h"

namespace sentrova {

// The dm-crypt device through which an encrypted partition is read (AES-256-XTS over units of 4096
// bytes). Every function returns nothing, or false, with the reason in `error` on failure.

// The node of the device of that name if it works; an empty path if there is none, or one that a
// program left half made.
std::optional<std::string> find_mapping(const std::string& name, std::string& error);

// Makes it over the partition `block_device`, but for the last `reserved_bytes` of it, and returns
// its node once that is there. Replaces a half-made device; fails if there is one that works. The
// key is not checked: under a wrong one the device reads as noise.
std::optional<std::string> make_mapping(const std::string& name, const std::string& block_device,
                                        uint64_t reserved_bytes, const MasterKey& key,
                                        std::string& error);

// Removes it if it is there. False while it is mounted or open.
bool remove_mapping(const std::string& name, std::string& error);

// The size of a block device; nothing also where it is none.
std::optional<uint64_t> block_device_bytes(const std::string& path, std::string& error);

}  // namespace sentrova
