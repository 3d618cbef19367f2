#include <string.h>
#include <sys/mount.h>
#include <sys/stat.h>

#include <tuple>

#include "recovery_utils/roots_test.h"

namespace sentrova::testing {
namespace {

constexpr size_t kFiveSeconds = 50;
constexpr char kDevice[] = "/dev/block/by-name/oem";

// What is in /tmp and /cache is the test's own.
class VendorProperties : public RootsTest {
 protected:
  void SetUp() override {
    SKIP_WITHOUT_PRIVATE_ROOT();
    tmp_ = std::make_unique<ScopedTmpfs>("/tmp");
    cache_ = std::make_unique<ScopedTmpfs>("/cache");
    RootsTest::SetUp();
  }

  static FstabEntry oem_row(const std::string& device, const std::string& mount_point = "/oem") {
    FstabEntry row = fstab_row(device, mount_point, "erofs");
    row.flags = MS_RDONLY | MS_NOATIME;
    row.fs_options = "barrier=1";
    return row;
  }
  static std::string mount_call(const std::string& device,
                                const std::string& mount_point = "/oem") {
    return "mount(2) " + device + " on " + mount_point + " as erofs, " +
           std::to_string(MS_RDONLY | MS_NOATIME) + ", barrier=1\n";
  }
  static std::string mount_oem() {
    return output_of([] { MountCustomPartition("oem"); });
  }
  static std::string unmount_oem() {
    return output_of([] { UnMountCustomPartition("oem"); });
  }

