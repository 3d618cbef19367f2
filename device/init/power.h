#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace sentrova::device {

// What the property "sys.powerctl" asks for.
struct PowerRequest {
  bool reboot;         // otherwise: power off
  std::string reason;  // what follows the comma: where to boot to, or why to stop
};

// Reads "reboot", "reboot,REASON", "shutdown" or "shutdown,REASON". Returns nothing for any other
// text.
std::optional<PowerRequest> parse_power_request(std::string_view value);

// Writes everything to the disks and asks the kernel for it. Returns only when the kernel refuses,
// with `errno`.
void carry_out(const PowerRequest& request);

}  // namespace sentrova::device
