#include "platform/linux/fs_mgr/super_table.h"

#include <endian.h>
#include <openssl/sha.h>
#include <string.h>

#include <algorithm>

namespace sentrova::fs_mgr {

namespace {

constexpr char kMagic[] = {'S', 'N', 'T', 'R', 'S', 'U', 'P', 'R'};
constexpr uint32_t kVersion = 1;
constexpr size_t kEntries = 63;
constexpr size_t kNameBytes = 48;

struct Entry {
  char name[kNameBytes];
  uint64_t start_sector;
  uint64_t sectors;
};

struct Table {
  char magic[sizeof(kMagic)];
  uint32_t version;
  uint32_t count;
  unsigned char checksum[SHA256_DIGEST_LENGTH];
  char unused[16];
  Entry entries[kEntries];
};
static_assert(sizeof(Entry) == 64 && offsetof(Table, entries) == 64);
static_assert(sizeof(Table) == kSuperTableBytes);

void fill_checksum(Table& table) {
  memset(table.checksum, 0, sizeof(table.checksum));
  unsigned char checksum[SHA256_DIGEST_LENGTH];
  SHA256(reinterpret_cast<const unsigned char*>(&table), sizeof(table), checksum);
  memcpy(table.checksum, checksum, sizeof(checksum));
}

bool has_right_checksum(const Table& table) {
  Table expected = table;
  fill_checksum(expected);
  return memcmp(expected.checksum, table.checksum, sizeof(table.checksum)) == 0;
}

std::string check_head(const Table& table) {
  if (memcmp(table.magic, kMagic, sizeof(kMagic)) != 0) {
    return "there is no table";
  }
  if (!has_right_checksum(table)) {
    return "its checksum is wrong";
  }
  if (le32toh(table.version) != kVersion) {
    return "its version " + std::to_string(le32toh(table.version)) + " is not known";
  }
  if (le32toh(table.count) > kEntries) {
    return "it counts " + std::to_string(le32toh(table.count)) + " partitions";
  }
  return "";
}

bool is_name(std::string_view name) {
  constexpr std::string_view kCharacters =
      "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789._-";
  return !name.empty() && name.size() < kNameBytes &&
         name.find_first_not_of(kCharacters) == std::string_view::npos;
}

std::string check_slice(const LogicalPartition& slice, uint64_t super_sectors) {
  if (!is_name(slice.name)) {
    return "a partition has no usable name";
  }
  if (slice.sectors == 0) {
    return "partition " + slice.name + " is empty";
  }
  if (slice.start_sector < kFirstDataSector) {
    return "partition " + slice.name + " lies over the table";
  }
  if (slice.start_sector > super_sectors || slice.sectors > super_sectors - slice.start_sector) {
    return "partition " + slice.name + " ends beyond the device";
  }
  return "";
}

std::string check_apart(const LogicalPartition& first, const LogicalPartition& second) {
  if (first.name == second.name) {
    return "two partitions are called " + first.name;
  }
  const LogicalPartition& low = first.start_sector <= second.start_sector ? first : second;
  const LogicalPartition& high = &low == &first ? second : first;
  // Both end within the device: the sum does not wrap.
  return high.start_sector < low.start_sector + low.sectors
             ? "partitions " + first.name + " and " + second.name + " overlap"
             : "";
}

LogicalPartition read_entry(const Entry& entry) {
  return {std::string(entry.name, strnlen(entry.name, kNameBytes)), le64toh(entry.start_sector),
          le64toh(entry.sectors)};
}

}  // namespace

std::string check_slices(const std::vector<LogicalPartition>& slices, uint64_t super_sectors) {
  if (slices.size() > kEntries) {
    return "there are more than " + std::to_string(kEntries) + " partitions";
  }
  for (auto slice = slices.begin(); slice != slices.end(); ++slice) {
    std::string problem = check_slice(*slice, super_sectors);
    for (auto other = slices.begin(); problem.empty() && other != slice; ++other) {
      problem = check_apart(*other, *slice);
    }
    if (!problem.empty()) {
      return problem;
    }
  }
  return "";
}

std::string encode_super_table(const std::vector<LogicalPartition>& slices) {
  Table table = {};
  memcpy(table.magic, kMagic, sizeof(kMagic));
  table.version = htole32(kVersion);
  table.count = htole32(static_cast<uint32_t>(slices.size()));
  for (size_t i = 0; i < slices.size(); ++i) {
    slices[i].name.copy(table.entries[i].name, kNameBytes);
    table.entries[i].start_sector = htole64(slices[i].start_sector);
    table.entries[i].sectors = htole64(slices[i].sectors);
  }
  fill_checksum(table);
  return {reinterpret_cast<const char*>(&table), sizeof(table)};
}

std::string decode_super_table(std::string_view bytes, uint64_t super_sectors,
                               std::vector<LogicalPartition>& slices) {
  Table table;
  if (bytes.size() != sizeof(table)) {
    return "it is cut short";
  }
  memcpy(&table, bytes.data(), sizeof(table));
  std::string problem = check_head(table);
  if (!problem.empty()) {
    return problem;
  }
  std::vector<LogicalPartition> found(le32toh(table.count));
  std::transform(table.entries, table.entries + found.size(), found.begin(), read_entry);
  problem = check_slices(found, super_sectors);
  if (problem.empty()) {
    slices = std::move(found);
  }
  return problem;
}

}  // namespace sentrova::fs_mgr
