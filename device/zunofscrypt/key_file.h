#pragma once

#include <stddef.h>

#include <optional>
#include <string>

#include "device/zunofscrypt/key_bytes.h"
#include "device/zunofscrypt/wrapped_key.h"

namespace sentrova {

// Reads the wrapped key in the file at `path`. Returns nothing, with the reason in `error`, unless
// it is a regular file of exactly that size that can be read.
std::optional<WrappedKey> read_key_file(const std::string& path, std::string& error);

// The same for a wrapping key that lies open, as the device's secret does.
std::optional<WrappingKey> read_secret_file(const std::string& path, std::string& error);

// Puts `size` bytes into the file at `path`, mode 0600, in place of any that is there; on disk on
// return. Parent folders must exist. False, with the reason in `error`, where that fails; the file
// is then as it was, unless only the syncing of the folder failed.
bool replace_file(const std::string& path, const void* bytes, size_t size, std::string& error);

}  // namespace sentrova
