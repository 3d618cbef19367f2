#pragma once

#include <linux/fscrypt.h>
#include <stdint.h>

#include <array>
#include <optional>
#include <string>

#include "device/zunofscrypt/key_bytes.h"

// The kernel's file-based encryption (Documentation/filesystems/fscrypt.rst), version 2. A folder's
// policy names the key of all that is below it; the kernel makes that name, the identifier, from
// the key itself. Every function returns nothing, or false, with the reason in `error` on failure.

namespace sentrova {

using KeyIdentifier = std::array<uint8_t, FSCRYPT_KEY_IDENTIFIER_SIZE>;

// The identifier in a folder's policy.
std::optional<KeyIdentifier> read_policy(const std::string& folder, std::string& error);

// Gives an empty folder the policy of the key with this identifier: contents AES-256-XTS, names
// AES-256-CTS. The key must have been added.
bool set_policy(const std::string& folder, const KeyIdentifier& identifier, std::string& error);

// Gives the key to the file system that is mounted at `mount_point`. The kernel takes any key: it
// is for the caller to compare the identifier, which is returned, with the one that is wanted.
// Adding a key that is there already changes nothing.
std::optional<KeyIdentifier> add_key(const std::string& mount_point, const MasterKey& key,
                                     std::string& error);

// Whether the key with this identifier is there, and not about to go.
std::optional<bool> has_key(const std::string& mount_point, const KeyIdentifier& identifier,
                            std::string& error);

// Takes the key away; true also where it is not there. False also where files under it are still
// open, which then stay readable until they are closed; the key goes with the last of them when
// this is called again.
bool remove_key(const std::string& mount_point, const KeyIdentifier& identifier,
                std::string& error);

}  // namespace sentrova
