#include "device/host/vendor_time.h"

#include <android-base/logging.h>
#include <dlfcn.h>
#include <zunofscrypt.h>
#include <zunogatekeeper.h>

#include <string>
#include <utility>

#include "common/wipe.h"

namespace {

using std::chrono::steady_clock;

thread_local steady_clock::duration spent{};

// Counts the time of its own life.
class Stopwatch {
 public:
  Stopwatch() : begin_(steady_clock::now()) {}
  ~Stopwatch() { spent += steady_clock::now() - begin_; }
  Stopwatch(const Stopwatch&) = delete;
  Stopwatch& operator=(const Stopwatch&) = delete;

 private:
  const steady_clock::time_point begin_;
};

// The vendor's function of this linker name and type.
template <typename Function>
Function* vendor_function(const char* name) {
  void* const address = dlsym(RTLD_NEXT, name);
  CHECK(address != nullptr) << name << " is in no library";
  return reinterpret_cast<Function*>(address);
}

}  // namespace

// The dynamic linker looks into the program before the libraries: the service calls these.

bool Decrypt_ME() {
  static const auto next = vendor_function<bool()>("_Z10Decrypt_MEv");
  const Stopwatch stopwatch;
  return next();
}

bool Decrypt_DE() {
  static const auto next = vendor_function<bool()>("_Z10Decrypt_DEv");
  const Stopwatch stopwatch;
  return next();
}

bool Decrypt_User(int userId, const std::string& secret, bool flag) {
  static const auto next = vendor_function<bool(int, const std::string&, bool)>(
      "_Z12Decrypt_UseriRKNSt7__cxx1112basic_stringIcSt11char_traitsIcESaIcEEEb");
  const Stopwatch stopwatch;
  return next(userId, secret, flag);
}

int ZunoGuardManager::getLockStatus() {
  static const auto next =
      vendor_function<int(ZunoGuardManager*)>("_ZN16ZunoGuardManager13getLockStatusEv");
  const Stopwatch stopwatch;
  return next(this);
}

bool ZunoGuardManager::verifyPassword(std::string password) {
  static const auto next = vendor_function<bool(ZunoGuardManager*, std::string)>(
      "_ZN16ZunoGuardManager14verifyPasswordE"
      "NSt7__cxx1112basic_stringIcSt11char_traitsIcESaIcEEE");
  const Stopwatch stopwatch;
  const sentrova::WipeOnExit wipe_password(password);
  return next(this, std::move(password));
}

namespace sentrova::device {

std::chrono::microseconds vendor_time() {
  return std::chrono::duration_cast<std::chrono::microseconds>(spent);
}

}  // namespace sentrova::device
