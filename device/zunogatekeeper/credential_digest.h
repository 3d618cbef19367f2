#pragma once

#include <stddef.h>
#include <stdint.h>

#include <array>
#include <optional>
#include <string_view>

namespace sentrova {

// What one scrypt run (RFC 7914) costs: N = 2^log2_n, block size r, parallelism p.
struct ScryptCost {
  int64_t log2_n = 14;
  int64_t r = 8;
  int64_t p = 1;
};

inline constexpr size_t kSaltBytes = 32;
inline constexpr size_t kDigestBytes = 32;
using Salt = std::array<uint8_t, kSaltBytes>;
using Digest = std::array<uint8_t, kDigestBytes>;

// Largest table that a run may fill, 128 * r * N bytes: four times that of the default cost, and
// what a rescue environment can spare.
inline constexpr int64_t kMaxScryptTableBytes = int64_t{64} << 20;

// Tells whether a run of this cost is within bounds of memory and time, whatever the numbers.
bool is_acceptable_cost(const ScryptCost& cost);

// Returns the scrypt digest of the password, which may be empty, or nothing where the password
// holds a NUL, the cost is not acceptable or memory is short. scrypt itself would take "1234" and
// "1234" with NULs after it for one password (HMAC, RFC 2104, pads its key with zeros). The caller
// wipes the digest.
std::optional<Digest> derive_digest(std::string_view password, const Salt& salt,
                                    const ScryptCost& cost);

// Tells whether the password has this digest; false also where it cannot be derived. The time taken
// does not tell where two digests differ, and the derived one is wiped.
bool has_digest(std::string_view password, const Salt& salt, const ScryptCost& cost,
                const Digest& digest);

// Returns a random salt, or nothing where the random source fails.
std::optional<Salt> random_salt();

}  // namespace sentrova
