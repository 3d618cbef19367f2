#include "platform/linux/fs_mgr/slots.h"

#include <android-base/properties.h>
#include <fs_mgr.h>

using android::base::GetProperty;

std::string fs_mgr_get_slot_suffix() {
  const std::string suffix = GetProperty("ro.boot.slot_suffix", "");
  if (!suffix.empty()) {
    return suffix;
  }
  const std::string slot = GetProperty("ro.boot.slot", "");
  return slot.empty() ? std::string() : "_" + slot;
}

std::string fs_mgr_get_super_partition_name(int slot) {
  const std::string name = GetProperty("ro.boot.super_partition", "");
  if (name.empty()) {
    return "super";
  }
  const std::string suffix = fs_mgr_get_slot_suffix();
  if (suffix.empty() || slot == -1) {
    return name + suffix;
  }
  return name + (slot == 0 ? "_a" : "_b");
}

namespace sentrova::fs_mgr {

std::string other_slot_suffix() {
  const std::string suffix = fs_mgr_get_slot_suffix();
  if (suffix == "_a") {
    return "_b";
  }
  return suffix == "_b" ? "_a" : "";
}

}  // namespace sentrova::fs_mgr
