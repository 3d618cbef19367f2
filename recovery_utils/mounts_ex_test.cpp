#include "recovery_utils/mounts_ex.h"

#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/properties.h>
#include <errno.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <string.h>
#include <sys/mount.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "common/export.h"
#include "tests/support/captured_stdout.h"
#include "tests/support/private_mounts.h"
#include "tests/support/sleep_script.h"

namespace {

namespace fs = std::filesystem;

using android::recovery::KillProcessesWithOpenFiles;
using sentrova::testing::CapturedStdout;
using sentrova::testing::ScopedTmpfs;
using sentrova::testing::SleepScript;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::UnorderedElementsAre;

// While one is alive, the code under test unmounts nothing, signals nobody, sets no property and
// does not sleep: each call is noted. One at a time, on one thread.
struct SystemScript {
  SystemScript() { current = this; }
  ~SystemScript() { current = nullptr; }

  static inline SystemScript* current = nullptr;
  // "umount PATH", "kill PID SIGNAL", "set NAME=VALUE", "sleep MICROSECONDS", in order.
  std::vector<std::string> events;
  // The `errno` that umount fails with, or 0 for success. Its argument counts the calls from 1.
  std::function<int(int)> umount_error = [](int) { return 0; };
  int umount_calls = 0;
  SleepScript sleeps{[this](size_t) {
    events.push_back("sleep " + std::to_string(sleeps.microseconds().back()));
  }};
};

// What a fake process references.
struct Process {
  std::string maps = "";
  std::string cwd = "/";
  std::string root = "/";
  std::string exe = "/bin/program";
  std::vector<std::string> descriptors = {};
  std::string cmdline = "program";
};

// A test over a /proc of its own, empty at first.
class FakeProc : public ::testing::Test {
 protected:
  void SetUp() override {
    SKIP_WITHOUT_PRIVATE_ROOT();
    proc_.emplace("/proc");
  }

  static void add_file(const std::string& name, const std::string& content) {
    ASSERT_TRUE(android::base::WriteStringToFile(content, "/proc/" + name)) << name;
  }
  // In place of the process of that number, if any.
  static void add_process(const std::string& pid, const Process& process) {
    const std::string base = "/proc/" + pid;
    fs::remove_all(base);
    fs::create_directories(base + "/fd");
    add_file(pid + "/maps", process.maps);
    add_file(pid + "/cmdline", process.cmdline);
    fs::create_symlink(process.cwd, base + "/cwd");
    fs::create_symlink(process.root, base + "/root");
    fs::create_symlink(process.exe, base + "/exe");
    for (size_t i = 0; i < process.descriptors.size(); ++i) {
      fs::create_symlink(process.descriptors[i], base + "/fd/" + std::to_string(i));
    }
  }
  static MountedVolume* data_volume() {
    add_file("mounts", "/dev/dm-0 /data f2fs rw 0 0\n");
    return scan_mounted_volumes() ? find_mounted_volume_by_mount_point("/data") : nullptr;
  }

