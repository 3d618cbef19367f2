#pragma once

#include <stdint.h>

#include <optional>
#include <string>

#include "device/zunofscrypt/wrapped_key.h"

namespace sentrova {

// The end of a partition with full-disk encryption: it begins with the wrapped key and is zeros
// after it. The file system's device ends where it begins.
inline constexpr uint64_t kFooterBytes = 16384;

// Reads the wrapped key from the footer. Returns nothing, with the reason in `error`, where the
// device cannot be read; what was read is not looked at.
std::optional<WrappedKey> read_footer(const std::string& block_device, std::string& error);

// Writes the footer, through to the storage. False, with the reason in `error`, where that fails.
bool write_footer(const std::string& block_device, const WrappedKey& key, std::string& error);

// Makes the dm-crypt device `mapping` over the partition with the key in its footer, which is
// wrapped under the absent credential. Succeeds at once where there is such a device. Returns
// false, with the reason in `error`, where it stays unmade.
bool unlock_full_disk(const std::string& mapping, const std::string& block_device,
                      std::string& error);

}  // namespace sentrova
