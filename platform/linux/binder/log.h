#pragma once

#include <android/log.h>

// One line in the device's log under the tag "binder"; printf formats. Keeps nothing: errno may
// change.
#define BINDER_LOGE(...) \
  static_cast<void>(__android_log_print(ANDROID_LOG_ERROR, "binder", __VA_ARGS__))
