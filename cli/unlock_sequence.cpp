#include "cli/unlock_sequence.h"

#include <utility>

#include "cli/service_client.h"
#include "common/wipe.h"

namespace sentrova {
namespace {

// The service passes it on to the decryption library; an unlock in the rescue environment has no
// use for it.
constexpr bool kNoFlag = false;

}  // namespace

UnlockMethod method_for(const DeviceState& state) {
  if (state.crypto_type == "file") {
    return state.encrypted() || !state.data ? UnlockMethod::kFileBased : UnlockMethod::kNone;
  }
  if (state.crypto_type == "block" && state.encrypted()) {
    return UnlockMethod::kFullDisk;
  }
  return state.data ? UnlockMethod::kNone : UnlockMethod::kUnknown;
}

UnlockSequence::UnlockSequence(android::ISentrovaService& service, int user_id,
                               std::function<DeviceState()> look, UnlockDialogue& dialogue)
    : service_(service), user_id_(user_id), look_(std::move(look)), dialogue_(dialogue) {}

UnlockSequence::Describe UnlockSequence::yes_or_no(const char* yes, const char* no) {
  return [yes, no](int32_t answer) {
    return answer == 0 ? Outcome{yes, true} : Outcome{no, false};
  };
}

UnlockEnd UnlockSequence::run(UnlockMethod method) {
  switch (method) {
    case UnlockMethod::kFileBased:
      return unlock_file_based();
    case UnlockMethod::kFullDisk:
      return unlock_full_disk();
    case UnlockMethod::kNone:
      readable_ = Readable::kEverything;
      return done();
    case UnlockMethod::kUnknown:
      break;
  }
  return stopped(-1,
                 "the device does not tell how its data is encrypted, and /data is not mounted; "
                 "--method names the way");
}

// Runs one call of the service, shown and timed.
int32_t UnlockSequence::call(const std::string& name, const std::function<int32_t()>& operation,
                             const Describe& describe) {
  dialogue_.begin(name);
  const auto start = std::chrono::steady_clock::now();
  const int32_t answer = operation();
  const auto time = std::chrono::steady_clock::now() - start;
  const Outcome outcome =
      is_transport_status(answer) ? Outcome{"no answer", false} : describe(answer);
  dialogue_.end({name, outcome.text, outcome.succeeded, time});
  return answer;
}

UnlockEnd UnlockSequence::unlock_full_disk() {
  const int32_t answer = call(
      "full-disk encryption", [this] { return service_.fdeDecryptUser(user_id_); },
      // Whether the volume opened is not in the answer: the daemon's exit code does not count.
      yes_or_no("the volume daemon is done", "the volume daemon failed or took too long"));
  if (answer != 0) {
    return stopped(answer, "the full-disk encryption stays locked");
  }
  readable_ = look_().data ? Readable::kEverything : Readable::kNothing;
  return done();
}

UnlockEnd UnlockSequence::unlock_file_based() {
  const int32_t metadata = unlock_metadata();
  if (metadata != 0) {
    return stopped(metadata, "the metadata encryption of /data stays locked");
  }
  const int32_t device_encrypted = unlock_device_encrypted();
  if (device_encrypted != 0) {
    return stopped(device_encrypted, look_().data ? "the device-encrypted storage stays locked"
                                                  : "/data cannot be mounted");
  }
  readable_ = Readable::kDeviceEncrypted;
  const int32_t type = ask_credential_type();
  if (is_transport_status(type)) {
    return stopped(type, "");
  }
  if (type != 0) {
    return unlock_with_password();
  }
  readable_ = Readable::kEverything;  // without a credential the step before unlocked that too
  return done();
}

int32_t UnlockSequence::unlock_metadata() {
  return call(
      "metadata encryption", [this] { return service_.fbeDecryptMetadata(); },
      [this](int32_t answer) {
        // The answer is the same where /data has no metadata encryption.
        const bool known = look_().metadata_encryption.value_or(false);
        return yes_or_no(known ? "unlocked" : "unlocked, or not in use", "locked")(answer);
      });
}

int32_t UnlockSequence::unlock_device_encrypted() {
  return call(
      "device-encrypted storage", [this] { return service_.fbeDecryptUserDe(user_id_); },
      yes_or_no("unlocked", "locked"));
}

int32_t UnlockSequence::ask_credential_type() {
  return call(
      "credential", [this] { return service_.getUserPassWordType(user_id_); },
      [](int32_t type) {
        return type == 0  ? Outcome{"none is set", true}
               : type < 0 ? Outcome{"of an unknown type", false}
                          : Outcome{"one is set (type " + std::to_string(type) + ")", true};
      });
}

UnlockEnd UnlockSequence::unlock_with_password() {
  for (int left = dialogue_.password_tries();; --left) {
    PasswordInput input = dialogue_.ask_password();
    const WipeOnExit wipe_password(input.password);
    if (!input.error.empty()) {
      return {.status = kExitUsage, .readable = readable_, .error = input.error};
    }
    const int32_t verified = call(
        "password", [&] { return service_.verifyUserPassWord(user_id_, input.password); },
        yes_or_no("right", "wrong"));
    if (verified == 0) {
      return unlock_credential_encrypted(input.password);
    }
    if (is_transport_status(verified)) {
      return stopped(verified, "");
    }
    if (left <= 1) {
      return {.status = kExitAnswerIsNo, .readable = readable_, .error = "the password is wrong"};
    }
  }
}

UnlockEnd UnlockSequence::unlock_credential_encrypted(const std::string& password) {
  const int32_t answer = call(
      "credential-encrypted storage",
      [&] { return service_.fbeDecryptUserCe(user_id_, password, kNoFlag); },
      yes_or_no("unlocked", "locked"));
  if (answer != 0) {
    return stopped(answer, "the credential-encrypted storage stays locked");
  }
  readable_ = Readable::kEverything;
  return done();
}

// `error` says why unless the call did not come to an answer.
UnlockEnd UnlockSequence::stopped(int32_t answer, const std::string& error) const {
  if (is_transport_status(answer)) {
    return {.status = kExitServiceUnavailable,
            .readable = readable_,
            .error = describe_transport_status(answer)};
  }
  return {.status = kExitServiceFailed, .readable = readable_, .error = error};
}

UnlockEnd UnlockSequence::done() const {
  return {.status = kExitSuccess, .readable = readable_, .error = ""};
}

}  // namespace sentrova
