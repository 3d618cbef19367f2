#include <android-base/properties.h>
#include <android-base/strings.h>
#include <gmock/gmock.h>
#include <stdint.h>
#include <string.h>
#include <sys/stat.h>

#include <map>
#include <regex>

#include "datadump/datadump.h"
#include "recovery_utils/roots.h"
#include "recovery_utils/roots_test.h"
#include "tests/support/fake_device_mapper.h"
#include "tests/support/process_limits.h"
#include "tests/support/signals.h"

namespace {

using android::base::ReadFileToString;
using android::base::SetProperty;
using android::base::WriteStringToFile;
using android::dm::DmDeviceState;
using android::fs_mgr::Fstab;
using sentrova::testing::RootsTest;
using ::testing::_;
using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::IsEmpty;
using ::testing::StartsWith;

using Lines = std::vector<std::string>;

constexpr char kCalls[] = "/dev/calls";  // the tools that ran, in order, a line each
constexpr char kHook[] = "/dev/hook";    // what the tools do, each told apart by its name in $tool
constexpr char kDevice[] = "/dev/volume";
constexpr char kMapped[] = "/dev/mapped";
constexpr char kReserved[] = "/dev/block/by-name/reserved";
const std::string kContent(4096, 'x');

// Stands in place of every tool.
constexpr char kTool[] =
    "#!/bin/sh\n"
    "echo \"$0 $*\" >>/dev/calls\n"
    "tool=${0##*/}\n"
    ". /dev/hook\n";

class Format : public RootsTest {
 protected:
  void SetUp() override {
    RootsTest::SetUp();
    if (IsSkipped()) {
      return;
    }
    system_ = std::make_unique<sentrova::testing::ScopedTmpfs>("/system");
    std::filesystem::create_directory("/system/bin");
    for (const std::string tool : {"mke2fs", "e2fsdroid", "make_f2fs", "sload_f2fs"}) {
      ASSERT_TRUE(WriteStringToFile(kTool, "/system/bin/" + tool, 0755, getuid(), getgid()));
    }
    android::base::SetLogger([this](auto, auto severity, auto, auto file, auto line, auto text) {
      if (file != nullptr && std::string(file) == "roots.cpp") {
        log_.push_back({line, (severity == android::base::ERROR ? "E " : "I ") + timeless(text)});
      }
    });
    begin();
  }
  void TearDown() override {
    android::base::SetLogger(android::base::StderrLogger);
    system_.reset();
    RootsTest::TearDown();
  }

  // Begins with a volume's device, a mapped one, tools that succeed, a reserved partition without
  // an armed dump, and no property.
  void begin() {
    clear_machine();
    platform_.reset();
    platform_.ensure_unmounted = [](auto...) { return true; };
    mapper_.reset();
    for (const char* path : {kDevice, kMapped}) {
      ASSERT_TRUE(WriteStringToFile(kContent, path));
    }
    ASSERT_TRUE(WriteStringToFile("", kCalls) && WriteStringToFile("", kHook));
    std::filesystem::create_directories("/dev/block/by-name");
    ASSERT_TRUE(WriteStringToFile(std::string(512, '\0'), kReserved));
    log_.clear();
  }
  static void set_hook(const std::string& commands) {
    ASSERT_TRUE(WriteStringToFile(commands + "\n", kHook));
  }
  static void arm_dump(uint64_t offset) {
    ASSERT_EQ(datadump_enable(), 0);
    ASSERT_EQ(datadump_resize(offset), 0);
  }
  // Makes the table this one line of an fstab, without its device.
  void set_row(const std::string& line, const std::string& device = kDevice) {
    const TemporaryFile file;
    Fstab table;
    ASSERT_TRUE(WriteStringToFile(device + " " + line + "\n", file.path));
    ASSERT_TRUE(android::fs_mgr::ReadFstabFromFile(file.path, &table)) << line;
    set_table(table);
  }

