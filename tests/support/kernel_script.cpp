#include "tests/support/kernel_script.h"

#include <android-base/logging.h>
#include <errno.h>
#include <sys/mount.h>
#include <sys/syscall.h>
#include <unistd.h>

#include "common/export.h"
#include "tests/support/fake_fs_mgr.h"

namespace sentrova::testing {
namespace {

KernelScript* current_script = nullptr;

int answer(int error) {
  if (error == 0) {
    return 0;
  }
  errno = error;
  return -1;
}

}  // namespace

KernelScript::KernelScript() : sleeps_([this](size_t count) { note_sleep(count); }) {
  CHECK(current_script == nullptr) << "one kernel script at a time";
  current_script = this;
}

KernelScript::~KernelScript() {
  current_script = nullptr;
}

void KernelScript::note_sleep(size_t count) {
  FakeFsMgr::instance().calls.push_back("sleep " + std::to_string(sleeps_.microseconds().back()));
  on_sleep(count);
}

}  // namespace sentrova::testing

using sentrova::testing::answer;
using sentrova::testing::current_script;

extern "C" SENTROVA_API int mount(const char* device, const char* directory, const char* type,
                                  unsigned long flags, const void* data) noexcept {
  if (current_script == nullptr) {
    return static_cast<int>(syscall(SYS_mount, device, directory, type, flags, data));
  }
  FakeFsMgr::instance().calls.push_back(
      std::string("mount(2) ") + device + " on " + directory + " as " + type + ", " +
      std::to_string(flags) + ", " + (data != nullptr ? static_cast<const char*>(data) : "null"));
  return answer(current_script->mount_error(device, type));
}

extern "C" SENTROVA_API int umount(const char* directory) noexcept {
  if (current_script == nullptr) {
    return static_cast<int>(syscall(SYS_umount2, directory, 0));
  }
  FakeFsMgr::instance().calls.push_back(std::string("umount(2) ") + directory);
  return answer(current_script->umount_error(directory));
}
