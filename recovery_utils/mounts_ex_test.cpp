#include "recovery_utils/mounts_ex.h"

#include <map>

#include "recovery_utils/roots_test.h"

namespace sentrova::testing {
namespace {

namespace fs = std::filesystem;

using android::recovery::KillProcessesWithOpenFiles;

using Entries = std::map<std::string, std::string>;

class MountedVolumes : public RootsTest {
 protected:
  // In place of the process of that number, if any: what its files hold and its links refer to.
  static void add_process(const std::string& pid, const Entries& entries) {
    const std::string base = "/proc/" + pid + "/";
    fs::remove_all(base);
    fs::create_directories(base + "fd");
    for (const auto& [name, content] : entries) {
      if (name == "maps" || name == "cmdline") {
        make_file(base + name, content);
      } else {
        fs::create_symlink(content, base + name);
      }
    }
  }
  static MountedVolume* data_volume() {
    set_mounted("/data");
    return scan_mounted_volumes() ? find_mounted_volume_by_mount_point("/data") : nullptr;
  }
};

std::string found_link(const std::string& link, const std::string& target) {
  return "[ZUNO_MOUNT]W: Found symlink /proc/" + link + " referencing " + target + "\n";
}

std::string found_map(const std::string& path) {
  return "[ZUNO_MOUNT]W: Found map /proc/5/maps referencing " + path + "\n";
}

TEST_F(MountedVolumes, AreTheRowsOfTheKernelsTableAtEachScan) {
  const std::string long_options = "rw,lowerdir=" + std::string(3000, 'd');
  make_file("/proc/mounts",
            "/dev/dm-0 /data f2fs rw,seclabel 0 0\n\ntmpfs /data tmpfs ro 0 0\n"
            "//host/a\\040b /mnt/two\\040words\\011tab\\134back cifs " +
                long_options + " 0 0\n");
  ASSERT_TRUE(scan_mounted_volumes());
  for (const Texts& fields :
       {Texts{"/data", "/dev/dm-0", "f2fs", "rw,seclabel"},  // the lower one of a stack
        Texts{"/mnt/two words\ttab\\back", "//host/a b", "cifs", long_options}}) {
    const MountedVolume* row = find_mounted_volume_by_mount_point(fields[0].c_str());
    ASSERT_NE(row, nullptr) << fields[0];
    EXPECT_THAT(fields, ElementsAre(row->mount_point, row->device, row->filesystem, row->flags));
  }
  for (const char* absent : {"", "/dat", "/data/", "/DATA", "/mnt/two\\040words"}) {
    EXPECT_EQ(find_mounted_volume_by_mount_point(absent), nullptr) << absent;
  }
  set_mounted("");
  EXPECT_FALSE(scan_mounted_volumes());
  EXPECT_EQ(find_mounted_volume_by_mount_point("/data"), nullptr);
}

TEST_F(MountedVolumes, AreUnmountedOnceByThePlainCall) {
  MountedVolume* volume = data_volume();
  ASSERT_NE(volume, nullptr);
  KernelScript kernel;
  kernel.umount_error = [](auto& path) { return path == "/data" ? EBUSY : ENOENT; };
  EXPECT_EQ(output_of([&] {
              EXPECT_EQ(unmount_mounted_volume(volume), -1);
              EXPECT_EQ(errno, EBUSY);
              EXPECT_EQ(unmount_mounted_volume(volume), -1);
              EXPECT_EQ(errno, ENOENT);
            }),
            "umount(2) /data\n"
            "W mounts_ex.cpp:107 Failed to umount /data: Device or resource busy\n"
            "umount(2) \n"
            "W mounts_ex.cpp:107 Failed to umount : No such file or directory\n");
}

TEST_F(MountedVolumes, AreUnmountedPatientlyOrReportedWithTheirHolders) {
  add_process("77", {{"fd/0", "/data/file"}, {"cmdline", "program"}});
  const std::string found = found_link("77/fd/0", "/data/file");
  const auto release = [&](const char* announced, const char* sent, const char* call) {
    return std::string("[ZUNO_MOUNT]W: sending ") + announced + " to processes with open files\n" +
           found + "[ZUNO_MOUNT]W: Kill Processes With Open Files -> Sending " + sent +
           " to program , pid 77\n" + call + "\n";
  };
  const struct {
    bool force;
    int failures;
    int last_error;  // of the attempt after the failures
  } cases[] = {{false, 0, EINVAL}, {false, 29, 0}, {false, 30, 0}, {true, 20, 0},
               {true, 25, EINVAL}, {true, 29, 0},  {true, 30, 0}};
  for (const auto& c : cases) {
    SCOPED_TRACE(std::to_string(c.failures) + " failures");
    const bool unmounted = c.failures < 30;
    std::string expected;
    for (int attempt = 1; attempt <= c.failures; ++attempt) {
      expected += "umount(2) /data\n";
      if (c.force && attempt == 21) {
        expected += release("SIGHUP", "Terminated", "kill 77 15");
      } else if (c.force && attempt == 26) {
        expected += release("SIGKILL", "Killed", "kill 77 9");
      }
      expected += "sleep 100000\n";
    }
    expected += unmounted
                    ? "umount(2) /data\n[ZUNO_MOUNT]I: unmounting /data succeeded\n"
                    : found + "[ZUNO_MOUNT]E: unmounting /data failed: Operation not permitted\n";
    MountedVolume* volume = data_volume();
    ASSERT_NE(volume, nullptr);
    KernelScript kernel;
    int attempts = 0;
    kernel.umount_error = [&](auto&) {
      return ++attempts == 30 && !unmounted ? EPERM : attempts <= c.failures ? EBUSY : c.last_error;
    };
    const auto unmount = [&] { return unmount_mounted_volume(volume, c.force); };
    EXPECT_EQ(output_of(unmount, unmounted ? 0 : -1), expected);
    EXPECT_EQ(volume->mount_point, unmounted ? "" : "/data");
  }
}

TEST_F(MountedVolumes, HoldersAreFoundByEveryKindOfReference) {
  const std::string long_path = "/data/" + std::string(9000, 'x');
  const std::pair<Entries, std::string> cases[] = {
      {{{"maps", "1-2 rw-p 0 0:0 0\n1-2 [heap]\n3-4 /mnt/data/x\n5-6 anon:/dat\n\n"}}, ""},
      {{{"maps", "1 /data/a b\n3 /other\n4 /data/c (deleted)"}},
       found_map("/data/a b") + found_map("/data/c (deleted)")},
      {{{"maps", "1 " + long_path + "\n2 /data/y\n"}}, found_map(long_path) + found_map("/data/y")},
      {{{"exe", "/data/tool (deleted)"}}, found_link("5/exe", "/data/tool (deleted)")},
      {{{"fd/0", "/x"}, {"fd/1", "/data2/sibling"}}, found_link("5/fd/1", "/data2/sibling")},
      {{{"cwd", "/mnt/data"}, {"exe", "/dat"}, {"fd/0", "socket:[1]"}, {"fd/1", "data"}}, ""},
      {{{"maps", "1 /data/m\n"}, {"cwd", "/data/c"}, {"root", "/data/r"}, {"fd/0", "/data/d"}},
       found_map("/data/m") + found_link("5/cwd", "/data/c") + found_link("5/root", "/data/r") +
           found_link("5/fd/0", "/data/d")},
  };
  const auto find = [] { return KillProcessesWithOpenFiles("/data", 0); };
  for (const auto& [entries, lines] : cases) {
    add_process("5", entries);
    EXPECT_EQ(output_of(find, lines.empty() ? 0 : 1), lines);
  }
  fs::remove_all("/proc/5/fd");  // as of a process that ends meanwhile
  EXPECT_THAT(output_of(find, 1), HasSubstr("[ZUNO_MOUNT]W: Failed to open /proc/5/fd\n"));
  EXPECT_EQ(output_of([] { return KillProcessesWithOpenFiles(nullptr, SIGKILL); }, -1),
            "[ZUNO_MOUNT]E: Invalid parameters\n");
}

TEST_F(MountedVolumes, HoldersAreSignalledOnceEachAndTheCallerNever) {
  const std::string self = std::to_string(getpid());
  add_process(self, {{"cwd", "/data"}, {"cmdline", std::string("rescue\0-x", 9)}});
  add_process("1000001", {{"cwd", "/data"}, {"fd/0", "/data/a"}, {"cmdline", "program"}});
  add_process("1000002", {{"exe", "/data/e"}});
  add_process("1000003", {{"exe", "/e"}});
  const std::string head = "[ZUNO_MOUNT]W: Kill Processes With Open Files -> ";
  const KernelScript kernel;
  EXPECT_THAT(output_of([] { return KillProcessesWithOpenFiles("/data", 0); }, 3),
              Not(HasSubstr(head)));
  const std::string text =
      output_of([] { return KillProcessesWithOpenFiles("/data", SIGTERM); }, 3);
  for (const std::string& lines : Texts{
           "Sending Terminated to program , pid 1000001\nkill 1000001 15\n",
           "Sending Terminated to ??? , pid 1000002\nkill 1000002 15\n",
           "Can't kill Process itself (name : rescue , pid : " + self + "), will skip to next\n"}) {
    EXPECT_THAT(text, HasSubstr(head + lines));
  }
  EXPECT_THAT(text, AllOf(Not(HasSubstr("kill " + self)), Not(HasSubstr("kill 1000003"))));
}

TEST_F(MountedVolumes, AreLetGoByEveryProcessNamedForTheKeyStore) {
  const std::pair<std::string, bool> cases[] = {
      {std::string("/system/bin/keystore\0/data/misc/keystore", 40), true},
      {std::string(3000, '/') + "keystore", true},
      {std::string("/bin/tail\0/data/keystore.log", 28), false},
      {"/bin/KeyStore", false},
      {"", false},
  };
  for (const auto& [cmdline, ended] : cases) {
    SetProperty("ctl.stop", "");
    add_process("11", {{"cmdline", cmdline}});
    KernelScript kernel;
    kernel.on_sleep = [](size_t) { EXPECT_EQ(GetProperty("ctl.stop", ""), "keystore"); };
    EXPECT_EQ(output_of(force_progress_release_file),
              std::string("[ZUNO_MOUNT]I: Stopping keystore...\n") +
                  (ended ? "[ZUNO_MOUNT]W: keystore pid 11 found, sending kill.\n\n"
                           "kill 11 2\nsleep 5000\nkill 11 9\n"
                         : ""));
    EXPECT_EQ(GetProperty("ctl.stop", ""), "keystore");
  }
}

}  // namespace
}  // namespace sentrova::testing
