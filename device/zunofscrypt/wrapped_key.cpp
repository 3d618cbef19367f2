#include "device/zunofscrypt/wrapped_key.h"

#include <openssl/crypto.h>
#include <openssl/evp.h>
#include <openssl/rand.h>
#include <string.h>

#include <algorithm>
#include <bit>
#include <memory>

namespace sentrova {
namespace {

constexpr std::array<uint8_t, 4> kMagic = {'z', 'k', 'e', 'y'};
constexpr uint8_t kVersion = 1;

struct Fields {
  std::array<uint8_t, 4> magic = kMagic;
  uint8_t version = kVersion;
  uint8_t log2_n = 0;
  uint8_t r = 0;
  uint8_t p = 0;
  Salt salt = {};
  std::array<uint8_t, 12> nonce = {};
  std::array<uint8_t, 16> tag = {};
  std::array<uint8_t, MasterKey::size()> key = {};
};
static_assert(sizeof(Fields) == kWrappedKeyBytes && alignof(Fields) == 1);

struct CipherFree {
  void operator()(EVP_CIPHER_CTX* context) const { EVP_CIPHER_CTX_free(context); }
};
using Cipher = std::unique_ptr<EVP_CIPHER_CTX, CipherFree>;

// A cipher that has been given the key, the nonce and what is authenticated without being
// encrypted; null on failure. EVP_CipherUpdate goes the way that `encrypt` says.
Cipher begin(const Fields& fields, const WrappingKey& key, std::string_view purpose, bool encrypt) {
  Cipher cipher(EVP_CIPHER_CTX_new());
  int length = 0;
  const auto* const header = reinterpret_cast<const uint8_t*>(&fields);
  const auto* const purpose_bytes = reinterpret_cast<const uint8_t*>(purpose.data());
  const bool begun =
      cipher != nullptr &&
      EVP_CipherInit_ex(cipher.get(), EVP_aes_256_gcm(), nullptr, key.data(), fields.nonce.data(),
                        encrypt ? 1 : 0) == 1 &&
      EVP_CipherUpdate(cipher.get(), nullptr, &length, header, offsetof(Fields, nonce)) == 1 &&
      EVP_CipherUpdate(cipher.get(), nullptr, &length, purpose_bytes,
                       static_cast<int>(purpose.size())) == 1;
  return begun ? std::move(cipher) : nullptr;
}

std::optional<WrappedKey> seal(Fields& fields, const MasterKey& key, const WrappingKey& wrapping,
                               std::string_view purpose) {
  if (!fill_randomly(fields.nonce.data(), fields.nonce.size())) {
    return std::nullopt;
  }
  const Cipher cipher = begin(fields, wrapping, purpose, true);
  int length = 0;
  if (!cipher ||
      EVP_CipherUpdate(cipher.get(), fields.key.data(), &length, key.data(), MasterKey::size()) !=
          1 ||
      EVP_CipherFinal_ex(cipher.get(), fields.key.data(), &length) != 1 ||
      EVP_CIPHER_CTX_ctrl(cipher.get(), EVP_CTRL_GCM_GET_TAG, static_cast<int>(fields.tag.size()),
                          fields.tag.data()) != 1) {
    return std::nullopt;
  }
  return std::bit_cast<WrappedKey>(fields);
}

std::optional<MasterKey> open(Fields& fields, const WrappingKey& wrapping, std::string_view purpose,
                              std::string& error) {
  std::optional<MasterKey> key(std::in_place);
  const Cipher cipher = begin(fields, wrapping, purpose, false);
  int length = 0;
  if (!cipher ||
      EVP_CIPHER_CTX_ctrl(cipher.get(), EVP_CTRL_GCM_SET_TAG, static_cast<int>(fields.tag.size()),
                          fields.tag.data()) != 1 ||
      EVP_CipherUpdate(cipher.get(), key->data(), &length, fields.key.data(), MasterKey::size()) !=
          1 ||
      EVP_CipherFinal_ex(cipher.get(), key->data(), &length) != 1) {
    error = "the secret is wrong or the key is damaged";
    return std::nullopt;
  }
  return key;
}

std::optional<Fields> parse(const WrappedKey& wrapped, std::string& error) {
  const auto fields = std::bit_cast<Fields>(wrapped);
  if (fields.magic != kMagic || fields.version != kVersion) {
    error = "not a wrapped key of version " + std::to_string(kVersion);
    return std::nullopt;
  }
  return fields;
}

std::optional<WrappingKey> stretch(std::string_view secret, const Salt& salt,
                                   const ScryptCost& cost) {
  std::optional<Digest> digest = derive_digest(secret, salt, cost);
  if (!digest) {
    return std::nullopt;
  }
  std::optional<WrappingKey> key(std::in_place);
  static_assert(kDigestBytes == WrappingKey::size());
  std::copy(digest->begin(), digest->end(), key->data());
  OPENSSL_cleanse(digest->data(), digest->size());
  return key;
}

}  // namespace

std::optional<WrappedKey> wrap_with_device_secret(const MasterKey& key, const WrappingKey& secret,
                                                  std::string_view purpose) {
  Fields fields;
  return seal(fields, key, secret, purpose);
}

std::optional<WrappedKey> wrap_with_credential(const MasterKey& key, std::string_view secret,
                                               std::string_view purpose, const ScryptCost& cost) {
  Fields fields;
  const std::optional<Salt> salt = random_salt();
  const std::optional<WrappingKey> wrapping = salt ? stretch(secret, *salt, cost) : std::nullopt;
  if (!wrapping) {
    return std::nullopt;
  }
  fields.log2_n = static_cast<uint8_t>(cost.log2_n);
  fields.r = static_cast<uint8_t>(cost.r);
  fields.p = static_cast<uint8_t>(cost.p);
  fields.salt = *salt;
  return seal(fields, key, *wrapping, purpose);
}

std::optional<MasterKey> unwrap_with_device_secret(const WrappedKey& wrapped,
                                                   const WrappingKey& secret,
                                                   std::string_view purpose, std::string& error) {
  std::optional<Fields> fields = parse(wrapped, error);
  return fields ? open(*fields, secret, purpose, error) : std::nullopt;
}

std::optional<MasterKey> unwrap_with_credential(const WrappedKey& wrapped, std::string_view secret,
                                                std::string_view purpose, std::string& error) {
  std::optional<Fields> fields = parse(wrapped, error);
  if (!fields) {
    return std::nullopt;
  }
  const std::optional<WrappingKey> wrapping =
      stretch(secret, fields->salt, {fields->log2_n, fields->r, fields->p});
  if (!wrapping) {
    error = "no wrapping key can be made of this secret and this cost";
    return std::nullopt;
  }
  return open(*fields, *wrapping, purpose, error);
}

bool fill_randomly(uint8_t* bytes, size_t size) {
  return RAND_bytes(bytes, static_cast<int>(size)) == 1;
}

}  // namespace sentrova
