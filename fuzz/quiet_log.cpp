#include <android-base/logging.h>

#include "fuzz/fuzz_target.h"

extern "C" int LLVMFuzzerInitialize(int* /*argc*/, char*** /*argv*/) {
  // Most inputs are refused with a message each; what aborts is still to be read.
  android::base::SetLogger([](auto id, auto severity, auto tag, auto file, auto line, auto text) {
    if (severity >= android::base::FATAL_WITHOUT_ABORT) {
      android::base::StderrLogger(id, severity, tag, file, line, text);
    }
  });
  return 0;
}