  std::optional<ScopedTmpfs> proc_;
};

using MountedVolumes = FakeProc;
using ProcessRelease = FakeProc;

TEST_F(MountedVolumes, AreTheRowsOfTheKernelsTableAtEachScan) {
  const std::string long_options = "rw,lowerdir=" + std::string(3000, 'd');
  add_file("mounts",
           "/dev/dm-0 /data f2fs rw,seclabel 0 0\n\ntmpfs /data tmpfs ro 0 0\n"
           "//host/a\\040b /mnt/two\\040words\\011tab\\134back cifs " +
               long_options + " 0 0\n");
  ASSERT_TRUE(scan_mounted_volumes());
  const std::vector<std::string> cases[] = {
      {"/data", "/dev/dm-0", "f2fs", "rw,seclabel"},  // the lower one of a stack
      {"/mnt/two words\ttab\\back", "//host/a b", "cifs", long_options},
  };
  for (const auto& c : cases) {
    const MountedVolume* row = find_mounted_volume_by_mount_point(c[0].c_str());
    ASSERT_NE(row, nullptr) << c[0];
    EXPECT_THAT(c, ElementsAre(row->mount_point, row->device, row->filesystem, row->flags));
  }
  for (const char* absent : {"", "/dat", "/data/", "/DATA", "/mnt/two\\040words"}) {
    EXPECT_EQ(find_mounted_volume_by_mount_point(absent), nullptr) << absent;
  }
  fs::remove("/proc/mounts");
  EXPECT_FALSE(scan_mounted_volumes());
  EXPECT_EQ(find_mounted_volume_by_mount_point("/data"), nullptr);
}

TEST_F(MountedVolumes, AreUnmountedOnceByThePlainCall) {
  MountedVolume* volume = data_volume();
  ASSERT_NE(volume, nullptr);
  std::vector<std::string> warnings;
  android::base::SetLogger(
      [&](auto, auto, auto, const char* file, unsigned int line, const char* message) {
        warnings.push_back(std::string(file) + ":" + std::to_string(line) + " " + message);
        errno = 0;
      });
  SystemScript script;
  script.umount_error = [](int call) { return call == 1 ? EBUSY : ENOENT; };
  EXPECT_EQ(unmount_mounted_volume(volume), -1);
  EXPECT_EQ(errno, EBUSY);
  EXPECT_EQ(unmount_mounted_volume(volume), -1);
  EXPECT_EQ(errno, ENOENT);
  android::base::SetLogger(android::base::StderrLogger);
  EXPECT_THAT(script.events, ElementsAre("umount /data", "umount "));
  EXPECT_THAT(warnings,
              ElementsAre("mounts_ex.cpp:107 Failed to umount /data: Device or resource busy",
                          "mounts_ex.cpp:107 Failed to umount : No such file or directory"));
}

// What the patient unmount does in so many attempts, with process 77 as the holder.
std::vector<std::string> expected_events(int attempts, bool unmounted, bool force) {
  std::vector<std::string> events;
  for (int attempt = 1; attempt <= attempts; ++attempt) {
    events.push_back("umount /data");
    if (force && attempt == 21 && !(unmounted && attempt == attempts)) {
      events.push_back("kill 77 15");
    }
    if (force && attempt == 26 && !(unmounted && attempt == attempts)) {
      events.push_back("kill 77 9");
    }
    events.push_back("sleep 100000");
  }
  if (unmounted) {
    events.pop_back();
  }
  return events;
}

TEST_F(MountedVolumes, AreUnmountedPatientlyOrReportedWithTheirHolders) {
  add_process("77", {.descriptors = {"/data/file"}});
  const std::string found = "[ZUNO_MOUNT]W: Found symlink /proc/77/fd/0 referencing /data/file\n";
  const auto release = [&](const char* announced, const char* sent) {
    return std::string("[ZUNO_MOUNT]W: sending ") + announced + " to processes with open files\n" +
           found + "[ZUNO_MOUNT]W: Kill Processes With Open Files -> Sending " + sent +
           " to program , pid 77\n";
  };
  const struct {
    bool force;
    int failures;
    int last_error;  // of the attempt after the failures, or the thirtieth
  } cases[] = {{false, 0, 0},  {false, 0, EINVAL}, {false, 29, 0}, {true, 20, 0},
               {true, 21, 0},  {true, 25, EINVAL}, {true, 26, 0},  {true, 29, 0},
               {false, 30, 0}, {true, 30, 0}};
  for (const auto& c : cases) {
    SCOPED_TRACE(std::to_string(c.failures) + " failures");
    MountedVolume* volume = data_volume();
    ASSERT_NE(volume, nullptr);
    SystemScript script;
    script.umount_error = [&](int call) {
      return call == 30 && c.failures == 30 ? EPERM : call <= c.failures ? EBUSY : c.last_error;
    };
    const bool unmounted = c.failures < 30;
    CapturedStdout output;
    EXPECT_EQ(unmount_mounted_volume(volume, c.force), unmounted ? 0 : -1);
    std::string text = c.force && c.failures >= 21 ? release("SIGHUP", "Terminated") : "";
    text += c.force && c.failures >= 26 ? release("SIGKILL", "Killed") : "";
    text += unmounted ? "[ZUNO_MOUNT]I: unmounting /data succeeded\n"
                      : found + "[ZUNO_MOUNT]E: unmounting /data failed: Operation not permitted\n";
    EXPECT_EQ(output.take(), text);
    EXPECT_EQ(script.events, expected_events(unmounted ? c.failures + 1 : 30, unmounted, c.force));
    EXPECT_EQ(volume->mount_point, unmounted ? "" : "/data");
  }
}

std::string found_link(const std::string& link, const std::string& target) {
  return "[ZUNO_MOUNT]W: Found symlink /proc/" + link + " referencing " + target + "\n";
}

std::string found_map(const std::string& path) {
  return "[ZUNO_MOUNT]W: Found map /proc/5/maps referencing " + path + "\n";
}

TEST_F(ProcessRelease, FindsEveryKindOfReference) {
  const std::string long_path = "/data/" + std::string(9000, 'x');
  const std::pair<Process, std::string> cases[] = {
      {{.maps = "1-2 rw-p 0 0:0 0\n1-2 [heap]\n3-4 /mnt/data/x\n5-6 anon:/dat\n\n"}, ""},
      {{.maps = "1 /data/a b\n3 /other\n4 /data/c (deleted)"},
       found_map("/data/a b") + found_map("/data/c (deleted)")},
      {{.maps = "1 " + long_path + "\n2 /data/y\n"}, found_map(long_path) + found_map("/data/y")},
      {{.exe = "/data/bin/tool (deleted)"}, found_link("5/exe", "/data/bin/tool (deleted)")},
      {{.descriptors = {"/x", "/data2/sibling"}}, found_link("5/fd/1", "/data2/sibling")},
      {{.cwd = "/mnt/data", .exe = "/dat", .descriptors = {"socket:[12]", "/Data", "data"}}, ""},
      {{.maps = "1 /data/m\n", .cwd = "/data/c", .root = "/data/r", .descriptors = {"/data/d"}},
       found_map("/data/m") + found_link("5/cwd", "/data/c") + found_link("5/root", "/data/r") +
           found_link("5/fd/0", "/data/d")},
  };
  for (const auto& [process, lines] : cases) {
    add_process("5", process);
    CapturedStdout output;
    EXPECT_EQ(KillProcessesWithOpenFiles("/data", 0), lines.empty() ? 0 : 1);
    EXPECT_EQ(output.take(), lines);
  }
  fs::remove_all("/proc/5/fd");  // as of a process that ends meanwhile
  CapturedStdout output;
  EXPECT_EQ(KillProcessesWithOpenFiles("/data", 0), 1);
  EXPECT_THAT(output.take(), HasSubstr("[ZUNO_MOUNT]W: Failed to open /proc/5/fd\n"));
  EXPECT_EQ(KillProcessesWithOpenFiles(nullptr, SIGKILL), -1);
}

TEST_F(ProcessRelease, SignalsEachHolderOnceAndNeverTheCaller) {
  const std::string self = std::to_string(getpid());
  add_process(self, {.cwd = "/data", .cmdline = std::string("rescue\0-x", 9)});
  add_process("1000001", {.cwd = "/data", .descriptors = {"/data/a", "/data/b"}});
  add_process("1000002", {.exe = "/data/e"});
  fs::remove("/proc/1000002/cmdline");
  add_process("1000003", {});
  const std::string head = "[ZUNO_MOUNT]W: Kill Processes With Open Files -> ";
  SystemScript script;
  CapturedStdout output;
  EXPECT_EQ(KillProcessesWithOpenFiles("/data", 0), 3);
  EXPECT_THAT(script.events, IsEmpty());
  EXPECT_EQ(KillProcessesWithOpenFiles("/data", SIGTERM), 3);
  EXPECT_THAT(script.events, UnorderedElementsAre("kill 1000001 15", "kill 1000002 15"));
  const std::string text = output.take();
  EXPECT_THAT(text, HasSubstr(head + "Sending Terminated to program , pid 1000001\n"));
  EXPECT_THAT(text, HasSubstr(head + "Sending Terminated to ??? , pid 1000002\n"));
  EXPECT_THAT(text, HasSubstr(head + "Can't kill Process itself (name : rescue , pid : " + self +
                              "), will skip to next\n"));
}

TEST_F(ProcessRelease, EndsEveryProcessNamedForTheKeyStore) {
  const std::pair<std::string, bool> cases[] = {
      {std::string("/system/bin/keystore\0/data/misc/keystore", 40), true},
      {"/data/keystore_backup/tool", true},
      {std::string(3000, '/') + "keystore", true},
      {std::string("/bin/tail\0/data/keystore.log", 28), false},
      {"/bin/KeyStore", false},
      {"", false},
  };
  for (const auto& [cmdline, ended] : cases) {
    add_process("11", {.cmdline = cmdline});
    SystemScript script;
    CapturedStdout output;
    force_progress_release_file();
    EXPECT_EQ(output.take(),
              std::string("[ZUNO_MOUNT]I: Stopping keystore...\n") +
                  (ended ? "[ZUNO_MOUNT]W: keystore pid 11 found, sending kill.\n\n" : ""));
    std::vector<std::string> events = {"set ctl.stop=keystore"};
    if (ended) {
      events.insert(events.end(), {"kill 11 2", "sleep 5000", "kill 11 9"});
    }
    EXPECT_EQ(script.events, events) << cmdline;
  }
}

TEST(RealProcesses, AreFoundInAStormOfOthers) {
  constexpr int kWalks = 100;
  const pid_t storm = fork();
  if (storm == 0) {
    alarm(60);  // should the test die, the storm does not outlast it
    while (true) {
      const pid_t child = fork();
      if (child == 0) {
        _exit(0);
      }
      waitpid(child, nullptr, 0);
    }
  }
  const TemporaryFile held;  // by this process alone
  const std::string line =
      found_link(std::to_string(getpid()) + "/fd/" + std::to_string(held.fd), held.path);
  for (int walk = 0; walk < kWalks; ++walk) {
    CapturedStdout output;
    EXPECT_EQ(KillProcessesWithOpenFiles(held.path, 0), 1);
    EXPECT_THAT(output.take(), HasSubstr(line));
  }
  kill(storm, SIGKILL);
  EXPECT_EQ(waitpid(storm, nullptr, 0), storm);
}

}  // namespace

// In place of the system's, for the code under test.

extern "C" SENTROVA_API int umount(const char* path) noexcept {
  SystemScript* script = SystemScript::current;
  if (script == nullptr) {
    return static_cast<int>(syscall(SYS_umount2, path, 0));
  }
  script->events.push_back(std::string("umount ") + path);
  errno = script->umount_error(++script->umount_calls);
  return errno == 0 ? 0 : -1;
}

extern "C" SENTROVA_API int kill(pid_t pid, int signal) noexcept {
  SystemScript* script = SystemScript::current;
  if (script == nullptr) {
    return static_cast<int>(syscall(SYS_kill, pid, signal));
  }
  script->events.push_back("kill " + std::to_string(pid) + " " + std::to_string(signal));
  return 0;
}

SENTROVA_API bool android::base::SetProperty(const std::string& name, const std::string& value) {
  CHECK(SystemScript::current != nullptr) << name << " set outside a script";
  SystemScript::current->events.push_back("set " + name + "=" + value);
  return true;
}
