// A front end's first two questions: is the owner's data locked by a password, and is the first
// line of standard input that password? A front end would go on to fbeDecryptMetadata(),
// fbeDecryptUserDe() and fbeDecryptUserCe().
//
// Exit status: 0 there is no password, or it is right; 1 it is wrong; 2 the service was not
// reached, died, or does not know.

#include <binder/IServiceManager.h>
#include <string.h>
#include <utils/Errors.h>
#include <utils/String16.h>

#include <cstdint>
#include <cstdio>

#include "interface/isentrova_service.h"

namespace {

constexpr int kOwner = 0;

enum ExitStatus { kOpen = 0, kWrongPassword = 1, kCannotTell = 2 };

// Waits a few seconds for the service manager, and again for the service.
android::sp<android::ISentrovaService> find_service() {
  const android::sp<android::IServiceManager> manager = android::defaultServiceManager();
  if (manager == nullptr) {
    fprintf(stderr, "client: no service manager answers\n");
    return nullptr;
  }
  const android::sp<android::IBinder> binder =
      manager->getService(android::String16("SentrovaService"));
  // Another interface under this name would take the codes of the calls for its own.
  if (binder == nullptr ||
      binder->getInterfaceDescriptor() != android::ISentrovaService::descriptor) {
    fprintf(stderr, "client: there is no rescue service\n");
    return nullptr;
  }
  return android::ISentrovaService::asInterface(binder);
}

// Whether the answer is not the service's but a platform status of the call, which is then told.
bool call_failed(int32_t answer) {
  if (answer >= -1) {
    return false;
  }
  fprintf(stderr, "client: %s (status %d)\n",
          answer == android::DEAD_OBJECT ? "the service died during the call" : "the call failed",
          answer);
  return true;
}

ExitStatus check_password(android::ISentrovaService& service) {
  // Without a buffer no copy stays behind in the stream.
  setvbuf(stdin, nullptr, _IONBF, 0);
  char password[1024] = "";
  if (fgets(password, sizeof(password), stdin) == nullptr) {
    fprintf(stderr, "client: no password was given\n");
    return kCannotTell;
  }
  password[strcspn(password, "\n")] = '\0';
  // The copy that the proxy gets is wiped by it; this one is ours to wipe.
  const int32_t answer = service.verifyUserPassWord(kOwner, password);
  explicit_bzero(password, sizeof(password));
  if (call_failed(answer)) {
    return kCannotTell;
  }
  printf("the password is %s\n", answer == 0 ? "right" : "wrong");
  return answer == 0 ? kOpen : kWrongPassword;
}

}  // namespace

int main() {
  const android::sp<android::ISentrovaService> service = find_service();
  if (service == nullptr) {
    return kCannotTell;
  }
  const int32_t type = service->getUserPassWordType(kOwner);
  if (call_failed(type)) {
    return kCannotTell;
  }
  if (type < 0) {
    fprintf(stderr, "client: the service does not know the kind of credential\n");
    return kCannotTell;
  }
  if (type == 0) {
    printf("no credential is set\n");
    return kOpen;
  }
  printf("a credential of type %d is set\n", type);
  return check_password(*service);
}