  // What the platform and the tools were asked to change, in order.
  Lines calls() const {
    Lines lines;
    for (const std::string& call : platform_.calls) {
      if (call.starts_with("ensure unmounted ") || call.starts_with("dm delete ")) {
        lines.push_back(call);
      }
    }
    const Lines tools = android::base::Split(content(kCalls), "\n");
    lines.insert(lines.end(), tools.begin(), tools.end() - 1);
    return lines;
  }
  static std::string content(const std::string& path) {
    std::string text;
    return ReadFileToString(path, &text) ? text : "(none)";
  }
  // The base log's lines of the roots unit as "254 E text", those from one line number to another.
  Lines log(unsigned int first = 0, unsigned int last = UINT_MAX) const {
    Lines lines;
    for (const auto& [line, text] : log_) {
      if (line >= first && line <= last) {
        lines.push_back(std::to_string(line) + " " + text);
      }
    }
    return lines;
  }
  Lines errors() const {
    Lines lines = log();
    std::erase_if(lines, [](const std::string& line) { return line[4] != 'E'; });
    return lines;
  }

  FakeDeviceMapper& mapper_ = FakeDeviceMapper::instance();

 private:
  // Times change from run to run.
  static std::string timeless(const std::string& text) {
    return std::regex_replace(text, std::regex("(start= |end=|duration=)[0-9]+"), "$1N");
  }

