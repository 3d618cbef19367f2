#include "device/zunogatekeeper/credential_digest.h"

#include <openssl/crypto.h>
#include <openssl/evp.h>
#include <openssl/rand.h>

namespace sentrova {
namespace {

// OpenSSL counts two blocks and the p output blocks beside the table; at the largest r and p that
// is under this.
constexpr uint64_t kMaxScryptMemoryBytes = uint64_t{kMaxScryptTableBytes} + (uint64_t{1} << 20);

bool is_between(int64_t value, int64_t low, int64_t high) {
  return value >= low && value <= high;
}

}  // namespace

bool is_acceptable_cost(const ScryptCost& cost) {
  // Each number is bounded by itself first, so that the product cannot wrap.
  return is_between(cost.log2_n, 1, 20) && is_between(cost.r, 1, 32) && is_between(cost.p, 1, 4) &&
         (int64_t{128} * cost.r) << cost.log2_n <= kMaxScryptTableBytes;
}

std::optional<Digest> derive_digest(std::string_view password, const Salt& salt,
                                    const ScryptCost& cost) {
  std::optional<Digest> digest(std::in_place);  // returned as it lies, so that no copy stays
  if (password.find('\0') != std::string_view::npos || !is_acceptable_cost(cost) ||
      EVP_PBE_scrypt(password.data(), password.size(), salt.data(), salt.size(),
                     uint64_t{1} << cost.log2_n, static_cast<uint64_t>(cost.r),
                     static_cast<uint64_t>(cost.p), kMaxScryptMemoryBytes, digest->data(),
                     digest->size()) != 1) {
    OPENSSL_cleanse(digest->data(), digest->size());
    return std::nullopt;
  }
  return digest;
}

bool has_digest(std::string_view password, const Salt& salt, const ScryptCost& cost,
                const Digest& digest) {
  std::optional<Digest> derived = derive_digest(password, salt, cost);
  if (!derived) {
    return false;
  }
  const bool equal = CRYPTO_memcmp(derived->data(), digest.data(), digest.size()) == 0;
  OPENSSL_cleanse(derived->data(), derived->size());
  return equal;
}

std::optional<Salt> random_salt() {
  Salt salt = {};
  if (RAND_bytes(salt.data(), static_cast<int>(salt.size())) != 1) {
    return std::nullopt;
  }
  return salt;
}

}  // namespace sentrova
