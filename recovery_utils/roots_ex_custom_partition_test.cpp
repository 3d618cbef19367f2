#include <errno.h>
#include <string.h>
#include <sys/mount.h>

#include <tuple>

#include "recovery_utils/roots_ex.h"
#include "recovery_utils/roots_mount_test.h"

namespace {

using android::dm::DmDeviceState;
using android::fs_mgr::Fstab;
using android::fs_mgr::FstabEntry;
using sentrova::testing::fstab_row;
using sentrova::testing::KernelScript;
using CustomPartition = sentrova::testing::MountTest;

constexpr char kDevice[] = "/dev/block/by-name/oem";
const std::string kMounted = "[ROOTS]I: Success to mount /oem at ";

FstabEntry oem_row(const std::string& device, const std::string& mount_point = "/oem") {
  FstabEntry row = fstab_row(device, mount_point, "erofs");
  row.flags = MS_RDONLY | MS_NOATIME;
  row.fs_options = "barrier=1";
  return row;
}

FstabEntry logical_row() {
  FstabEntry row = oem_row("oem");
  row.fs_mgr_flags.logical = true;
  return row;
}

std::string mount_call(const std::string& device, const std::string& mount_point = "/oem") {
  return "mount(2) " + device + " on " + mount_point + " as erofs, " +
         std::to_string(MS_RDONLY | MS_NOATIME) + ", barrier=1";
}

TEST_F(CustomPartition, IsMountedFromItsDeviceForWhichItWaitsFourSeconds) {
  set_table({oem_row(kDevice)});
  for (const auto& [comes_after, error] :
       {std::pair(size_t{2}, 0), {size_t{40}, EBUSY}, {size_t{1}, EIO}, {size_t{0}, ENOENT}}) {
    clear_machine();
    take_calls();
    KernelScript kernel;
    kernel.mount_error = [error = error](const auto&, const auto&) { return error; };
    kernel.on_sleep = [comes_after = comes_after](size_t count) {
      if (count == comes_after) {
        make_file(kDevice);
      }
    };
    const std::string outcome = error == 0 || error == EBUSY
                                    ? kMounted + kDevice
                                    : std::string("[ROOTS]E: Fail to mount /oem at ") + kDevice +
                                          " (" + strerror(error) + ")";
    EXPECT_EQ(messages_of([] { MountCustomPartition("oem"); }),
              std::string("[ROOTS]I: oem partition block device is ready:") +
                  (comes_after > 0 ? "1" : "0") + "\n[ROOTS]I: partition oem block device " +
                  kDevice + "\n" + outcome + "\n");
    Calls expected(comes_after > 0 ? comes_after : 40, "sleep 100000");
    expected.push_back(mount_call(kDevice));
    EXPECT_EQ(take_calls(), expected);
  }
}

// The node is that of the mapping that is there or made; "": there is none.
const struct {
  const char* suffix;
  DmDeviceState state;
  const char* node;
  const char* mapper_call;
  const char* device;
} kMappings[] = {
    {"_a", DmDeviceState::ACTIVE, "/dev/dm-3", "dm path oem_a", "/dev/dm-3"},
    {"_a", DmDeviceState::ACTIVE, "", "dm path oem_a", "oem"},
    {"_a", DmDeviceState::SUSPENDED, "/dev/dm-3", nullptr, "oem"},
    {"_a", DmDeviceState::INVALID, "/dev/dm-4",
     "create oem_a from /dev/block/by-name/super, table 0, writable, 1000 ms", "/dev/dm-4"},
    {"_b", DmDeviceState::INVALID, "",
     "create oem_b from /dev/block/by-name/super, table 1, writable, 1000 ms", "oem"},
    {"", DmDeviceState::INVALID, "/dev/dm-4",
     "create oem from /dev/block/by-name/super, table 0, writable, 1000 ms", "/dev/dm-4"},
};

TEST_F(CustomPartition, InSuperIsMountedFromItsMapping) {
  set_table({logical_row()});
  const KernelScript kernel;
  for (const auto& c : kMappings) {
    take_calls();
    platform_.slot_suffix = c.suffix;
    platform_.create_logical = [&](const auto&) { return c.node; };
    device_mapper_.state = [&](const auto&) { return c.state; };
    device_mapper_.node = [&](const auto&) { return c.node; };
    const std::string device = c.device;
    EXPECT_EQ(messages_of([] { MountCustomPartition("oem"); }),
              "[ROOTS]I: partition oem block device " + device + "\n" + kMounted + device + "\n");
    Calls expected = {std::string("dm state oem") + c.suffix};
    if (c.state == DmDeviceState::INVALID) {
      expected.push_back("super partition of slot -1");
    }
    if (c.mapper_call != nullptr) {
      expected.push_back(c.mapper_call);
    }
    expected.push_back(mount_call(device));
    EXPECT_EQ(take_calls(), expected);
  }
}

TEST_F(CustomPartition, BelowVendorIsMountedButNeverUnmounted) {
  const KernelScript kernel;
  const FstabEntry below_vendor = oem_row(kDevice, "/vendor/oem");
  for (const auto& [table, name, mount_point] :
       {std::tuple(Fstab{below_vendor}, "oem", "/vendor/oem"),
        {Fstab{below_vendor, oem_row(kDevice)}, "oem", "/oem"},
        {Fstab{fstab_row(kDevice, "/")}, "oem", ""},
        {Fstab{oem_row(kDevice, "/")}, "", ""}}) {
    make_file(kDevice);
    set_table(table);
    take_calls();
    const std::string found = mount_point;
    messages_of([name = name] { MountCustomPartition(name); });
    EXPECT_EQ(take_calls(),
              found.empty() ? Calls{} : (Calls{"sleep 100000", mount_call(kDevice, found)}));
    messages_of([name = name] { UnMountCustomPartition(name); });
    EXPECT_EQ(take_calls(), found == "/oem" ? Calls{"ensure unmounted /oem"} : Calls{});
  }
}

const struct {
  bool logical;
  bool unmounts;
  DmDeviceState state;
  const char* messages;
  std::vector<std::string> mapper_calls;
} kUnmounts[] = {
    {true, false, DmDeviceState::ACTIVE, "[ROOTS]E: Fail to unmount oem\n", {}},
    {false, true, DmDeviceState::ACTIVE, "[ROOTS]I: Success to unmount /oem \n", {}},
    {true,
     true,
     DmDeviceState::ACTIVE,
     "[ROOTS]I: Success to unmount /oem \n",
     {"dm state oem_a", "destroy oem_a"}},
    {true,
     true,
     DmDeviceState::SUSPENDED,
     "[ROOTS]I: Success to unmount /oem \n[ROOTS]E: Unknown device mapper state\n",
     {"dm state oem_a"}},
    {true,
     true,
     DmDeviceState::INVALID,
     "[ROOTS]I: Success to unmount /oem \n",
     {"dm state oem_a"}},
};

TEST_F(CustomPartition, LosesItsMappingOnlyOnceItIsUnmounted) {
  for (const auto& c : kUnmounts) {
    FstabEntry row = logical_row();
    row.blk_device = "named otherwise";
    row.fs_mgr_flags.logical = c.logical;
    set_table({row});
    take_calls();
    platform_.slot_suffix = "_a";
    platform_.ensure_unmounted = [&](auto*, const auto&) { return c.unmounts; };
    device_mapper_.state = [&](const auto&) { return c.state; };
    EXPECT_EQ(messages_of([] { UnMountCustomPartition("oem"); }), c.messages);
    Calls expected = {"ensure unmounted /oem"};
    expected.insert(expected.end(), c.mapper_calls.begin(), c.mapper_calls.end());
    EXPECT_EQ(take_calls(), expected);
  }
}

}  // namespace
