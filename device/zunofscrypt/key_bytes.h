#pragma once

#include <stddef.h>
#include <stdint.h>
#include <string.h>

#include <array>

namespace sentrova {

// Room for a key of `kSize` bytes, zeros at first. Wiped at the end of its life and when it is
// moved from.
template <size_t kSize>
class KeyBytes {
 public:
  KeyBytes() = default;
  ~KeyBytes() { wipe(); }
  KeyBytes(KeyBytes&& other) noexcept : bytes_(other.bytes_) { other.wipe(); }
  KeyBytes(const KeyBytes&) = delete;
  KeyBytes& operator=(const KeyBytes&) = delete;
  KeyBytes& operator=(KeyBytes&&) = delete;

  uint8_t* data() { return bytes_.data(); }
  const uint8_t* data() const { return bytes_.data(); }
  static constexpr size_t size() { return kSize; }

 private:
  void wipe() { explicit_bzero(bytes_.data(), kSize); }

  std::array<uint8_t, kSize> bytes_ = {};
};

// A key of the kernel's: for dm-crypt with AES-256-XTS, or an fscrypt master key of full length.
using MasterKey = KeyBytes<64>;
// A key that encrypts another one.
using WrappingKey = KeyBytes<32>;

}  // namespace sentrova
