// Calls one unlocking operation of the rescue service, in whatever order a story wants, and prints
// its answer.
//
//   operation_call fde | fbe-metadata | fbe-de
//   operation_call fbe-ce [COUNT]    the password is the first line of standard input; called COUNT
//                                    times (1 by default), with the last answer printed
//
// Exit status: 0 when the answer is 0, 1 when it is another, 2 for a wrong command line or when
// there is no service.

#include <android-base/parseint.h>
#include <binder/IServiceManager.h>
#include <utils/String16.h>

#include <cstdio>
#include <iostream>
#include <map>
#include <string>

#include "interface/isentrova_service.h"

namespace {

constexpr int kCannotCall = 2;
constexpr int kOwner = 0;
constexpr unsigned int kMostCalls = 1000;

using Service = android::ISentrovaService;

int32_t unlock_credential_encrypted(Service& service, unsigned int count) {
  std::string password;
  std::getline(std::cin, password);
  int32_t answer = -1;
  for (unsigned int i = 0; i < count; ++i) {
    answer = service.fbeDecryptUserCe(kOwner, password, false);
  }
  return answer;
}

const std::map<std::string, int32_t (*)(Service&, unsigned int)>& operations() {
  static const std::map<std::string, int32_t (*)(Service&, unsigned int)> table = {
      {"fde", [](Service& service, unsigned int) { return service.fdeDecryptUser(kOwner); }},
      {"fbe-metadata", [](Service& service, unsigned int) { return service.fbeDecryptMetadata(); }},
      {"fbe-de", [](Service& service, unsigned int) { return service.fbeDecryptUserDe(kOwner); }},
      {"fbe-ce", unlock_credential_encrypted},
  };
  return table;
}

android::sp<Service> find_service() {
  const android::sp<android::IServiceManager> manager = android::defaultServiceManager();
  return manager == nullptr ? nullptr
                            : android::interface_cast<Service>(
                                  manager->getService(android::String16("SentrovaService")));
}

}  // namespace

int main(int argc, char** argv) {
  const auto operation = operations().find(argc > 1 ? argv[1] : "");
  unsigned int count = 1;
  if (operation == operations().end() || argc > 3 ||
      (argc == 3 && !android::base::ParseUint(argv[2], &count, kMostCalls))) {
    fprintf(stderr, "usage: operation_call fde | fbe-metadata | fbe-de | fbe-ce [COUNT]\n");
    return kCannotCall;
  }
  const android::sp<Service> service = find_service();
  if (service == nullptr) {
    fprintf(stderr, "operation_call: there is no rescue service\n");
    return kCannotCall;
  }
  const int32_t answer = operation->second(*service, count);
  printf("the service answers %d\n", answer);
  return answer == 0 ? 0 : 1;
}
