// The key-store service, as far as this device needs one: it runs when it is asked for. No key is
// kept in it; the stand-in for the decryption library reads its keys itself.

#include <android-base/logging.h>
#include <unistd.h>

int main(int, char** argv) {
  android::base::InitLogging(argv, android::base::StderrLogger);
  LOG(INFO) << "the key-store service runs";
  while (true) {
    pause();
  }
}
