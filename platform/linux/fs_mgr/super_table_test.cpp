#include "platform/linux/fs_mgr/super_table.h"

#include <endian.h>
#include <gtest/gtest.h>
#include <openssl/sha.h>
#include <string.h>

namespace sentrova::fs_mgr {
namespace {

constexpr uint64_t kSectors = 4096;
constexpr size_t kCountAt = 12;
constexpr size_t kChecksumAt = 16;
constexpr size_t kEntryAt = 64;
constexpr size_t kNameBytes = 48;

std::vector<LogicalPartition> two_slices() {
  return {{"oem_a", 2048, 1024}, {"oem_b", 3072, 1024}};
}

using Bytes = std::string&;

template <typename Number>
void put(std::string& bytes, size_t offset, Number little_endian) {
  memcpy(bytes.data() + offset, &little_endian, sizeof(little_endian));
}

void sign(std::string& bytes) {
  bytes.replace(kChecksumAt, SHA256_DIGEST_LENGTH, SHA256_DIGEST_LENGTH, '\0');
  unsigned char checksum[SHA256_DIGEST_LENGTH];
  SHA256(reinterpret_cast<const unsigned char*>(bytes.data()), bytes.size(), checksum);
  memcpy(bytes.data() + kChecksumAt, checksum, sizeof(checksum));
}

void set_first(std::string& bytes, uint64_t start, uint64_t sectors) {
  put(bytes, kEntryAt + kNameBytes, htole64(start));
  put(bytes, kEntryAt + kNameBytes + 8, htole64(sectors));
}

TEST(SuperTable, HoldsWhatWasWrittenAtTheDocumentedPlaces) {
  const std::string bytes = encode_super_table(two_slices());
  ASSERT_EQ(bytes.size(), kSuperTableBytes);
  EXPECT_EQ(bytes.substr(0, 16), std::string("SNTRSUPR\1\0\0\0\2\0\0\0", 16));
  EXPECT_EQ(bytes.substr(kEntryAt, 6), std::string("oem_a\0", 6));
  EXPECT_EQ(bytes.substr(kEntryAt + kNameBytes, 16),
            std::string("\0\x08\0\0\0\0\0\0\0\x04\0\0\0\0\0\0", 16));
  std::vector<LogicalPartition> slices;
  ASSERT_EQ(decode_super_table(bytes, kSectors, slices), "") << "the last one ends with the device";
  ASSERT_EQ(slices.size(), 2U);
  EXPECT_EQ(slices[1].name, "oem_b");
  EXPECT_EQ(slices[1].start_sector, 3072U);
  EXPECT_EQ(slices[1].sectors, 1024U);
}

// One defect each. Those that the checksum would hide are signed anew.
const struct {
  const char* problem;
  bool signed_anew;
  void (*damage)(Bytes);
} kDamages[] = {
    {"it is cut short", false, [](Bytes b) { b.pop_back(); }},
    {"there is no table", false, [](Bytes b) { b.assign(kSuperTableBytes, '\0'); }},
    {"its checksum is wrong", false, [](Bytes b) { b.back() = 1; }},
    {"its version 2 is not known", true, [](Bytes b) { b[8] = 2; }},
    {"it counts 4294967295 partitions", true, [](Bytes b) { put(b, kCountAt, UINT32_MAX); }},
    {"a partition has no usable name", true, [](Bytes b) { b[kCountAt] = 3; }},
    {"a partition has no usable name", true,
     [](Bytes b) { b.replace(kEntryAt, kNameBytes, kNameBytes, 'x'); }},
    {"a partition has no usable name", true, [](Bytes b) { b[kEntryAt] = '/'; }},
    {"two partitions are called oem_b", true, [](Bytes b) { b[kEntryAt + 4] = 'b'; }},
    {"partition oem_a is empty", true, [](Bytes b) { set_first(b, 2048, 0); }},
    {"partition oem_a lies over the table", true, [](Bytes b) { set_first(b, 15, 8); }},
    {"partition oem_a ends beyond the device", true, [](Bytes b) { set_first(b, kSectors, 1); }},
    {"partition oem_a ends beyond the device", true,
     [](Bytes b) { set_first(b, 2048, UINT64_MAX - 1024); }},
    {"partitions oem_a and oem_b overlap", true, [](Bytes b) { set_first(b, 2048, 1025); }},
    {"partitions oem_a and oem_b overlap", true, [](Bytes b) { set_first(b, 4095, 1); }},
};

TEST(SuperTable, IsRefusedForEachDefect) {
  for (const auto& [problem, signed_anew, damage] : kDamages) {
    std::string bytes = encode_super_table(two_slices());
    damage(bytes);
    if (signed_anew) {
      sign(bytes);
    }
    std::vector<LogicalPartition> slices = {{"before", 16, 1}};
    EXPECT_EQ(decode_super_table(bytes, kSectors, slices), problem);
    EXPECT_EQ(slices.size(), 1U) << problem;
  }
}

}  // namespace
}  // namespace sentrova::fs_mgr
