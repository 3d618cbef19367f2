#include <android-base/properties.h>
#include <stdio.h>

#include "recovery_utils/roots.h"
#include "recovery_utils/roots_ex.h"
#include "recovery_utils/roots_ex_log.h"
#include "toolkit/zuno_func.h"

using android::base::GetBoolProperty;
using android::base::GetProperty;
using android::base::SetProperty;
using sentrova::roots_ex::kLogTag;

namespace {

// The partitions that hold the vendor's property files, in the order in which they are mounted.
constexpr const char* kVendorPartitions[] = {"oem", "kcf"};

// What the property loader is asked for, and what it sets to "1" when that is done.
struct LoadRequest {
  const char* request;
  const char* completion;
};

constexpr LoadRequest kVendorProperties = {"recovery.load.props", "recovery.properties.loaded"};
constexpr LoadRequest kBackupProperties = {"recovery.load.backup_props",
                                           "recovery.backup_props.loaded"};
constexpr LoadRequest kPersistentProperties = {"recovery.load.persist_props",
                                               "recovery.persist_properties.loaded"};
constexpr double kLoadTimeoutSeconds = 5.0;

struct PropertyFile {
  const char* working_copy;
  const char* backup;
};

constexpr PropertyFile kPropertyFiles[] = {
    {"/tmp/oem.prop", "/cache/recovery/oem.prop"},
    {"/tmp/kcf.prop", "/cache/recovery/kcf.prop"},
};
constexpr int kBackupMode = 0644;

// A loader that does not answer in time holds nothing up.
void ask_loader(const LoadRequest& load) {
  SetProperty(load.request, "1");
  ZunoFunc::wait_for_property(load.completion, "1", kLoadTimeoutSeconds);
}

bool is_ready(const char* property) {
  return GetProperty(property, "") == "true";
}

bool are_vendor_properties_ready() {
  if (!is_ready("recovery.oem_properties.ready")) {
    return false;
  }
  const bool kcf_pending = GetProperty("ro.recovery.kcf.support", "") == "1" &&
                           !is_ready("recovery.kcf_properties.ready");
  return !kcf_pending;
}

}  // namespace

bool zuno_load_property() {
  fprintf(stdout, "[%s]I: load property begin\n", kLogTag);
  for (const char* name : kVendorPartitions) {
    MountCustomPartition(name);
  }
  ask_loader(kVendorProperties);
  zunoPropertyPrebackup();
  if (!GetBoolProperty("recovery.repair_mode", false)) {
    for (const char* name : kVendorPartitions) {
      UnMountCustomPartition(name);
    }
  }
  fprintf(stdout, "[%s]I: load property end\n", kLogTag);
  return true;
}

void zunoPropertyPrebackup() {
  if (!are_vendor_properties_ready()) {
    ask_loader(kBackupProperties);
    return;
  }
  zunoPropertyPostBackup();
  for (const PropertyFile& file : kPropertyFiles) {
    ZunoFunc::copy_file(file.working_copy, file.backup, kBackupMode);
  }
}

void zunoPropertyPostBackup() {
  for (const PropertyFile& file : kPropertyFiles) {
    ZunoFunc::Remove_File(file.backup);
  }
}

bool zuno_load_persist_property() {
  ensure_path_mounted("/data");
  ask_loader(kPersistentProperties);
  return is_ready("recovery.persistent_properties.ready");
}
