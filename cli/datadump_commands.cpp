#include "cli/datadump_commands.h"

#include <android-base/parseint.h>

#include <cstdint>
#include <nlohmann/json.hpp>

#include "datadump/datadump.h"

namespace sentrova {
namespace {

ExitStatus failed(const char* what, const Output& output) {
  output.error(std::string("the data-dump flags cannot be ") + what);
  return kExitServiceFailed;
}

ExitStatus show_after(int result, const Output& output) {
  return result == 0 ? show_datadump(output) : failed("written", output);
}

}  // namespace

ExitStatus show_datadump(const Output& output) {
  uint32_t first_magic = 0;
  uint32_t second_magic = 0;
  uint64_t offset = 0;
  const int status = datadump_get_status();
  if (status < 0 || datadump_query_flags(&first_magic, &second_magic, &offset) != 0) {
    return failed("read", output);
  }
  if (status == 0) {
    output.result("the data dump is disarmed", {{"armed", false}});
  } else {
    output.result(
        "the data dump is armed" + (offset == 0 ? std::string(", without an offset")
                                                : ", with the offset " + std::to_string(offset)),
        {{"armed", true}, {"offset", offset}});
  }
  return kExitSuccess;
}

ExitStatus enable_datadump(const Output& output) {
  return show_after(datadump_enable(), output);
}

ExitStatus disable_datadump(const Output& output) {
  return show_after(datadump_disable(), output);
}

ExitStatus resize_datadump(const std::string& offset, const Output& output) {
  uint64_t value = 0;
  if (!android::base::ParseUint(offset, &value)) {
    output.error("the offset is a number from 0 to 18446744073709551615");
    return kExitUsage;
  }
  if (datadump_get_status() == 0) {
    output.error("the data dump is not armed; `sentrova datadump enable` arms it");
    return kExitServiceFailed;
  }
  return show_after(datadump_resize(value), output);
}

}  // namespace sentrova
