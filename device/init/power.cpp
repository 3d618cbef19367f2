#include "device/init/power.h"

#include <linux/reboot.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace sentrova::device {

std::optional<PowerRequest> parse_power_request(std::string_view value) {
  const size_t comma = value.find(',');
  const std::string_view action = value.substr(0, comma);
  if (action != "reboot" && action != "shutdown") {
    return std::nullopt;
  }
  const std::string_view reason =
      comma == std::string_view::npos ? std::string_view() : value.substr(comma + 1);
  return PowerRequest{action == "reboot", std::string(reason)};
}

void carry_out(const PowerRequest& request) {
  sync();
  // The C library's function cannot pass the reason on.
  const unsigned int command = !request.reboot          ? LINUX_REBOOT_CMD_POWER_OFF
                               : request.reason.empty() ? LINUX_REBOOT_CMD_RESTART
                                                        : LINUX_REBOOT_CMD_RESTART2;
  syscall(SYS_reboot, LINUX_REBOOT_MAGIC1, LINUX_REBOOT_MAGIC2, command, request.reason.c_str());
}

}  // namespace sentrova::device
