// The property functions of android-base, over the store that all processes share. libbase's
// remaining functions (GetBoolProperty, GetIntProperty, GetUintProperty) read through GetProperty.
#include <android-base/properties.h>
#include <sys/stat.h>

#include <cerrno>
#include <map>
#include <mutex>

#include "common/export.h"
#include "platform/linux/properties/property_files.h"
#include "platform/linux/properties/property_rules.h"
#include "platform/linux/properties/property_watcher.h"

namespace {

// The store of a process on a machine without the shared folder: the same rules for
// names and values, one process. Takes "ro." names again and again, as libbase's own map does:
// nobody else has seen them.
class OwnStore {
 public:
  std::string get(const std::string& name) {
    const std::lock_guard lock(mutex_);
    const auto found = values_.find(name);
    return found == values_.end() ? std::string() : found->second;
  }

  bool set(const std::string& name, const std::string& value) {
    const std::lock_guard lock(mutex_);
    values_[name] = value;
    return true;
  }

 private:
  std::mutex mutex_;
  std::map<std::string, std::string> values_;
};

OwnStore& own_store() {
  // Never destroyed: destructors of other objects may still read properties at exit.
  static OwnStore* const store = new OwnStore;
  return *store;
}

// A folder that is there but cannot be reached counts as shared: its use then fails, instead of
// giving this process a view of its own.
bool is_shared(const std::string& directory) {
  struct stat status = {};
  if (stat(directory.c_str(), &status) != 0) {
    return errno != ENOENT && errno != ENOTDIR;
  }
  return S_ISDIR(status.st_mode);
}

}  // namespace

namespace android::base {

SENTROVA_API std::string GetProperty(const std::string& key, const std::string& default_value) {
  if (!sentrova::is_property_name(key)) {
    return default_value;
  }
  const std::string directory = sentrova::property_directory();
  const std::string value = is_shared(directory)
                                ? sentrova::read_property_file(directory, key).value_or("")
                                : own_store().get(key);
  return value.empty() ? default_value : value;
}

SENTROVA_API bool SetProperty(const std::string& key, const std::string& value) {
  if (!sentrova::is_property_name(key) || !sentrova::is_property_value(key, value)) {
    errno = EINVAL;
    return false;
  }
  const std::string directory = sentrova::property_directory();
  return is_shared(directory) ? sentrova::write_property_file(directory, key, value)
                              : own_store().set(key, value);
}

}  // namespace android::base
