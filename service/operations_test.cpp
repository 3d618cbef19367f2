#include <android-base/properties.h>
#include <android-base/strings.h>
#include <gtest/gtest.h>
#include <stdio.h>
#include <sys/stat.h>
#include <sys/wait.h>

#include <climits>
#include <filesystem>
#include <functional>
#include <optional>
#include <string>

#include "recovery_utils/roots_ex.h"
#include "recovery_utils/roots_test.h"
#include "service/sentrova_service.h"
#include "tests/support/fake_credential_library.h"
#include "tests/support/fake_decryption_library.h"
#include "tests/support/freed_block.h"
#include "tests/support/process_limits.h"
#include "tests/support/sleep_script.h"

namespace {

constexpr char kPassword[] = "hunter2";
constexpr int kMountError = 7;
std::string failing_event;

// The outside world tells its part on standard output, between the service's own messages. Returns
// whether the event is not the one that is to fail.
bool tell(const std::string& event) {
  printf("> %s\n", event.c_str());
  return failing_event.empty() || !event.starts_with(failing_event);
}

}  // namespace

// In place of the property store and the vendor mount path.
bool android::base::SetProperty(const std::string& key, const std::string& value) {
  return tell("set " + key + "=" + value);
}
int zuno_fs_mgr_do_mount_one(const std::string& path) {
  return tell("mount " + path) ? 0 : kMountError;
}

namespace {

using android::SentrovaService;

class Operations : public sentrova::testing::RootsTest {
 protected:
  Operations() {
    failing_event.clear();
    credentials_.on_call = tell;
    credentials_.matches = [](const std::string& password) { return password == kPassword; };
    decryption_.metadata = [] { return tell("Decrypt_ME"); };
    decryption_.device_encrypted = [] { return tell("Decrypt_DE"); };
    decryption_.user = [](int user_id, const std::string& secret, bool flag) {
      return tell("Decrypt_User " + std::to_string(user_id) + " " + secret + (flag ? " 1" : " 0"));
    };
  }
  ~Operations() override {
    credentials_.reset();
    decryption_.reset();
  }

  // Expects what the operation and the world around it tell, less the toolkit's part. The password
  // stands nowhere in the messages.
  void expect(const std::function<int32_t(SentrovaService&)>& operation, int32_t result,
              const std::string& expected) {
    int32_t actual = 12345;
    std::string trace;
    for (const std::string& line :
         android::base::Split(output_of([&] { actual = operation(*service_); }), "\n")) {
      EXPECT_TRUE(line.starts_with(">") || line.find(kPassword) == std::string::npos) << line;
      trace += line.starts_with("[ZunoFunc]") ? "" : line + "\n";
    }
    EXPECT_EQ(trace, expected + "\n");
    EXPECT_EQ(actual, result);
  }

