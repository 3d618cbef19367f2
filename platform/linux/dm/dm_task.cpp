#include "platform/linux/dm/dm_task.h"

#include <android-base/logging.h>
#include <android-base/stringprintf.h>
#include <linux/dm-ioctl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdarg>

#include "common/wipe.h"

namespace sentrova::dm {

namespace {

constexpr char kControlNode[] = "/dev/mapper/control";

// libdevmapper's severities, as in syslog(3): 3 is an error, 4 a warning. The rest is a trace of
// each request.
constexpr int kErrorLevel = 3;
constexpr int kWarningLevel = 4;
// The upper bits of a level ask for other outputs than the log.
constexpr int kLevelMask = 0x07;

__attribute__((format(printf, 5, 6))) void log_library_line(int level, const char* /*file*/,
                                                            int /*line*/, int /*error*/,
                                                            const char* format, ...) {
  const int severity = level & kLevelMask;
  if (severity > kWarningLevel) {
    return;
  }
  const int saved_errno = errno;
  std::string text;
  va_list arguments;
  va_start(arguments, format);
  android::base::StringAppendV(&text, format, arguments);
  va_end(arguments);
  LOG(severity <= kErrorLevel ? android::base::ERROR : android::base::WARNING) << text;
  errno = saved_errno;
}

std::mutex& library_mutex() {
  // Never destroyed: destructors of other objects may still remove devices at exit.
  static std::mutex* const mutex = new std::mutex;
  return *mutex;
}

// Where the library gives no reason, the request did not get through. ENODEV is kept for a system
// without the driver.
bool set_errno(int error) {
  errno = error != 0 ? error : EIO;
  return false;
}

bool add_target(dm_task* task, const android::dm::DmTarget& target) {
  std::string parameters = target.GetParameterString();
  const WipeOnExit wipe_parameters(parameters);
  return dm_task_add_target(task, target.start(), target.size(), target.name().c_str(),
                            parameters.c_str()) != 0;
}

}  // namespace

LibraryTurn::LibraryTurn() : lock_(library_mutex()) {
  dm_log_with_errno_init(log_library_line);
  // No daemon manages nodes on this device; the library must not wait for one.
  dm_udev_set_sync_support(0);
}

LibraryTurn::~LibraryTurn() {
  const int saved_errno = errno;
  dm_task_update_nodes();
  dm_lib_release();
  errno = saved_errno;
}

DmTask::DmTask(int type, const std::string& name) {
  // Without its node the library would make one, and would remember for good that no driver
  // answers.
  if (access(kControlNode, F_OK) != 0) {
    PLOG(ERROR) << "no device mapper: " << kControlNode;
    set_errno(ENODEV);
    return;
  }
  errno = 0;
  std::unique_ptr<dm_task, Destroy> task(dm_task_create(type));
  // Names are file names below /dev/mapper; the kernel's limit counts the NUL.
  if (task == nullptr) {
    set_errno(errno);
  } else if (name.empty() || name.size() >= DM_NAME_LEN || name.find('/') != std::string::npos ||
             dm_task_set_name(task.get(), name.c_str()) == 0) {
    set_errno(EINVAL);
  } else {
    task_ = std::move(task);
  }
}

bool DmTask::set_table(const android::dm::DmTable& table) {
  if (task_ == nullptr) {
    return false;
  }
  bool done = dm_task_secure_data(task_.get()) != 0 &&
              (!table.readonly() || dm_task_set_ro(task_.get()) != 0);
  for (const auto& target : table.targets()) {
    done = done && add_target(task_.get(), *target);
  }
  return done || set_errno(ENOMEM);
}

bool DmTask::run() {
  if (task_ == nullptr) {
    return false;
  }
  return dm_task_run(task_.get()) != 0 || set_errno(dm_task_get_errno(task_.get()));
}

std::optional<dm_info> DmTask::info() {
  dm_info info = {};
  if (task_ == nullptr || dm_task_get_info(task_.get(), &info) == 0) {
    return std::nullopt;
  }
  return info;
}

}  // namespace sentrova::dm
