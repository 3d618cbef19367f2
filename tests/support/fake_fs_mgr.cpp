#include "tests/support/fake_fs_mgr.h"

#include <android-base/logging.h>
#include <errno.h>
#include <fs_mgr.h>
#include <fs_mgr/roots.h>
#include <signal.h>
#include <stdio.h>
#include <sys/mount.h>
#include <sys/syscall.h>
#include <unistd.h>

#include "common/export.h"

namespace {

sentrova::testing::KernelScript* current_script = nullptr;

FakeFsMgr& note(const std::string& call) {
  const int error = errno;
  printf("%s\n", call.c_str());
  fflush(stdout);  // programs that the code under test runs write there too
  errno = error;
  return FakeFsMgr::instance();
}

int answer(int error) {
  if (error == 0) {
    return 0;
  }
  errno = error;
  return -1;
}

// Hands out a node if there is one.
bool give_node(const std::string& node, std::string* path) {
  if (node.empty()) {
    errno = ENXIO;
    return false;
  }
  *path = node;
  return true;
}

}  // namespace

FakeFsMgr& FakeFsMgr::instance() {
  static FakeFsMgr platform;
  return platform;
}

namespace sentrova::testing {

android::fs_mgr::FstabEntry fstab_row(const std::string& block_device,
                                      const std::string& mount_point,
                                      const std::string& file_system) {
  android::fs_mgr::FstabEntry row;
  row.blk_device = block_device;
  row.mount_point = mount_point;
  row.fs_type = file_system;
  return row;
}

KernelScript::KernelScript()
    : sleeps_([this](size_t count) {
        note("sleep " + std::to_string(sleeps_.microseconds().back()));
        on_sleep(count);
      }) {
  CHECK(current_script == nullptr) << "one kernel script at a time";
  current_script = this;
}

KernelScript::~KernelScript() {
  current_script = nullptr;
}

}  // namespace sentrova::testing

namespace android::fs_mgr {

bool ReadDefaultFstab(Fstab* fstab) {
  return note("read fstab").read_default_fstab(fstab);
}

bool EnsurePathMounted(Fstab* fstab, const std::string& path, const std::string& mount_point) {
  return note("ensure mounted " + path + " at " + mount_point)
      .ensure_mounted(fstab, path, mount_point);
}

bool EnsurePathUnmounted(Fstab* fstab, const std::string& path) {
  return note("ensure unmounted " + path).ensure_unmounted(fstab, path);
}

bool CreateLogicalPartition(const CreateLogicalPartitionParams& params, std::string* path) {
  return give_node(note("create " + params.partition_name + " from " + params.block_device +
                        ", table " + std::to_string(params.metadata_slot.value_or(UINT32_MAX)) +
                        (params.force_writable ? ", writable, " : ", read-only, ") +
                        std::to_string(params.timeout_ms.count()) + " ms")
                       .logical_node,
                   path);
}

bool DestroyLogicalPartition(const std::string& name) {
  note("destroy " + name);
  return true;
}

std::string GetSystemRoot() {
  return "/system";
}

}  // namespace android::fs_mgr

int fs_mgr_do_mount_one(const android::fs_mgr::FstabEntry& entry, const std::string& mount_point) {
  return note("mount " + entry.blk_device + " at " + mount_point).mount_one(entry);
}

std::string fs_mgr_get_slot_suffix() {
  return FakeFsMgr::instance().slot_suffix;
}

std::string fs_mgr_get_super_partition_name(int slot) {
  note("super partition of slot " + std::to_string(slot));
  return "super";
}

namespace android::dm {

DeviceMapper& DeviceMapper::Instance() {
  static DeviceMapper mapper;
  return mapper;
}

DmDeviceState DeviceMapper::GetState(const std::string& name) const {
  return note("dm state " + name).dm_state(name);
}

bool DeviceMapper::GetDmDevicePathByName(const std::string& name, std::string* path) {
  return give_node(note("dm path " + name).dm_node(name), path);
}

bool DeviceMapper::DeleteDeviceIfExists(const std::string& name) {
  return answer(note("dm delete " + name).dm_delete_error(name)) == 0;
}

}  // namespace android::dm

extern "C" SENTROVA_API int mount(const char* device, const char* directory, const char* type,
                                  unsigned long flags, const void* data) noexcept {
  if (current_script == nullptr) {
    return static_cast<int>(syscall(SYS_mount, device, directory, type, flags, data));
  }
  note(std::string("mount(2) ") + device + " on " + directory + " as " + type + ", " +
       std::to_string(flags) + ", " + (data != nullptr ? static_cast<const char*>(data) : "null"));
  return answer(current_script->mount_error(device, type));
}

extern "C" SENTROVA_API int umount(const char* directory) noexcept {
  if (current_script == nullptr) {
    return static_cast<int>(syscall(SYS_umount2, directory, 0));
  }
  note(std::string("umount(2) ") + directory);
  return answer(current_script->umount_error(directory));
}

extern "C" SENTROVA_API int kill(pid_t pid, int signal) noexcept {
  if (current_script == nullptr) {
    return static_cast<int>(syscall(SYS_kill, pid, signal));
  }
  note("kill " + std::to_string(pid) + " " + std::to_string(signal));
  return 0;
}
