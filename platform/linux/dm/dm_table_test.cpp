#include <gtest/gtest.h>
#include <libdm/dm.h>

#include <array>
#include <limits>

namespace {

using android::dm::DeviceMapper;
using android::dm::DmTable;
using android::dm::DmTargetCrypt;
using android::dm::DmTargetLinear;

const std::string kKey(128, 'a');

TEST(DmTarget, WritesTheKernelsParameters) {
  EXPECT_EQ(DmTargetLinear(0, 8, "/dev/block/a", 2048).GetParameterString(), "/dev/block/a 2048");
  DmTargetCrypt crypt(0, 8, "aes-xts-plain64", kKey, 7, "/dev/block/a", 16);
  const std::string start = "aes-xts-plain64 " + kKey + " 7 /dev/block/a 16";
  EXPECT_EQ(crypt.GetParameterString(), start);
  crypt.AllowDiscards();
  crypt.SetSectorSize(4096);
  EXPECT_EQ(crypt.GetParameterString(),
            start + " 3 allow_discards sector_size:4096 iv_large_sectors");
}

TEST(DmTable, IsValidOnlyWithoutGapsOverlapsAndSizesThatWrap) {
  constexpr uint64_t kMax = std::numeric_limits<uint64_t>::max();
  const std::array<uint64_t, 5> kCases[] = {{0, 100, 100, 8, 108},  // the sum of the lengths
                                            {1, 99, 100, 8, 0},
                                            {0, 100, 101, 8, 0},
                                            {0, 100, 99, 8, 0},
                                            {0, 100, 100, kMax - 99, 0}};
  for (const auto& [start, length, second_start, second_length, sectors] : kCases) {
    DmTable table;
    table.Emplace<DmTargetLinear>(start, length, "/dev/a", 0U);
    table.Emplace<DmTargetLinear>(second_start, second_length, "/dev/a", 0U);
    EXPECT_EQ(table.valid(), sectors != 0) << second_start << " " << second_length;
    EXPECT_EQ(table.num_sectors(), sectors);
  }
}

TEST(DmTable, ATargetThatWouldChangeTheParametersMeaningSpoilsIt) {
  const auto spoils = [](auto add) {
    DmTable table;
    const bool added = add(table);
    table.Emplace<DmTargetLinear>(0U, 8U, "/dev/a", 0U);
    return !added && !table.valid();
  };
  EXPECT_TRUE(spoils([](DmTable& t) { return t.Emplace<DmTargetLinear>(0U, 8U, "/dev/a 0", 0U); }));
  EXPECT_TRUE(spoils([](DmTable& t) { return t.Emplace<DmTargetLinear>(0U, 0U, "/dev/a", 0U); }));
  for (const char* const key : {"", "abc", "xy", ":64:user:name"}) {
    EXPECT_TRUE(spoils([key](DmTable& t) {
      return t.Emplace<DmTargetCrypt>(0U, 8U, "aes-xts-plain64", key, 0U, "/dev/a", 0U);
    })) << key;
  }
}

TEST(DeviceMapper, HasNothingToDeleteWithOrWithoutADriver) {
  EXPECT_TRUE(DeviceMapper::Instance().DeleteDeviceIfExists("no_such_device"));
}

}  // namespace
