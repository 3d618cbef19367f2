// Locks the user data again. Exit status: 0 when it is locked, 1, after saying why, when something
// is in use; what is not has been locked then.

#include <android-base/logging.h>
#include <stdio.h>

#include "device/userdata/lock.h"

int main(int, char** argv) {
  android::base::InitLogging(argv, android::base::StderrLogger);
  std::string error;
  if (!sentrova::lock_user_data(sentrova::Places(), error)) {
    fprintf(stderr, "lock_userdata: %s\n", error.c_str());
    return 1;
  }
  return 0;
}
