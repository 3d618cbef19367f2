#include "cli/credential_commands.h"

#include <cstdint>
#include <nlohmann/json.hpp>
#include <string>
#include <utility>

#include "cli/password_input.h"
#include "cli/service_client.h"
#include "common/wipe.h"

namespace sentrova {

ExitStatus show_password_type(int user_id, const Output& output) {
  const ServiceConnection connection = connect_to_service();
  if (connection.service == nullptr) {
    output.error(connection.error);
    return kExitServiceUnavailable;
  }
  const int32_t type = connection.service->getUserPassWordType(user_id);
  if (is_transport_status(type)) {
    output.error(describe_transport_status(type));
    return kExitServiceUnavailable;
  }
  if (type < 0) {
    output.error("the service does not know the credential type");
    return kExitServiceFailed;
  }
  const std::string code = std::to_string(type);
  output.result(
      type == 0 ? "no credential is set (type 0)" : "a credential is set (type " + code + ")",
      {{"credential_type", type}, {"credential_set", type != 0}});
  return kExitSuccess;
}

ExitStatus verify_password(int user_id, const Output& output) {
  const ServiceConnection connection = connect_to_service();
  if (connection.service == nullptr) {
    output.error(connection.error);
    return kExitServiceUnavailable;
  }
  PasswordInput input = read_password("Password: ");
  if (!input.error.empty()) {
    output.error(input.error);
    return kExitUsage;
  }
  const WipeOnExit wipe_password(input.password);
  const int32_t answer = connection.service->verifyUserPassWord(user_id, input.password);
  if (is_transport_status(answer)) {
    output.error(describe_transport_status(answer));
    return kExitServiceUnavailable;
  }
  const bool matches = answer == 0;
  output.result(matches ? "the password is right" : "the password is wrong",
                {{"matches", matches}});
  return matches ? kExitSuccess : kExitAnswerIsNo;
}

}  // namespace sentrova
