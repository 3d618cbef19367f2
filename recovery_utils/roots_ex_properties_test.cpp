#include <android-base/properties.h>
#include <errno.h>
#include <sys/stat.h>
#include <unistd.h>

#include "recovery_utils/roots_ex.h"
#include "recovery_utils/roots_mount_test.h"

namespace {

using android::base::GetProperty;
using android::base::ReadFileToString;
using android::base::SetProperty;
using android::base::WriteStringToFile;
using sentrova::testing::fstab_row;
using sentrova::testing::KernelScript;
using sentrova::testing::MountTest;
using sentrova::testing::ScopedTmpfs;

constexpr char kLoad[] = "recovery.load.props";
constexpr char kLoadBackups[] = "recovery.load.backup_props";
constexpr size_t kFiveSeconds = 50;

std::string repeat(const std::string& text, size_t times) {
  std::string result;
  while (times-- > 0) {
    result += text;
  }
  return result;
}

// What is in /tmp and /cache is the test's own.
class VendorProperties : public MountTest {
 protected:
  void SetUp() override {
    SKIP_WITHOUT_PRIVATE_ROOT();
    tmp_.emplace("/tmp");
    cache_.emplace("/cache");
    MountTest::SetUp();
  }

  static std::string contents(const std::string& path) {
    std::string text;
    return ReadFileToString(path, &text) ? text : "absent";
  }

  void put_files() {
    mkdir("/cache/recovery", 0755);
    for (const char* name : {"oem", "kcf"}) {
      const std::string file = std::string(name) + ".prop";
      ASSERT_TRUE(WriteStringToFile(std::string("new ") + name, "/tmp/" + file));
      ASSERT_TRUE(WriteStringToFile(std::string("old ") + name, "/cache/recovery/" + file));
    }
  }

 private:
  std::optional<ScopedTmpfs> tmp_;
  std::optional<ScopedTmpfs> cache_;
};

TEST_F(VendorProperties, AreLoadedWhileTheirPartitionsAreMounted) {
  set_table({fstab_row("/dev/o", "/oem"), fstab_row("/dev/k", "/kcf")});
  make_file("/dev/o");
  make_file("/dev/k");
  platform_.ensure_unmounted = [](auto*, const auto&) { return true; };
  for (const auto& [repair, answers] :
       {std::pair("", true), {"true", true}, {"1", true}, {"false", false}}) {
    SetProperty("recovery.repair_mode", repair);
    SetProperty(kLoad, "");
    SetProperty(kLoadBackups, "");
    take_calls();
    std::string requests;
    KernelScript kernel;
    // Two sleeps are for the devices. The loader answers in the third after its request, that for
    // the backups in the first.
    kernel.on_sleep = [&, answers = answers](size_t count) {
      requests += GetProperty(kLoad, "") == "1" ? "L" : "-";
      requests += GetProperty(kLoadBackups, "") == "1" ? "B" : "-";
      SetProperty("recovery.properties.loaded", answers && count == 5 ? "1" : "0");
      SetProperty("recovery.backup_props.loaded", answers && count == 6 ? "1" : "0");
    };
    const std::string messages = messages_of([] { EXPECT_TRUE(zuno_load_property()); });
    EXPECT_TRUE(messages.starts_with("[ROOTS]I: load property begin\n")) << messages;
    EXPECT_TRUE(messages.ends_with("[ROOTS]I: load property end\n")) << messages;
    EXPECT_EQ(requests, "----" + repeat("L-", answers ? 3 : kFiveSeconds) +
                            repeat("LB", answers ? 1 : kFiveSeconds));
    Calls expected = {"sleep 100000", "mount(2) /dev/o on /oem as ext4, 0, ", "sleep 100000",
                      "mount(2) /dev/k on /kcf as ext4, 0, "};
    expected.insert(expected.end(), requests.size() / 2 - 2, "sleep 100000");
    if (repair == std::string() || repair == std::string("false")) {
      expected.insert(expected.end(), {"ensure unmounted /oem", "ensure unmounted /kcf"});
    }
    EXPECT_EQ(take_calls(), expected) << repair;
  }
}

const struct {
  const char* oem_ready;
  const char* kcf_support;
  const char* kcf_ready;
  bool backed_up;  // else the backups are asked for
} kReadiness[] = {
    {"true", "", "", true},       {"true", "0", "false", true}, {"true", "1", "true", true},
    {"true", "1", "", false},     {"true", "1", "TRUE", false}, {"", "", "", false},
    {"false", "", "true", false}, {"1", "1", "true", false},    {"true", "true", "", true},
};

TEST_F(VendorProperties, AreBackedUpOnceAllAreReadyElseRestored) {
  for (const auto& c : kReadiness) {
    SCOPED_TRACE(c.oem_ready + std::string(" ") + c.kcf_support + " " + c.kcf_ready);
    clear_machine();
    put_files();
    remove("/cache/linked");
    ASSERT_EQ(link("/cache/recovery/oem.prop", "/cache/linked"), 0);
    SetProperty("recovery.oem_properties.ready", c.oem_ready);
    SetProperty("ro.recovery.kcf.support", c.kcf_support);
    SetProperty("recovery.kcf_properties.ready", c.kcf_ready);
    size_t sleeps = 0;
    KernelScript kernel;
    kernel.on_sleep = [&](size_t count) { sleeps = count; };
    const mode_t umask_before = umask(077);
    messages_of(zunoPropertyPrebackup);
    umask(umask_before);
    EXPECT_EQ(contents("/cache/recovery/oem.prop"), c.backed_up ? "new oem" : "old oem");
    EXPECT_EQ(contents("/cache/recovery/kcf.prop"), c.backed_up ? "new kcf" : "old kcf");
    EXPECT_EQ(contents("/cache/linked"), "old oem") << "removed, not written through";
    EXPECT_EQ(GetProperty(kLoadBackups, ""), c.backed_up ? "" : "1");
    EXPECT_EQ(sleeps, c.backed_up ? 0 : kFiveSeconds);
    struct stat status = {};
    ASSERT_EQ(stat("/cache/recovery/kcf.prop", &status), 0);
    EXPECT_EQ(status.st_mode & 07777, 0644U);
    zunoPropertyPostBackup();
    EXPECT_EQ(contents("/cache/recovery/oem.prop") + contents("/cache/recovery/kcf.prop"),
              "absentabsent");
  }
}

TEST_F(VendorProperties, PersistentOnesAreThereIfTheLoaderSaysExactlyTrue) {
  set_table({fstab_row("/dev/u", "/data")});
  for (const auto& [ready, expected] :
       {std::pair("true", true), {"TRUE", false}, {"1", false}, {"", false}, {"false", false}}) {
    SetProperty("recovery.persistent_properties.ready", ready);
    platform_.ensure_mounted = [](auto*, const auto&, const auto&) {
      errno = 0;
      return true;
    };
    take_calls();
    KernelScript kernel;
    kernel.on_sleep = [](size_t count) {
      EXPECT_EQ(GetProperty("recovery.load.persist_props", ""), "1");
      SetProperty("recovery.persist_properties.loaded", count == 2 ? "1" : "0");
    };
    bool answer = !expected;
    messages_of([&] { answer = zuno_load_persist_property(); });
    EXPECT_EQ(answer, expected) << ready;
    EXPECT_EQ(take_calls(),
              (Calls{"ensure mounted /data at /data", "sleep 100000", "sleep 100000"}));
  }
}

}  // namespace
