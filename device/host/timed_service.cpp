#include "device/host/timed_service.h"

#include <chrono>
#include <cstdio>
#include <utility>

#include "common/wipe.h"
#include "device/host/vendor_time.h"

namespace sentrova::device {
namespace {

using std::chrono::duration_cast;
using std::chrono::microseconds;
using std::chrono::steady_clock;

template <typename Operation>
int32_t timed(const char* name, Operation operation) {
  const auto begin = steady_clock::now();
  const microseconds vendor_before = vendor_time();
  const int32_t result = operation();
  const auto all = duration_cast<microseconds>(steady_clock::now() - begin);
  fprintf(stdout, "[rescue_host]I: %s took %lld us, %lld us of them in the vendor's libraries\n",
          name, static_cast<long long>(all.count()),
          static_cast<long long>((vendor_time() - vendor_before).count()));
  return result;
}

}  // namespace

int32_t TimedService::getUserPassWordType(int userId) {
  return timed("getUserPassWordType", [&] { return SentrovaService::getUserPassWordType(userId); });
}

int32_t TimedService::verifyUserPassWord(int userId, std::string password) {
  const WipeOnExit wipe_password(password);
  return timed("verifyUserPassWord",
               [&] { return SentrovaService::verifyUserPassWord(userId, std::move(password)); });
}

int32_t TimedService::fdeDecryptUser(int userId) {
  return timed("fdeDecryptUser", [&] { return SentrovaService::fdeDecryptUser(userId); });
}

int32_t TimedService::fbeDecryptMetadata() {
  return timed("fbeDecryptMetadata", [&] { return SentrovaService::fbeDecryptMetadata(); });
}

int32_t TimedService::fbeDecryptUserDe(int userId) {
  return timed("fbeDecryptUserDe", [&] { return SentrovaService::fbeDecryptUserDe(userId); });
}

int32_t TimedService::fbeDecryptUserCe(int userId, std::string password, bool flag) {
  const WipeOnExit wipe_password(password);
  return timed("fbeDecryptUserCe", [&] {
    return SentrovaService::fbeDecryptUserCe(userId, std::move(password), flag);
  });
}

}  // namespace sentrova::device
