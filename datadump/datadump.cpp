#include "datadump/datadump.h"

#include <android/log.h>
#include <endian.h>
#include <errno.h>
#include <stdio.h>
#include <string.h>

#include <array>

#include "common/streams.h"

using sentrova::File;

namespace {

constexpr char kPartition[] = "/dev/block/by-name/reserved";
constexpr long kRecordOffset = 300;
constexpr uint32_t kFirstMagic = 0x00E215E2;
constexpr uint32_t kSecondMagic = 0x006B6B6B;

using RecordBytes = std::array<unsigned char, 16>;

struct Record {
  uint32_t first_magic = 0;
  uint32_t second_magic = 0;
  uint64_t dump_offset = 0;

  bool is_armed() const { return first_magic == kFirstMagic && second_magic == kSecondMagic; }
};

// Returns the partition at the record, or null after a message. The stream has no buffer: a
// transfer counts what reached the partition, of which nothing but the record is touched.
File open_at_record(const char* mode) {
  File stream(fopen(kPartition, mode));
  if (stream == nullptr) {
    __android_log_print(ANDROID_LOG_ERROR, nullptr, "Open %s fail:%s.\n", kPartition,
                        strerror(errno));
    return stream;
  }
  setvbuf(stream.get(), nullptr, _IONBF, 0);
  fseek(stream.get(), kRecordOffset, SEEK_SET);
  return stream;
}

int read_flag_from_part(RecordBytes& buffer) {
  const File stream = open_at_record("rbe");
  if (stream == nullptr) {
    return -1;
  }
  if (fread(buffer.data(), 1, buffer.size(), stream.get()) != buffer.size()) {
    __android_log_print(ANDROID_LOG_ERROR, nullptr, "read %s fail:%s.\n", kPartition,
                        strerror(errno));
    return -1;
  }
  return 0;
}

int write_flag_to_part(const RecordBytes& buffer) {
  const File stream = open_at_record("wbe");
  if (stream == nullptr) {
    return -1;
  }
  if (fwrite(buffer.data(), 1, buffer.size(), stream.get()) != buffer.size()) {
    __android_log_print(ANDROID_LOG_ERROR, nullptr, "write %s fail:%s.\n", kPartition,
                        strerror(errno));
    return -1;
  }
  return 0;
}

Record decode(const RecordBytes& buffer) {
  Record record;
  memcpy(&record.first_magic, buffer.data(), 4);
  memcpy(&record.second_magic, buffer.data() + 4, 4);
  memcpy(&record.dump_offset, buffer.data() + 8, 8);
  return {le32toh(record.first_magic), le32toh(record.second_magic), le64toh(record.dump_offset)};
}

RecordBytes encode(const Record& record) {
  const uint32_t first_magic = htole32(record.first_magic);
  const uint32_t second_magic = htole32(record.second_magic);
  const uint64_t dump_offset = htole64(record.dump_offset);
  RecordBytes buffer = {};
  memcpy(buffer.data(), &first_magic, 4);
  memcpy(buffer.data() + 4, &second_magic, 4);
  memcpy(buffer.data() + 8, &dump_offset, 8);
  return buffer;
}

int read_record(Record& record) {
  RecordBytes buffer = {};
  if (read_flag_from_part(buffer) < 0) {
    return -1;
  }
  record = decode(buffer);
  return 0;
}

}  // namespace

int datadump_enable() {
  // Only proves that the partition can be reached.
  Record ignored;
  if (read_record(ignored) < 0) {
    return -1;
  }
  return write_flag_to_part(encode({kFirstMagic, kSecondMagic, 0}));
}

int datadump_disable() {
  return write_flag_to_part({});
}

int datadump_resize(uint64_t dump_offset) {
  Record record;
  if (read_record(record) < 0 || !record.is_armed()) {
    return -1;
  }
  record.dump_offset = dump_offset;
  return write_flag_to_part(encode(record));
}

int datadump_get_status() {
  Record record;
  if (read_record(record) < 0) {
    return -1;
  }
  if (!record.is_armed()) {
    return 0;
  }
  return record.dump_offset == 0 ? 1 : 2;
}

int datadump_query_flags(uint32_t* first_magic, uint32_t* second_magic, uint64_t* dump_offset) {
  Record record;
  if (read_record(record) < 0) {
    return -1;
  }
  *first_magic = record.first_magic;
  *second_magic = record.second_magic;
  *dump_offset = record.dump_offset;
  return 0;
}
