#include "device/zuno_vold/rehearsed_failure.h"

#include <android-base/properties.h>
#include <stdio.h>
#include <stdlib.h>
#include <unistd.h>

#include <string>

namespace sentrova {

void fail_as_rehearsed() {
  const std::string behaviour = android::base::GetProperty("debug.vold.behaviour", "");
  if (behaviour.empty()) {
    return;
  }
  fprintf(stderr, "zuno_vold: failing as told: %s\n", behaviour.c_str());
  if (behaviour == "exit1") {
    exit(1);
  } else if (behaviour == "abort") {
    abort();
  } else if (behaviour == "hang") {
    while (true) {
      pause();
    }
  }
}

}  // namespace sentrova
