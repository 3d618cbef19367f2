#pragma once

#include <stddef.h>
#include <stdint.h>

#include <array>
#include <optional>
#include <string>
#include <string_view>

#include "device/zunofscrypt/key_bytes.h"
#include "device/zunogatekeeper/credential_digest.h"

namespace sentrova {

// A master key as it lies on storage, encrypted with AES-256-GCM under a wrapping key. All fields
// are bytes, in this order:
//
//   magic "zkey" (4), version 1 (1), scrypt's log2 N, r and p (1 each; 0 without a secret),
//   salt (32), nonce (12), tag (16), encrypted key (64)
//
// What stands before the nonce, and the purpose of the key, are authenticated as well: a key put in
// another one's place does not open.
inline constexpr size_t kWrappedKeyBytes = 132;
using WrappedKey = std::array<uint8_t, kWrappedKeyBytes>;

// The secret of a user who has no credential.
inline constexpr char kAbsentCredential[] = "~";

// Wraps under the secret that belongs to the device. Returns nothing where the random source fails
// or memory is short.
std::optional<WrappedKey> wrap_with_device_secret(const MasterKey& key, const WrappingKey& secret,
                                                  std::string_view purpose);

// Wraps under what scrypt makes of a secret that a person knows, with a fresh salt. Nothing also
// where the secret holds a NUL or the cost is not acceptable.
std::optional<WrappedKey> wrap_with_credential(const MasterKey& key, std::string_view secret,
                                               std::string_view purpose,
                                               const ScryptCost& cost = {});

// Unwraps. Returns nothing, with the reason in `error`, where the bytes are no wrapped key, were
// changed, were wrapped for another purpose, or the secret is not the right one; the last three
// look alike.
std::optional<MasterKey> unwrap_with_device_secret(const WrappedKey& wrapped,
                                                   const WrappingKey& secret,
                                                   std::string_view purpose, std::string& error);
std::optional<MasterKey> unwrap_with_credential(const WrappedKey& wrapped, std::string_view secret,
                                                std::string_view purpose, std::string& error);

// Fills the `size` bytes at random. False where the random source fails.
bool fill_randomly(uint8_t* bytes, size_t size);

}  // namespace sentrova
