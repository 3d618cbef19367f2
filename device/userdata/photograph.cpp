#include "device/userdata/photograph.h"

#include <android-base/stringprintf.h>
#include <openssl/evp.h>
#include <stdint.h>

#include <algorithm>
#include <array>

namespace sentrova {
namespace {

constexpr uint32_t kWidthPixels = 400;
constexpr uint32_t kHeightPixels = 256;
// What one block of uncompressed data can hold (RFC 1951).
constexpr size_t kMaxStoredBytes = 65535;

std::string big_endian(uint32_t value) {
  std::string bytes;
  for (int shift = 24; shift >= 0; shift -= 8) {
    bytes.push_back(static_cast<char>(value >> shift));
  }
  return bytes;
}

std::string little_endian_16(size_t value) {
  return {static_cast<char>(value), static_cast<char>(value >> 8)};
}

// CRC-32 as PNG has it, bit by bit.
uint32_t crc32(const std::string& bytes) {
  uint32_t crc = 0xffffffff;
  for (const char byte : bytes) {
    crc ^= static_cast<uint8_t>(byte);
    for (int bit = 0; bit < 8; ++bit) {
      crc = (crc >> 1) ^ ((crc & 1) != 0 ? 0xedb88320 : 0);
    }
  }
  return ~crc;
}

// Adler-32 (RFC 1950).
uint32_t adler32(const std::string& bytes) {
  constexpr uint32_t kPrime = 65521;
  uint32_t low = 1;
  uint32_t high = 0;
  for (const char byte : bytes) {
    low = (low + static_cast<uint8_t>(byte)) % kPrime;
    high = (high + low) % kPrime;
  }
  return high << 16 | low;
}

std::string chunk(const std::string& type, const std::string& data) {
  return big_endian(static_cast<uint32_t>(data.size())) + type + data +
         big_endian(crc32(type + data));
}

// A zlib stream (RFC 1950) of blocks that are stored as they are.
std::string zlib_stream(const std::string& bytes) {
  std::string stream = "\x78\x01";
  for (size_t begin = 0; begin < bytes.size(); begin += kMaxStoredBytes) {
    const size_t length = std::min(kMaxStoredBytes, bytes.size() - begin);
    stream.push_back(begin + length == bytes.size() ? 1 : 0);
    stream += little_endian_16(length) + little_endian_16(~length) + bytes.substr(begin, length);
  }
  return stream + big_endian(adler32(bytes));
}

// Sky above water, with grain (a linear congruential generator) so that no two rows are alike.
std::string pixels() {
  std::string rows;
  uint32_t grain = 1;
  for (uint32_t y = 0; y < kHeightPixels; ++y) {
    rows.push_back(0);  // no filter
    const uint32_t light = y < kHeightPixels / 2 ? 200 - y / 2 : y / 2;
    for (uint32_t x = 0; x < kWidthPixels; ++x) {
      grain = grain * 1664525 + 1013904223;
      const auto value = static_cast<char>(light + (grain >> 29));
      rows += {static_cast<char>(light / 2), value, static_cast<char>(value + 40)};
    }
  }
  return rows;
}

}  // namespace

std::string make_photograph() {
  const std::string header = big_endian(kWidthPixels) + big_endian(kHeightPixels) +
                             std::string("\x08\x02\x00\x00\x00", 5);  // 8 bits each of RGB
  return "\x89PNG\r\n\x1a\n" + chunk("IHDR", header) +
         chunk("tEXt", std::string("Comment") + '\0' + kPhotographComment) +
         chunk("IDAT", zlib_stream(pixels())) + chunk("IEND", "");
}

std::string sha256_text(const std::string& bytes) {
  std::array<uint8_t, 32> digest = {};
  if (EVP_Digest(bytes.data(), bytes.size(), digest.data(), nullptr, EVP_sha256(), nullptr) != 1) {
    return "";
  }
  std::string text;
  for (const uint8_t byte : digest) {
    android::base::StringAppendF(&text, "%02x", byte);
  }
  return text;
}

}  // namespace sentrova
