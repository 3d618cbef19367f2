#include "cli/unlock_sequence.h"

#include <gtest/gtest.h>
#include <utils/Errors.h>

#include <map>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace {

using sentrova::DeviceState;
using sentrova::Readable;
using sentrova::UnlockMethod;

// Answers each operation as it is told, by its name in a trace; 0 otherwise.
class FakeService : public android::ISentrovaService {
 public:
  explicit FakeService(std::map<std::string, int32_t> answers) : answers_(std::move(answers)) {}
  int32_t getUserPassWordType(int userId) override { return answer("type", userId); }
  int32_t verifyUserPassWord(int userId, std::string password) override {
    answer("verify", userId);
    return password == "right" ? 0 : password == "dead" ? android::DEAD_OBJECT : -1;
  }
  int32_t fdeDecryptUser(int userId) override { return answer("fde", userId); }
  int32_t fbeDecryptMetadata() override { return answer("me", 10); }
  int32_t fbeDecryptUserDe(int userId) override { return answer("de", userId); }
  int32_t fbeDecryptUserCe(int userId, std::string password, bool flag) override {
    EXPECT_EQ(password, "right");
    EXPECT_FALSE(flag);
    return answer("ce", userId);
  }

  std::string trace;

 private:
  android::IBinder* onAsBinder() override { return nullptr; }

  int32_t answer(const std::string& operation, int user_id) {
    EXPECT_EQ(user_id, 10);
    trace += operation + " ";
    return answers_[operation];
  }

  std::map<std::string, int32_t> answers_;
};

// Gives one password after the other, then nothing more.
class FakeDialogue : public sentrova::UnlockDialogue {
 public:
  explicit FakeDialogue(const std::vector<std::string>& passwords) : passwords_(passwords) {}
  void begin(const std::string& step_name) override { begun_ = step_name; }
  void end(const sentrova::UnlockStep& step) override { EXPECT_EQ(step.name, begun_); }
  sentrova::PasswordInput ask_password() override {
    if (asked_ == passwords_.size()) {
      return {.password = "", .error = "end of input"};
    }
    return {.password = passwords_[asked_++], .error = ""};
  }
  int password_tries() const override { return 3; }

 private:
  const std::vector<std::string> passwords_;
  size_t asked_ = 0;
  std::string begun_;
};

constexpr auto kFileBased = UnlockMethod::kFileBased;
constexpr auto kFullDisk = UnlockMethod::kFullDisk;
constexpr auto kNothing = Readable::kNothing;
constexpr auto kSome = Readable::kDeviceEncrypted;
constexpr auto kAll = Readable::kEverything;
constexpr int32_t kDead = android::DEAD_OBJECT;

const struct {
  UnlockMethod method;
  std::map<std::string, int32_t> answers;
  std::vector<std::string> passwords;
  std::string trace;
  int status;
  Readable readable;
} kSequences[] = {
    {UnlockMethod::kNone, {}, {}, "", 0, kAll},
    {UnlockMethod::kUnknown, {}, {}, "", 4, kNothing},
    {kFullDisk, {}, {}, "fde ", 0, kAll},
    {kFullDisk, {{"fde", -1}}, {}, "fde ", 4, kNothing},
    {kFileBased, {}, {}, "me de type ", 0, kAll},
    {kFileBased, {{"me", -1}}, {}, "me ", 4, kNothing},
    {kFileBased, {{"me", kDead}}, {}, "me ", 3, kNothing},
    {kFileBased, {{"de", -1}}, {}, "me de ", 4, kNothing},
    {kFileBased, {{"de", 7}}, {}, "me de ", 4, kNothing},
    {kFileBased, {{"type", 2}}, {"right"}, "me de type verify ce ", 0, kAll},
    {kFileBased,
     {{"type", -1}},
     {"", "x", "right"},
     "me de type verify verify verify ce ",
     0,
     kAll},
    {kFileBased, {{"type", 2}}, {"", "x", "y"}, "me de type verify verify verify ", 1, kSome},
    {kFileBased, {{"type", 2}}, {"x"}, "me de type verify ", 2, kSome},  // the input ends
    {kFileBased, {{"type", 2}}, {"dead"}, "me de type verify ", 3, kSome},
    {kFileBased, {{"type", 2}, {"ce", -1}}, {"right"}, "me de type verify ce ", 4, kSome},
};

TEST(UnlockSequence, CallsInOrderUntilAStepFails) {
  for (const auto& c : kSequences) {
    SCOPED_TRACE(c.trace + std::to_string(c.status));
    FakeDialogue dialogue(c.passwords);
    const android::sp<FakeService> service = new FakeService(c.answers);
    DeviceState state;
    state.data.emplace();
    const sentrova::UnlockEnd end = sentrova::UnlockSequence(
                                        *service, 10, [&] { return state; }, dialogue)
                                        .run(c.method);
    EXPECT_EQ(service->trace, c.trace);
    EXPECT_EQ(end.status, c.status);
    EXPECT_EQ(end.readable, c.readable);
    EXPECT_EQ(end.error.empty(), c.status == 0) << end.error;
  }
}

TEST(UnlockSequence, FollowsWhatTheDeviceSays) {
  const struct {
    const char* type;
    bool encrypted;
    bool mounted;
    UnlockMethod method;
  } kDevices[] = {
      {"file", true, false, UnlockMethod::kFileBased},
      {"file", true, true, UnlockMethod::kFileBased},
      {"file", false, false, UnlockMethod::kFileBased},  // damaged, perhaps: the service tells
      {"file", false, true, UnlockMethod::kNone},
      {"block", true, false, UnlockMethod::kFullDisk},
      {"block", false, true, UnlockMethod::kNone},
      {"block", false, false, UnlockMethod::kUnknown},
      {"", false, true, UnlockMethod::kNone},
      {"", false, false, UnlockMethod::kUnknown},
  };
  for (const auto& c : kDevices) {
    DeviceState state;
    state.crypto_type = c.type;
    state.data = c.mounted ? std::optional(sentrova::Mount()) : std::nullopt;
    state.crypto_state = c.encrypted ? "encrypted" : "";
    EXPECT_EQ(sentrova::method_for(state), c.method)
        << c.type << " " << c.encrypted << " " << c.mounted;
  }
}

}  // namespace
