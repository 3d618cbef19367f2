#include "cli/unlock_command.h"

#include <stdio.h>
#include <unistd.h>

#include <nlohmann/json.hpp>
#include <optional>

#include "cli/progress.h"
#include "cli/service_client.h"
#include "cli/unlock_sequence.h"

namespace sentrova {
namespace {

constexpr int kTriesOnTerminal = 3;

// Shows the steps as they happen and collects them for the JSON object.
class OutputDialogue : public UnlockDialogue {
 public:
  explicit OutputDialogue(const Output& output) : output_(output) {}

  void begin(const std::string& step_name) override {
    output_.progress(step_name + ": ");
    // On a terminal the step's name stands before it.
    progress_.emplace(output_.to_terminal() ? "" : step_name);
  }

  void end(const UnlockStep& step) override {
    progress_.reset();
    char seconds[32];
    snprintf(seconds, sizeof(seconds), " (%.2f s)\n", step.time.count());
    output_.progress(step.outcome + seconds);
    steps_.push_back({{"step", step.name},
                      {"outcome", step.outcome},
                      {"succeeded", step.succeeded},
                      {"seconds", step.time.count()}});
  }

  PasswordInput ask_password() override { return read_password("Password: "); }

  int password_tries() const override { return isatty(STDIN_FILENO) != 0 ? kTriesOnTerminal : 1; }

  const nlohmann::json& steps() const { return steps_; }

 private:
  const Output& output_;
  std::optional<Progress> progress_;  // of the step that is under way
  nlohmann::json steps_ = nlohmann::json::array();
};

UnlockMethod chosen_method(const std::string& name, const DeviceState& state) {
  return name == kMethodFileBased  ? UnlockMethod::kFileBased
         : name == kMethodFullDisk ? UnlockMethod::kFullDisk
                                   : method_for(state);
}

nlohmann::json method_name(UnlockMethod method) {
  switch (method) {
    case UnlockMethod::kNone:
      return "none";
    case UnlockMethod::kFileBased:
      return kMethodFileBased;
    case UnlockMethod::kFullDisk:
      return kMethodFullDisk;
    case UnlockMethod::kUnknown:
      break;
  }
  return nullptr;
}

const char* describe_readable(Readable readable) {
  switch (readable) {
    case Readable::kNothing:
      break;
    case Readable::kDeviceEncrypted:
      return "device-encrypted storage only";
    case Readable::kEverything:
      return "everything";
  }
  return "nothing";
}

ExitStatus report(UnlockMethod method, const UnlockEnd& end, const nlohmann::json& steps,
                  const Output& output) {
  const DeviceState state = read_device_state();
  const char* readable = describe_readable(end.readable);
  const nlohmann::json object = {{"method", method_name(method)},
                                 {"steps", steps},
                                 {"readable", readable},
                                 {"decrypt_result", or_null(state.decrypt_result)},
                                 {"data", mount_as_json(state.data)}};
  const std::string text =
      std::string("readable now: ") + readable + "; /data: " + describe_data(state);
  if (end.error.empty()) {
    output.result(text, object);
  } else {
    output.progress(text + "\n");
    output.error(end.error, object);
  }
  return end.status;
}

}  // namespace

ExitStatus unlock_data(int user_id, const std::string& method_name, const Output& output) {
  const ServiceConnection connection = connect_to_service();
  if (connection.service == nullptr) {
    output.error(connection.error);
    return kExitServiceUnavailable;
  }
  const UnlockMethod method = chosen_method(method_name, read_device_state());
  if (method == UnlockMethod::kNone) {
    output.progress("the data is not encrypted\n");
  }
  OutputDialogue dialogue(output);
  const UnlockEnd end =
      UnlockSequence(*connection.service, user_id, read_device_state, dialogue).run(method);
  return report(method, end, dialogue.steps(), output);
}

}  // namespace sentrova