  FakeCredentialLibrary& credentials_ = FakeCredentialLibrary::instance();
  FakeDecryptionLibrary& decryption_ = FakeDecryptionLibrary::instance();
  android::sp<SentrovaService> service_ = new SentrovaService();
};

// Whatever user is named, the owner's credential is asked about.
constexpr auto kType = [](SentrovaService& s) { return s.getUserPassWordType(10); };
constexpr auto kVerify = [](SentrovaService& s) { return s.verifyUserPassWord(10, kPassword); };
constexpr auto kVerifyWrong = [](SentrovaService& s) { return s.verifyUserPassWord(10, ""); };
constexpr auto kFullDisk = [](SentrovaService& s) { return s.fdeDecryptUser(10); };
constexpr auto kMetadata = [](SentrovaService& s) { return s.fbeDecryptMetadata(); };
constexpr auto kDeviceEncrypted = [](SentrovaService& s) { return s.fbeDecryptUserDe(10); };
constexpr auto kRight = [](SentrovaService& s) { return s.fbeDecryptUserCe(10, kPassword, true); };
constexpr auto kWrong = [](SentrovaService& s) { return s.fbeDecryptUserCe(10, "hunter3", true); };

const std::string kInfo = "[SentrovaService]I: [FBE] ";
const std::string kError = "[SentrovaService]E: [FBE] ";
const std::string kSuccess = "> set recovery.crypto.decrypt.result=success\n";
const std::string kFail = "> set recovery.crypto.decrypt.result=fail\n";
const std::string kKeystore = kInfo + "Starting keystore...\n> set ctl.start=keystore2\n";
const std::string kManager = "> manager 0\n";
const std::string kManagerGone = "> storage gone 2\n> storage gone 1\n";
const std::string kMount = "> mount /data\n";
const std::string kStatus = kMount + "> Decrypt_DE\n" + kManager + "> status\n";
const std::string kNoCredential =
    kStatus + kInfo +
    "password isn't enable. Decrypt the CE data of user 0 directly\n> Decrypt_User 10 ~ 0\n";
const std::string kPassed = kManager + "> verify hunter2\n" + kInfo +
                            "password verify pass, start decrypt ce for user 10\n"
                            "> Decrypt_User 10 hunter2 1\n";

const struct {
  std::string world;  // what is different, or the event that fails
  int32_t (*operation)(SentrovaService&);
  int32_t result;
  std::string trace;
} kCases[] = {
    {"", kType, 0, kManager + "> status\n" + kManagerGone},
    {"", kVerify, 0, kManager + "> verify hunter2\n" + kManagerGone},
    {"", kVerifyWrong, -1, kManager + "> verify \n" + kManagerGone},
    {"", kMetadata, 0, kKeystore + "> Decrypt_ME\n" + kSuccess},
    {"Decrypt_ME", kMetadata, -1, kKeystore + "> Decrypt_ME\n" + kFail},
    {"no metadata encryption", kMetadata, 0,
     kKeystore + kInfo + "metadata encryption is define, Skip decrypt metadata\n"},
    {"no row", kMetadata, -1, kKeystore + kError + "Fail to find /data entry in fstab\n"},
    {"mount", kDeviceEncrypted, kMountError,
     kMount + "[SentrovaService]E: fbeDecryptUserDe fail to do mount data result is 7!!!\n"},
    {"Decrypt_DE", kDeviceEncrypted, -1,
     kMount + "> Decrypt_DE\n" + kError + "Fail to decrypt DE data.\n" + kFail},
    {"credential", kDeviceEncrypted, 0,
     kStatus + kInfo + "password is enable. Decrypt CE data when verify password\n" + kManagerGone +
         kSuccess},
    {"", kDeviceEncrypted, 0, kNoCredential + kManagerGone + kSuccess},
    {"Decrypt_User", kDeviceEncrypted, -1,
     kNoCredential + kError + "Fail to decrypt CE data.\n" + kManagerGone + kFail},
    {"", kRight, 0, kPassed + kManagerGone},
    {"Decrypt_User", kRight, -1, kPassed + kError + "fail to decrypt user 10 ce\n" + kManagerGone},
    {"", kWrong, -1, kManager + "> verify hunter3\n" + kManagerGone},
};

TEST_F(Operations, TellAskAndPublishInOrder) {
  for (const auto& c : kCases) {
    SCOPED_TRACE(c.world + ": " + c.trace);
    failing_event = c.world;
    credentials_.lock_status = c.world == "credential" ? -1 : 0;
    auto row = sentrova::testing::fstab_row("/dev/u", "/data", "f2fs");
    row.fs_mgr_flags.file_encryption = true;
    row.metadata_key_dir = c.world == "no metadata encryption" ? "" : "/metadata/vold";
    set_table(c.world == "no row" ? android::fs_mgr::Fstab{} : android::fs_mgr::Fstab{row});
    expect(c.operation, c.result, c.trace);
  }
  EXPECT_TRUE(credentials_.storage_was_zero);
}

TEST_F(Operations, MapEveryLockStatus) {
  const std::pair<int, int32_t> rows[] = {{1, 11}, {2, 12}, {3, 13},  {4, 2},
                                          {5, 3},  {6, -1}, {-1, -1}, {INT_MIN, -1}};
  credentials_.on_call = [](const auto&) {};
  for (const auto& [lock_status, type] : rows) {
    credentials_.lock_status = lock_status;
    EXPECT_EQ(service_->getUserPassWordType(0), type) << "lock status " << lock_status;
  }
}

TEST_F(Operations, HandOutTheirOnlyCopyOfAPasswordAndWipeIt) {
  std::optional<sentrova::FreedBlock> handed_out;
  credentials_.matches = [](const auto&) { return true; };
  decryption_.user = [&](int, const std::string& secret, bool) {
    handed_out.emplace(secret.data());
    return true;
  };
  output_of([&] { service_->fbeDecryptUserCe(0, std::string(1000, 'x'), false); });
  ASSERT_TRUE(handed_out);
  EXPECT_EQ(handed_out->state(), sentrova::FreedBlock::kWiped);
}

// Waits until a child has ended and leaves it to be reaped.
void await_end_of_child() {
  siginfo_t info;
  EXPECT_EQ(waitid(P_ALL, 0, &info, WEXITED | WNOWAIT), 0);
}

TEST_F(Operations, SucceedWithADaemonThatEndsInTimeWhateverItsExitCode) {
  constexpr char kDaemon[] = "/system/bin/zuno_vold";
  const std::string head = "[SentrovaService]I: [FDE] ";
  const std::string success = head + "Success to execute " + kDaemon + " ...\n\n" + kSuccess;
  const std::string fail = head + "Fail to execute " + kDaemon + " ...\n\n" + kFail;
  const sentrova::testing::ScopedTmpfs system("/system");
  std::filesystem::create_directories("/system/bin");
  const struct {
    std::string commands;
    bool succeeds;
    size_t seconds_until_it_ends;
  } kDaemons[] = {{"", true, 1},  // it cannot be started
                  {"exit $#", true, 10},
                  {"exit 1", true, 10},
                  {"kill -9 $$", false, 1},
                  {"kill -STOP $$", false, 11}};  // until it is killed
  for (const auto& c : kDaemons) {
    SCOPED_TRACE(c.commands);
    if (!c.commands.empty()) {
      ASSERT_TRUE(android::base::WriteStringToFile("#!/bin/sh\n" + c.commands + "\n", kDaemon));
      ASSERT_EQ(chmod(kDaemon, 0755), 0);
    }
    const sentrova::testing::SleepScript sleeps([&](size_t count) {
      if (count == c.seconds_until_it_ends) {
        await_end_of_child();
      }
    });
    expect(kFullDisk, c.succeeds ? 0 : -1, c.succeeds ? success : fail);
    if (c.seconds_until_it_ends > 10) {
      EXPECT_EQ(sleeps.microseconds().size(), c.seconds_until_it_ends);
    }
    EXPECT_EQ(waitpid(-1, nullptr, WNOHANG), -1) << "something is left running";
  }
  in_new_process([&] {
    ASSERT_TRUE(sentrova::testing::forbid_new_processes());
    expect(kFullDisk, 0, success);  // there is no child to wait for
  });
}

}  // namespace