 private:
  std::unique_ptr<ScopedTmpfs> tmp_, cache_;
};

TEST_F(VendorProperties, PartitionIsMountedFromItsDeviceForWhichItWaitsFourSeconds) {
  const struct {
    const char* mount_point;
    size_t comes_after;  // so many sleeps
    int error;
  } cases[] = {{"/oem", 2, 0}, {"/oem", 40, EBUSY}, {"/oem", 99, ENOENT}, {"/vendor/oem", 1, EIO}};
  const std::string device = kDevice;
  for (const auto& c : cases) {
    SCOPED_TRACE(strerror(c.error));
    clear_machine();
    set_table({oem_row(device, "/vendor/oem"), oem_row(device, c.mount_point)});
    KernelScript kernel;
    kernel.mount_error = [&](auto&, auto&) { return c.error; };
    kernel.on_sleep = [&](size_t count) {
      if (count == c.comes_after) {
        make_file(device);
      }
    };
    EXPECT_EQ(
        mount_oem(),
        repeat(std::min<size_t>(c.comes_after, 40), "sleep 100000\n") +
            "[ROOTS]I: oem partition block device is ready:" + (c.comes_after > 40 ? "0" : "1") +
            "\n[ROOTS]I: partition oem block device " + device + "\n" +
            mount_call(device, c.mount_point) +
            (c.error == 0 || c.error == EBUSY
                 ? "[ROOTS]I: Success to mount /oem at " + device + "\n"
                 : "[ROOTS]E: Fail to mount /oem at " + device + " (" + strerror(c.error) + ")\n"));
    // One below /vendor is never unmounted.
    EXPECT_EQ(unmount_oem(), c.mount_point == std::string("/oem")
                                 ? "ensure unmounted /oem\n[ROOTS]E: Fail to unmount oem\n"
                                 : "");
  }
  set_table({oem_row(device, "/"), oem_row(device, "/vendor")});
  EXPECT_EQ(mount_oem() + unmount_oem() + output_of([] { MountCustomPartition(""); }), "");
}

TEST_F(VendorProperties, PartitionInSuperIsMountedFromItsMappingWhichGoesOnceItIsUnmounted) {
  FstabEntry row = oem_row("part");
  row.fs_mgr_flags.logical = true;
  set_table({row});
  const KernelScript kernel;
  EXPECT_EQ(unmount_oem(), "ensure unmounted /oem\n[ROOTS]E: Fail to unmount oem\n");
  platform_.ensure_unmounted = [](auto*, auto&) { return true; };
  const struct {
    const char* suffix;
    DmDeviceState state;
    const char* node;  // that is there or made; "": none
    std::string mapper_calls;
    const char* device;
    std::string at_end;
  } cases[] = {
      {"_a", DmDeviceState::ACTIVE, "/dev/dm-3", "dm path part_a\n", "/dev/dm-3",
       "destroy oem_a\n"},
      {"_a", DmDeviceState::ACTIVE, "", "dm path part_a\n", "part", "destroy oem_a\n"},
      {"_a", DmDeviceState::SUSPENDED, "/dev/dm-3", "", "part",
       "[ROOTS]E: Unknown device mapper state\n"},
      {"_b", DmDeviceState::INVALID, "/dev/dm-4",
       "super partition of slot -1\n"
       "create part_b from /dev/block/by-name/super, table 1, writable, 1000 ms\n",
       "/dev/dm-4", ""},
      {"", DmDeviceState::INVALID, "",
       "super partition of slot -1\n"
       "create part from /dev/block/by-name/super, table 0, writable, 1000 ms\n",
       "part", ""},
  };
  for (const auto& c : cases) {
    platform_.slot_suffix = c.suffix;
    platform_.dm_state = [&](auto&) { return c.state; };
    platform_.dm_node = [&](auto&) { return c.node; };
    platform_.logical_node = c.node;
    const std::string device = c.device, suffix = c.suffix;
    EXPECT_EQ(mount_oem(), "dm state part" + suffix + "\n" + c.mapper_calls +
                               "[ROOTS]I: partition oem block device " + device + "\n" +
                               mount_call(device) + "[ROOTS]I: Success to mount /oem at " + device +
                               "\n");
    EXPECT_EQ(unmount_oem(),
              "ensure unmounted /oem\n[ROOTS]I: Success to unmount /oem \n"
              "dm state oem" +
                  suffix + "\n" + c.at_end);
  }
}

TEST_F(VendorProperties, AreLoadedWhileTheirPartitionsAreMounted) {
  set_table({fstab_row("/dev/o", "/oem"), fstab_row("/dev/k", "/kcf")});
  platform_.ensure_unmounted = [](auto*, auto&) { return true; };
  make_file("/dev/o");
  make_file("/dev/k");
  for (const auto& [repair, answers] : {std::pair("", true), {"1", true}, {"false", false}}) {
    SetProperty("recovery.repair_mode", repair);
    SetProperty("recovery.load.props", "");
    SetProperty("recovery.load.backup_props", "");
    KernelScript kernel;
    // Two sleeps are for the devices. The loader answers in the third after its request, that for
    // the backups in the first.
    kernel.on_sleep = [answers = answers](size_t count) {
      printf("%s%s\n", GetProperty("recovery.load.props", "-").c_str(),
             GetProperty("recovery.load.backup_props", "-").c_str());
      SetProperty("recovery.properties.loaded", answers && count == 5 ? "1" : "0");
      SetProperty("recovery.backup_props.loaded", answers && count == 6 ? "1" : "0");
    };
    const std::string output = output_of(zuno_load_property, true);
    EXPECT_THAT(output, StartsWith("[ROOTS]I: load property begin\nsleep 100000\n--\n[ROOTS]I: "
                                   "oem partition block device is ready:1\n"));
    EXPECT_THAT(output,
                HasSubstr("mount(2) /dev/k on /kcf as ext4, 0, \n"
                          "[ROOTS]I: Success to mount /kcf at /dev/k\n" +
                          repeat(answers ? 3 : kFiveSeconds, "sleep 100000\n1-\n") +
                          repeat(answers ? 1 : kFiveSeconds, "sleep 100000\n11\n") +
                          (repair == std::string("1")
                               ? ""
                               : "ensure unmounted /oem\n[ROOTS]I: Success to unmount /oem \n"
                                 "ensure unmounted /kcf\n[ROOTS]I: Success to unmount /kcf \n") +
                          "[ROOTS]I: load property end\n"));
  }
}

TEST_F(VendorProperties, AreBackedUpOnceAllAreReadyElseRestored) {
  // Whether oem's are ready, kcf's are wanted, these are ready; else the backups are asked for.
  const std::tuple<std::string, std::string, std::string, bool> cases[] = {
      {"true", "", "", true},    {"true", "1", "true", true}, {"true", "1", "TRUE", false},
      {"1", "1", "true", false}, {"", "", "true", false},     {"true", "true", "", true}};
  const std::string copied =
      "[ZunoFunc]I: Copying file '/tmp/oem.prop' to '/cache/recovery/oem.prop'\n"
      "[ZunoFunc]I: Copying file '/tmp/kcf.prop' to '/cache/recovery/kcf.prop'\n";
  for (const auto& [oem_ready, kcf_support, kcf_ready, backed_up] : cases) {
    SCOPED_TRACE(oem_ready + " " + kcf_support + " " + kcf_ready);
    clear_machine();
    std::filesystem::remove_all("/cache/recovery");
    for (const std::string name : {"oem", "kcf"}) {
      make_file("/tmp/" + name + ".prop", "new " + name);
      make_file("/cache/recovery/" + name + ".prop", "old " + name);
    }
    std::filesystem::create_hard_link("/cache/recovery/oem.prop", "/cache/recovery/linked");
    SetProperty("recovery.oem_properties.ready", oem_ready);
    SetProperty("ro.recovery.kcf.support", kcf_support);
    SetProperty("recovery.kcf_properties.ready", kcf_ready);
    const KernelScript kernel;
    const mode_t umask_before = umask(077);
    EXPECT_EQ(output_of(zunoPropertyPrebackup),
              backed_up ? copied : repeat(kFiveSeconds, "sleep 100000\n"));
    umask(umask_before);
    EXPECT_EQ(content_of("/cache/recovery/oem.prop"), backed_up ? "new oem" : "old oem");
    EXPECT_EQ(content_of("/cache/recovery/kcf.prop"), backed_up ? "new kcf" : "old kcf");
    EXPECT_EQ(content_of("/cache/recovery/linked"), "old oem") << "removed, not written through";
    EXPECT_EQ(std::filesystem::status("/cache/recovery/kcf.prop").permissions(),
              std::filesystem::perms{0644});
    EXPECT_EQ(GetProperty("recovery.load.backup_props", ""), backed_up ? "" : "1");
    zunoPropertyPostBackup();
    EXPECT_EQ(content_of("/cache/recovery/oem.prop") + content_of("/cache/recovery/kcf.prop"),
              "(none)(none)");
  }
}

TEST_F(VendorProperties, PersistentOnesAreThereIfTheLoaderSaysExactlyTrue) {
  set_table({fstab_row("/dev/u", "/data")});
  platform_.ensure_mounted = [](auto*, auto&, auto&) { return errno = 0, true; };
  for (const std::string ready : {"true", "TRUE", "1", ""}) {
    SetProperty("recovery.persistent_properties.ready", ready);
    KernelScript kernel;
    kernel.on_sleep = [](size_t count) {
      EXPECT_EQ(GetProperty("recovery.load.persist_props", ""), "1");
      SetProperty("recovery.persist_properties.loaded", count == 2 ? "1" : "0");
    };
    EXPECT_EQ(output_of(zuno_load_persist_property, ready == "true"),
              "ensure mounted /data at /data\nsleep 100000\nsleep 100000\n");
  }
}

}  // namespace
}  // namespace sentrova::testing
