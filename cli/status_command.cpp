#include "cli/status_command.h"

#include <nlohmann/json.hpp>
#include <optional>
#include <string>

#include "cli/device_state.h"
#include "cli/service_client.h"

namespace sentrova {
namespace {

struct CredentialAnswer {
  int32_t type = -1;  // a negative one is not known
  std::string error;  // why the service did not answer
};

CredentialAnswer ask_credential_type(int user_id) {
  const ServiceConnection connection = connect_to_service();
  if (connection.service == nullptr) {
    return {.error = connection.error};
  }
  const int32_t type = connection.service->getUserPassWordType(user_id);
  return is_transport_status(type) ? CredentialAnswer{.error = describe_transport_status(type)}
                                   : CredentialAnswer{.type = type, .error = ""};
}

std::string describe_credential(int32_t type) {
  return type < 0    ? "not known"
         : type == 0 ? "none is set"
                     : "one is set (type " + std::to_string(type) + ")";
}

std::string or_unset(const std::string& value) {
  return value.empty() ? "not set" : value;
}

std::string describe_metadata(std::optional<bool> enabled) {
  return !enabled ? "not set" : *enabled ? "enabled" : "not enabled";
}

std::string as_text(int32_t credential_type, const DeviceState& state) {
  return "credential: " + describe_credential(credential_type) +
         "\nencryption type: " + or_unset(state.crypto_type) +
         "\nencryption state: " + or_unset(state.crypto_state) +
         "\nmetadata encryption: " + describe_metadata(state.metadata_encryption) +
         "\nlast unlock: " + or_unset(state.decrypt_result) + "\n/data: " + describe_data(state);
}

nlohmann::json as_json(int32_t credential_type, const DeviceState& state) {
  return {
      {"credential_type", credential_type < 0 ? nlohmann::json() : nlohmann::json(credential_type)},
      {"crypto_type", or_null(state.crypto_type)},
      {"crypto_state", or_null(state.crypto_state)},
      {"metadata_encryption",
       state.metadata_encryption ? nlohmann::json(*state.metadata_encryption) : nlohmann::json()},
      {"decrypt_result", or_null(state.decrypt_result)},
      {"data", mount_as_json(state.data)}};
}

}  // namespace

ExitStatus show_status(int user_id, const Output& output) {
  const CredentialAnswer credential = ask_credential_type(user_id);
  const DeviceState state = read_device_state();
  const nlohmann::json object = as_json(credential.type, state);
  if (credential.error.empty()) {
    output.result(as_text(credential.type, state), object);
    return kExitSuccess;
  }
  output.progress(as_text(credential.type, state) + "\n");
  output.error(credential.error, object);
  return kExitServiceUnavailable;
}

}  // namespace sentrova
