#pragma once

#include <string>

namespace sentrova::roots_ex {

// The kinds of chip, as the property "ro.zuno.product.solution" names them.
inline constexpr char kQcom[] = "QCOM";
inline constexpr char kMtk[] = "MTK";
inline constexpr char kSamsung[] = "SAMSUNG";

// Has the USB controller act as the host, by the control file that this kind of chip has on this
// platform; the first one found is kept until the process ends. Returns false, after a message, if
// there is none or it cannot be written to. One call at a time.
bool enable_host_mode(const std::string& solution, const std::string& platform);

}  // namespace sentrova::roots_ex
