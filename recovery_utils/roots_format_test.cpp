#include <android-base/strings.h>
#include <stdint.h>
#include <sys/stat.h>

#include <map>
#include <regex>
#include <tuple>

#include "datadump/datadump.h"
#include "recovery_utils/roots_test.h"
#include "tests/support/process_limits.h"
#include "tests/support/signals.h"

namespace sentrova::testing {
namespace {

constexpr char kDevice[] = "/dev/volume";
constexpr char kMapped[] = "/dev/mapped";
const std::string kContent(4096, 'x');

class Format : public RootsTest {
 protected:
  // Begins with this line of an fstab as the table, a volume's device, a mapped one, tools that
  // succeed unless the commands, for which $tool is their name, tell otherwise, a reserved
  // partition without an armed dump, and no property.
  void begin(const std::string& row, const std::string& commands = "",
             const std::string& device = kDevice) {
    clear_machine();
    platform_.reset();
    platform_.ensure_unmounted = [](auto...) { return true; };
    make_file(kDevice, kContent);
    make_file(kMapped, kContent);
    make_file("/dev/block/by-name/reserved", std::string(512, '\0'));
    for (const std::string tool : {"mke2fs", "e2fsdroid", "make_f2fs", "sload_f2fs"}) {
      make_file("/system/bin/" + tool,
                "#!/bin/sh\necho \"$0 $*\"\ntool=" + tool + "\n" + commands + "\n");
      chmod(("/system/bin/" + tool).c_str(), 0755);
    }
    make_file("/dev/fstab", device + " " + row + "\n");
    Fstab table;
    ASSERT_TRUE(android::fs_mgr::ReadFstabFromFile("/dev/fstab", &table)) << row;
    set_table(table);
  }
  static void arm_dump(uint64_t offset) {
    ASSERT_EQ(datadump_enable(), 0);
    ASSERT_EQ(datadump_resize(offset), 0);
  }

  // Formats, and returns the base log's lines of the roots unit as "254 E text". Times change from
  // run to run. Keeps what the platform and the tools were asked to change, in order.
  Texts format(const std::string& volume, int result, const std::string& directory = "") {
    const std::string output =
        output_of([&] { return format_volume(volume, directory, revert_userdata_); }, result);
    Texts log;
    changes_.clear();
    for (const std::string& line : android::base::Split(output, "\n")) {
      if (line.find(" roots.cpp:") == 1) {
        log.push_back(std::regex_replace(line.substr(12, 4) + line.substr(0, 1) + line.substr(15),
                                         std::regex("(start= |end=|duration=)[0-9]+"), "$1N"));
      } else if (line.starts_with("ensure unmounted ") || line.starts_with("dm delete ") ||
                 line.starts_with("/system/bin/") || line.starts_with("[ROOTS]I: force")) {
        changes_.push_back(line);
      }
    }
    return log;
  }
  static Texts errors_of(Texts log) {
    std::erase_if(log, [](const std::string& line) { return line[4] != 'E'; });
    return log;
  }