  std::unique_ptr<sentrova::testing::ScopedTmpfs> system_;
  std::vector<std::pair<unsigned int, std::string>> log_;
};

TEST_F(Format, RunsTheToolsWithWhatRowAndPropertiesAskFor) {
  const std::string ext4 = "/system/bin/mke2fs -F -t ext4 -b 4096 ";
  const std::string f2fs = "/system/bin/make_f2fs -g android ";
  const struct {
    std::string row;
    const char* directory;
    std::string make;
    std::string fill;
  } cases[] = {
      {"/cache ext4 ro defaults", "", ext4 + "/dev/volume", ""},
      {"/cache ext4 ro defaults", "/a dir", ext4 + "/dev/volume",
       "/system/bin/e2fsdroid -e -f /a dir -a /cache /dev/volume"},
      {"/data ext4 ro metadata_csum,fscompress,logicalblk=4096,eraseblk=524288,length=40960", "/d",
       ext4 +
           "-I 512 -O metadata_csum -O 64bit -O extent -E stride=2,stripe-width=128 /dev/volume 10",
       "/system/bin/e2fsdroid -e -f /d -a /data /dev/volume"},
      {"/cache ext4 ro logicalblk=16384,eraseblk=4096", "",
       ext4 + "-E stride=4,stripe-width=1 /dev/volume", ""},
      {"/cache ext4 ro logicalblk=8192", "", ext4 + "/dev/volume", ""},
      {"/cache ext4 ro eraseblk=8192", "", ext4 + "/dev/volume", ""},
      {"/cache ext4 ro length=4095", "", ext4 + "/dev/volume 0", ""},
      {"/cache f2fs ro length=4095", "", f2fs + "/dev/volume", ""},
      {"/cache f2fs ro defaults", "/d", f2fs + "/dev/volume",
       "/system/bin/sload_f2fs -f /d -t /cache /dev/volume"},
      {"/data f2fs ro metadata_csum,fscompress,logicalblk=4096,eraseblk=4096,length=4096", "/d",
       f2fs + "-O project_quota,extra_attr -O casefold -C utf8 -O compression -O extra_attr"
              " /dev/volume 1",
       "/system/bin/sload_f2fs -f /d -t /data /dev/volume"},
  };
  for (const auto& [row, directory, make, fill] : cases) {
    SCOPED_TRACE(row);
    begin();
    SetProperty("external_storage.projid.enabled", "1");
    SetProperty("external_storage.casefold.enabled", "true");
    set_row(row);
    const std::string volume = row.substr(0, row.find(' '));
    EXPECT_EQ(format_volume(volume, directory), 0);
    Lines expected{"ensure unmounted " + volume, make, fill};
    std::erase(expected, "");
    EXPECT_EQ(calls(), expected);
    EXPECT_THAT(errors(), IsEmpty());
    const std::string end = make.starts_with(ext4) ? "417" : "472";
    EXPECT_EQ(log().front(), "238 I Formating " + volume + ", start= N");
    EXPECT_EQ(log().back(), end + " I Formating " + volume + ", end=N, duration=N");
  }
}

TEST_F(Format, KeepsTheEndOfTheDeviceFree) {
  constexpr off64_t kSize = 64 << 20;
  const struct {
    std::string options;
    std::string blocks;
    std::string refused_size;
  } cases[] = {
      {"length=-16384", " 16380", ""},
      {"forceencrypt=footer", " 16380", ""},
      {"forceencrypt=footers", "", ""},
      {"forceencrypt=footer,length=-4096", " 16383", ""},
      {"forceencrypt=footer,length=8192", " 2", ""},
      {"length=-67108863", " 0", ""},
      {"length=-67108864", "", "0"},
      {"length=-67108865", "", "-1"},
      {"length=-9223372036854775808", "", "-9223372036787666944"},
  };
  for (const auto& [options, blocks, refused_size] : cases) {
    SCOPED_TRACE(options);
    begin();
    ASSERT_EQ(truncate(kDevice, kSize), 0);
    set_row("/cache ext4 ro " + options);
    EXPECT_EQ(format_volume("/cache"), refused_size.empty() ? 0 : -1);
    EXPECT_EQ(calls().back(), refused_size.empty()
                                  ? "/system/bin/mke2fs -F -t ext4 -b 4096 /dev/volume" + blocks
                                  : "ensure unmounted /cache");
    if (!refused_size.empty()) {
      EXPECT_THAT(errors(), ElementsAre("359 E get_file_size: invalid size " + refused_size +
                                        " for /dev/volume"));
    }
  }
}

// What a decision logs at a line, told by what it found.
std::string decision_line(int line, const std::string& status, const std::string& node,
                          const std::string& mapped, const char* reverted, const char* target) {
  const std::map<int, std::string> texts = {
      {280, "I datadump status =" + status},
      {287, "I userdata partition reserved dump enable=" + std::string(status == "2" ? "1" : "0")},
      {296,
       "I datadump or metadata encrypt is enable, force revert userdata volume extend volume "},
      {304, "I format_volume: userdata Dm device is " + node},
      {307, "E format_volume: usedata Dm device miss, force set /dev/block/dm-0"},
      {310, "E format_volume: DeviceMapper state INVALID for userdata"},
      {320, "I " + mapped + " isn't exited, force revert userdata volume extend volume "},
      {328, "I cryptfs revert userdata volume extend volume " + mapped + reverted},
      {331, std::string("I format_volume: will do format data volume ") + target},
  };
  return std::to_string(line) + " " + texts.at(line);
}

// Where a format of /data goes, and what becomes of the mapping and of the key.
TEST_F(Format, DecidesOnWhichDeviceTheDataLies) {
  const struct {
    const char* crypto;  // state, type, metadata encryption
    const char* flags;   // c: the caller reverts, a: a dump is armed, f: the revert fails
    const char* node;    // of the mapping; null if there is none
    std::vector<int> lines;
  } cases[] = {
      {"unencrypted block 1", "c", kMapped, {280, 287, 331}},
      {"encrypted file 0", "c", kMapped, {280, 287, 331}},
      {"encrypted block 0", "", kMapped, {280, 287, 304, 331}},
      {"encrypted block 0", "c", kMapped, {280, 287, 304, 328, 331}},
      {"encrypted file true", "", kMapped, {280, 287, 296, 304, 328, 331}},
      {"encrypted none 1", "f", kMapped, {280, 287, 296, 304, 328, 331}},
      {"encrypted block 0", "", nullptr, {280, 287, 310, 320, 328, 331}},
      {"encrypted block 0", "", "/dev/none", {280, 287, 304, 320, 328, 331}},
      {"encrypted block 0", "", "", {280, 287, 304, 307, 320, 328, 331}},
      {"encrypted block 0", "a", kMapped, {280, 287, 296, 304, 328, 331}},
      {"unencrypted none 0", "a", kMapped, {280, 287, 331}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(std::string(c.crypto) + " " + c.flags);
    begin();
    const Lines crypto = android::base::Split(c.crypto, " ");
    SetProperty("ro.crypto.state", crypto[0]);
    SetProperty("ro.crypto.type", crypto[1]);
    SetProperty("ro.crypto.metadata.enabled", crypto[2]);
    const bool armed = *c.flags == 'a', fails = *c.flags == 'f', caller_reverts = *c.flags == 'c';
    if (armed) {
      arm_dump(7);
    }
    mapper_.state = [&](const auto& name) {
      return c.node != nullptr && name == "userdata" ? DmDeviceState::SUSPENDED
                                                     : DmDeviceState::INVALID;
    };
    mapper_.node = [&](auto&) { return c.node; };
    mapper_.delete_error = [&](auto&) {
      EXPECT_EQ(content(kCalls), "") << "a tool ran before the revert";
      return fails ? EIO : 0;
    };
    const bool reverts = c.lines.end()[-2] == 328;
    const bool in_place = c.lines.end()[-2] == 304;
    set_row("/data f2fs ro forceencrypt=/dev/key");
    bool revert_userdata = caller_reverts;
    EXPECT_EQ(format_volume("/data", revert_userdata), 0);
    EXPECT_EQ(revert_userdata, caller_reverts || reverts);
    const std::string target = in_place ? kMapped : kDevice;
    Lines expected{"ensure unmounted /data", reverts ? "dm delete userdata" : "",
                   "/system/bin/make_f2fs -g android " + target + (armed ? " 2097152" : "")};
    std::erase(expected, "");
    EXPECT_EQ(calls(), expected);
    EXPECT_EQ(std::filesystem::exists("/dev/key"), !in_place);
    const std::string node = c.node == nullptr ? "" : c.node;
    const std::string mapped = c.node != nullptr && node.empty() ? "/dev/block/dm-0" : node;
    Lines decision;
    for (const int line : c.lines) {
      decision.push_back(decision_line(line, armed ? "2" : "0", node, mapped,
                                       fails ? " FAIL" : " SUCCESS", target.c_str()));
    }
    EXPECT_EQ(log(280, 331), decision);
  }
}

TEST_F(Format, RefusesWithoutTouchingTheDevice) {
  const struct {
    const char* volume;
    const char* row;
    const char* device;
    bool unmounts;
    const char* error;
  } cases[] = {
      {"/none", "/cache ext4 ro defaults", kDevice, false, "242 E unknown volume \"/none\""},
      {"/tmp", "/tmp ramdisk ro defaults", kDevice, false, "246 E can't format_volume \"/tmp\""},
      {"/cache/", "/cache ext4 ro defaults", kDevice, false,
       "250 E can't give path \"/cache/\" to format_volume"},
      {"/data/media", "/data ext4 ro defaults", kDevice, false,
       "250 E can't give path \"/data/media\" to format_volume"},
      {"/held", "/held vfat ro defaults", kDevice, true,
       "254 E format_volume: Failed to unmount \"/held\""},
      {"/cache", "/cache vfat ro defaults", kDevice, true,
       "258 E format_volume: fs_type \"vfat\" unsupported"},
      {"/cache", "/cache f2fs ro forceencrypt=/dev/none/key", kDevice, true,
       "341 E format_volume: Failed to open /dev/none/key: No such file or directory"},
      {"/cache", "/cache ext4 ro length=-1", "/dev/none", true,
       "354 E format_volume: failed to open /dev/none: No such file or directory"},
      {"/cache", "/cache ext4 ro length=-1", "/dev/block", true,
       "359 E get_file_size: invalid size 0 for /dev/block"},
  };
  for (const auto& [volume, row, device, unmounts, error] : cases) {
    SCOPED_TRACE(error);
    begin();
    set_row(row, device);
    // Neither the platform nor force can unmount where the table of mounts cannot be read.
    const bool held = std::string(volume) == "/held";
    platform_.ensure_unmounted = [held](auto...) { return !held; };
    {
      const auto no_mounts =
          held ? std::make_unique<sentrova::testing::ScopedTmpfs>("/proc") : nullptr;
      EXPECT_EQ(format_volume(volume), -1);
    }
    EXPECT_EQ(calls(), unmounts ? Lines{std::string("ensure unmounted ") + volume} : Lines{});
    EXPECT_THAT(errors(), ElementsAre(error));
    EXPECT_EQ(content(kDevice), kContent);
  }
}

TEST_F(Format, EndsWithTheFirstToolThatFails) {
  const std::string ext4 = "413 E format_volume: Failed to make ext4 on /dev/volume: ";
  const std::string f2fs = "458 E format_volume: Failed to make_f2fs on /dev/volume: ";
  const std::string sload = "466 E format_volume: Failed to sload_f2fs on /dev/volume: ";
  const auto status = [](const std::string& tool, int code) {
    return "207 E /system/bin/" + tool + " failed with status " + std::to_string(code);
  };
  const struct {
    const char* type;
    const char* hook;
    int result;
    size_t tools;  // that were run
    Lines errors;  // how they begin
  } cases[] = {
      {"ext4", "exit 3", -1, 1, {status("mke2fs", 3), ext4}},
      {"ext4", "[ $tool = mke2fs ] || exit 255", -1, 2, {status("e2fsdroid", 255), ext4}},
      {"f2fs", "exit 3", -1, 1, {status("make_f2fs", 3), f2fs}},
      {"f2fs", "[ $tool = make_f2fs ] || exit 4", -1, 2, {status("sload_f2fs", 4), sload}},
      {"ext4", "sleep 0.1; exit 3", -1, 1, {status("mke2fs", 3), ext4}},
      // A tool that a signal killed goes for one that succeeded.
      {"ext4", "kill -9 $$", 0, 2, {status("mke2fs", 0), status("e2fsdroid", 0)}},
      {"f2fs", "kill -ABRT $$", 0, 2, {status("make_f2fs", 0), status("sload_f2fs", 0)}},
      {"ext4", "rm /system/bin/e2fsdroid", -1, 1, {status("e2fsdroid", 1), ext4}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(std::string(c.type) + ": " + c.hook);
    begin();
    set_hook(c.hook);
    const sentrova::testing::RepeatedInterruption interruption;
    set_row(std::string("/cache ") + c.type + " ro defaults");
    EXPECT_EQ(format_volume("/cache", "/d"), c.result);
    EXPECT_EQ(calls().size(), 1 + c.tools);
    const Lines logged = errors();
    ASSERT_EQ(logged.size(), c.errors.size());
    for (size_t i = 0; i < logged.size(); ++i) {
      EXPECT_THAT(logged[i], StartsWith(c.errors[i]));
    }
  }
}

TEST_F(Format, FailsWithAToolThatCannotBeStartedOrWhoseEndIsUnknown) {
  set_row("/cache ext4 ro defaults");
  chmod(kCalls, 0666);
  const std::string failed = "413 E format_volume: Failed to make ext4 on /dev/volume: ";
  {
    const sentrova::testing::ScopedSignalAction no_children(SIGCHLD, SIG_IGN);
    EXPECT_EQ(format_volume("/cache"), -1);
    EXPECT_THAT(errors(), ElementsAre(failed + "No child processes"));
  }
  in_new_process([&] {
    ASSERT_TRUE(sentrova::testing::forbid_new_processes());
    EXPECT_EQ(format_volume("/cache"), -1);
    EXPECT_THAT(errors(), ElementsAre(_, "195 E Failed to fork child process", StartsWith(failed)));
  });
}

TEST_F(Format, GivesAnArmedDumpItsRoomAndClearsItsOffset) {
  const struct {
    const char* row;
    const char* hook;
    int status;  // of the dump afterwards
    Lines errors;
  } cases[] = {
      {"/data ext4 ro length=8192", "", 1, {"419"}},
      {"/data ext4 ro length=8192", "rm -r /dev/block/by-name", -1, {"419", "421"}},
      {"/data f2fs ro length=8192", "", 1, {"474"}},
      {"/data f2fs ro length=8192", "rm -r /dev/block/by-name", -1, {"474", "476"}},
      {"/cache ext4 ro defaults", "", 2, {}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.row);
    begin();
    arm_dump(4096);
    set_hook(c.hook);
    set_row(c.row);
    EXPECT_EQ(format_volume(std::string(c.row, strcspn(c.row, " "))), 0);
    EXPECT_THAT(calls().back(), EndsWith(c.errors.empty() ? "/dev/volume" : "/dev/volume 2097152"));
    EXPECT_EQ(datadump_get_status(), c.status);
    const Lines logged = errors();
    ASSERT_EQ(logged.size(), c.errors.size());
    for (size_t i = 0; i < logged.size(); ++i) {
      EXPECT_THAT(
          logged[i],
          StartsWith(c.errors[i] + (i == 0 ? " E will to clear datadump offset flag: "
                                           : " E clear datadump offset flag failed...: No such ")));
    }
  }
}

}  // namespace