  Texts changes_;
  bool revert_userdata_ = false;
};

TEST_F(Format, RunsTheToolsWithWhatRowAndPropertiesAskFor) {
  const std::string ext4 = "/system/bin/mke2fs -F -t ext4 -b 4096 ";
  const std::string f2fs = "/system/bin/make_f2fs -g android ";
  const std::tuple<std::string, const char*, std::string, std::string> cases[] = {
      {"/cache ext4 ro defaults", "/a dir", ext4 + "/dev/volume",
       "/system/bin/e2fsdroid -e -f /a dir -a /cache /dev/volume"},
      {"/data ext4 ro metadata_csum,fscompress,logicalblk=4096,eraseblk=524288,length=40960", "",
       ext4 + "-I 512 -O metadata_csum -O 64bit -O extent -E stride=2,stripe-width=128 /dev/volume "
              "10",
       ""},
      {"/cache ext4 ro logicalblk=16384,eraseblk=4096", "",
       ext4 + "-E stride=4,stripe-width=1 /dev/volume", ""},
      {"/cache ext4 ro logicalblk=8192", "", ext4 + "/dev/volume", ""},
      {"/cache ext4 ro eraseblk=8192", "", ext4 + "/dev/volume", ""},
      {"/cache ext4 ro length=4095", "", ext4 + "/dev/volume 0", ""},
      {"/cache f2fs ro length=4095", "", f2fs + "/dev/volume", ""},
      {"/data f2fs ro metadata_csum,fscompress,logicalblk=4096,eraseblk=4096,length=4096", "/d",
       f2fs + "-O project_quota,extra_attr -O casefold -C utf8 -O compression -O extra_attr"
              " /dev/volume 1",
       "/system/bin/sload_f2fs -f /d -t /data /dev/volume"},
  };
  for (const auto& [row, directory, make, fill] : cases) {
    SCOPED_TRACE(row);
    begin(row);
    SetProperty("external_storage.projid.enabled", "1");
    SetProperty("external_storage.casefold.enabled", "true");
    const std::string volume = row.substr(0, row.find(' '));
    const Texts log = format(volume, 0, directory);
    Texts expected{"ensure unmounted " + volume, make, fill};
    std::erase(expected, "");
    EXPECT_EQ(changes_, expected);
    EXPECT_THAT(errors_of(log), IsEmpty());
    EXPECT_EQ(log.front(), "238 I Formating " + volume + ", start= N");
    EXPECT_EQ(log.back(), (make.starts_with(ext4) ? "417" : "472") + (" I Formating " + volume) +
                              ", end=N, duration=N");
  }
}

TEST_F(Format, KeepsTheEndOfTheDeviceFree) {
  constexpr off64_t kSize = 64 << 20;
  const std::tuple<std::string, std::string, std::string> cases[] = {
      {"length=-16384", " 16380", ""},  {"forceencrypt=footer", " 16380", ""},
      {"forceencrypt=footers", "", ""}, {"forceencrypt=footer,length=8192", " 2", ""},
      {"length=-67108863", " 0", ""},   {"length=-67108864", "", "0"},
      {"length=-67108865", "", "-1"},   {"length=-9223372036854775808", "", "-9223372036787666944"},
  };
  for (const auto& [options, blocks, refused_size] : cases) {
    SCOPED_TRACE(options);
    begin("/cache ext4 ro " + options);
    ASSERT_EQ(truncate(kDevice, kSize), 0);
    const Texts log = format("/cache", refused_size.empty() ? 0 : -1);
    EXPECT_THAT(log, Each(Not(HasSubstr("Wiping")))) << "the key is no file";
    if (refused_size.empty()) {
      EXPECT_EQ(changes_.back(), "/system/bin/mke2fs -F -t ext4 -b 4096 /dev/volume" + blocks);
    } else {
      EXPECT_THAT(changes_, ElementsAre("ensure unmounted /cache"));
      EXPECT_THAT(errors_of(log), ElementsAre("359 E get_file_size: invalid size " + refused_size +
                                              " for /dev/volume"));
    }
  }
}

// Where a format of /data goes, and what becomes of the mapping and of the key.
TEST_F(Format, DecidesOnWhichDeviceTheDataLies) {
  const struct {
    const char* crypto;  // state, type, metadata encryption
    char flag;           // c: the caller reverts, a: a dump is armed, f: the revert fails
    const char* node;    // of the mapping; null if there is none
    std::vector<int> lines;
  } cases[] = {
      {"unencrypted block 1", 'c', kMapped, {280, 287, 331}},
      {"encrypted file 0", 'c', kMapped, {280, 287, 331}},
      {"encrypted block 0", '-', kMapped, {280, 287, 304, 331}},
      {"encrypted block 0", 'c', kMapped, {280, 287, 304, 328, 331}},
      {"encrypted file true", 'f', kMapped, {280, 287, 296, 304, 328, 331}},
      {"encrypted block 0", '-', nullptr, {280, 287, 310, 320, 328, 331}},
      {"encrypted block 0", '-', "", {280, 287, 304, 307, 320, 328, 331}},
      {"encrypted block 0", 'a', kMapped, {280, 287, 296, 304, 328, 331}},
      {"unencrypted none 0", 'a', kMapped, {280, 287, 331}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(std::string(c.crypto) + " " + c.flag);
    begin("/data f2fs ro forceencrypt=/dev/key");
    const Texts crypto = android::base::Split(c.crypto, " ");
    SetProperty("ro.crypto.state", crypto[0]);
    SetProperty("ro.crypto.type", crypto[1]);
    SetProperty("ro.crypto.metadata.enabled", crypto[2]);
    const bool armed = c.flag == 'a', fails = c.flag == 'f';
    if (armed) {
      arm_dump(7);
    }
    platform_.dm_state = [&](auto& name) {
      return c.node != nullptr && name == "userdata" ? DmDeviceState::SUSPENDED
                                                     : DmDeviceState::INVALID;
    };
    platform_.dm_node = [&](auto&) { return c.node; };
    platform_.dm_delete_error = [&](auto&) { return fails ? EIO : 0; };
    const bool reverts = c.lines.end()[-2] == 328;
    const bool in_place = c.lines.end()[-2] == 304;
    revert_userdata_ = c.flag == 'c';
    Texts decision = format("/data", 0);
    std::erase_if(decision, [](auto& line) { return line < "280" || line >= "332"; });
    EXPECT_EQ(revert_userdata_, c.flag == 'c' || reverts);
    const std::string target = in_place ? kMapped : kDevice;
    Texts expected{"ensure unmounted /data", reverts ? "dm delete userdata" : "",
                   "/system/bin/make_f2fs -g android " + target + (armed ? " 2097152" : "")};
    std::erase(expected, "");
    EXPECT_EQ(changes_, expected);
    EXPECT_EQ(std::filesystem::exists("/dev/key"), !in_place);

    const std::string node = c.node == nullptr ? "" : c.node;
    const std::string mapped = c.node != nullptr && node.empty() ? "/dev/block/dm-0" : node;
    const std::map<int, std::string> texts = {
        {280, std::string(" I datadump status =") + (armed ? "2" : "0")},
        {287, std::string(" I userdata partition reserved dump enable=") + (armed ? "1" : "0")},
        {296,
         " I datadump or metadata encrypt is enable, force revert userdata volume extend "
         "volume "},
        {304, " I format_volume: userdata Dm device is " + node},
        {307, " E format_volume: usedata Dm device miss, force set /dev/block/dm-0"},
        {310, " E format_volume: DeviceMapper state INVALID for userdata"},
        {320, " I " + mapped + " isn't exited, force revert userdata volume extend volume "},
        {328, " I cryptfs revert userdata volume extend volume " + mapped +
                  (fails ? " FAIL" : " SUCCESS")},
        {331, " I format_volume: will do format data volume " + target},
    };
    Texts lines;
    for (const int line : c.lines) {
      lines.push_back(std::to_string(line) + texts.at(line));
    }
    EXPECT_EQ(decision, lines);
  }
}

TEST_F(Format, RefusesWithoutTouchingTheDevice) {
  const std::tuple<const char*, const char*, const char*, bool, const char*> cases[] = {
      {"/none", "/cache ext4 ro defaults", kDevice, false, "242 E unknown volume \"/none\""},
      {"/tmp", "/tmp ramdisk ro defaults", kDevice, false, "246 E can't format_volume \"/tmp\""},
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
    begin(row, "", device);
    if (volume == std::string("/held")) {
      // Neither the platform nor force can unmount where the table of mounts cannot be read.
      platform_.ensure_unmounted = [](auto...) { return false; };
      set_mounted("");
    }
    EXPECT_THAT(errors_of(format(volume, -1)), ElementsAre(error));
    Texts expected(unmounts ? 1 : 0, std::string("ensure unmounted ") + volume);
    if (volume == std::string("/held")) {
      expected.push_back("[ROOTS]I: force umount volume /held :Failed...");
    }
    EXPECT_EQ(changes_, expected);
    EXPECT_EQ(content_of(kDevice), kContent);
  }
}

TEST_F(Format, EndsWithTheFirstToolThatFails) {
  const std::string ext4 = "413 E format_volume: Failed to make ext4 on /dev/volume: ";
  const std::string f2fs = "458 E format_volume: Failed to make_f2fs on /dev/volume: ";
  const std::string sload = "466 E format_volume: Failed to sload_f2fs on /dev/volume: ";
  const std::tuple<std::string, const char*, size_t, const char*, std::string> cases[] = {
      {"ext4", "sleep 0.1; exit 3", 1, "mke2fs failed with status 3", ext4},
      {"ext4", "[ $tool = mke2fs ] || exit 255", 2, "e2fsdroid failed with status 255", ext4},
      {"f2fs", "exit 3", 1, "make_f2fs failed with status 3", f2fs},
      {"f2fs", "[ $tool = make_f2fs ] || exit 4", 2, "sload_f2fs failed with status 4", sload},
      {"ext4", "rm /system/bin/e2fsdroid", 1, "e2fsdroid failed with status 1", ext4},
      // A tool that a signal killed goes for one that succeeded.
      {"ext4", "[ $tool != mke2fs ] || kill -9 $$", 2, "mke2fs failed with status 0", ""},
      {"f2fs", "[ $tool != make_f2fs ] || kill -6 $$", 2, "make_f2fs failed with status 0", ""},
  };
  for (const auto& [type, commands, tools_run, status, failure] : cases) {
    SCOPED_TRACE(type + ": " + commands);
    begin("/cache " + type + " ro defaults", commands);
    const RepeatedInterruption interruption;
    const Texts errors = errors_of(format("/cache", failure.empty() ? 0 : -1, "/d"));
    ASSERT_EQ(errors.size(), failure.empty() ? 1U : 2U);
    EXPECT_EQ(errors.front(), std::string("207 E /system/bin/") + status);
    EXPECT_TRUE(failure.empty() || errors.back().starts_with(failure));
    EXPECT_EQ(changes_.size(), 1 + tools_run);
  }
  begin("/cache ext4 ro defaults");
  {
    const ScopedSignalAction end_unknown(SIGCHLD, SIG_IGN);
    EXPECT_THAT(errors_of(format("/cache", -1)), ElementsAre(StartsWith(ext4)));
  }
  in_new_process([&] {
    ASSERT_TRUE(forbid_new_processes());
    EXPECT_THAT(errors_of(format("/cache", -1)),
                ElementsAre("195 E Failed to fork child process", StartsWith(ext4)));
  });
}

TEST_F(Format, GivesAnArmedDumpItsRoomAndClearsItsOffset) {
  const char* lose_partition = "rm -r /dev/block/by-name";
  const std::tuple<std::string, const char*, int, Texts> cases[] = {
      {"/data ext4 ro length=8192", "", 1, {"419"}},
      {"/data ext4 ro length=8192", lose_partition, -1, {"419", "421"}},
      {"/data f2fs ro length=8192", lose_partition, -1, {"474", "476"}},
      {"/cache ext4 ro defaults", "", 2, {}},
  };
  for (const auto& [row, commands, status, positions] : cases) {
    SCOPED_TRACE(row);
    begin(row, commands);
    arm_dump(4096);
    const Texts errors = errors_of(format(row.substr(0, row.find(' ')), 0));
    EXPECT_THAT(changes_.back(), EndsWith(positions.empty() ? "/volume" : "/volume 2097152"));
    EXPECT_EQ(datadump_get_status(), status);
    ASSERT_EQ(errors.size(), positions.size());
    for (size_t i = 0; i < errors.size(); ++i) {
      EXPECT_THAT(errors[i],
                  StartsWith(positions[i] + " E " +
                             (i == 0 ? "will to clear datadump offset flag: "
                                     : "clear datadump offset flag failed...: No such")));
    }
  }
}

}  // namespace
}  // namespace sentrova::testing
