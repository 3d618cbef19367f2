#pragma once

#include <sys/types.h>

#include <functional>
#include <map>
#include <mutex>

#include "binder/IServiceManager.h"

namespace sentrova {

// The table of named services behind IServiceManager. A name is entered until it is entered anew or
// its service dies. All functions may be called on any thread.
class ServiceDirectory : public android::BnInterface<android::IServiceManager> {
 public:
  static constexpr size_t kMaxNameLength = 127;
  static constexpr size_t kMaxServices = 512;

  // `calling_uid` gives the user on whose behalf the current call is made.
  explicit ServiceDirectory(std::function<uid_t()> calling_uid);

  // As checkService: the wait for a service is its client's.
  android::sp<android::IBinder> getService(const android::String16& name) const override;
  android::sp<android::IBinder> checkService(const android::String16& name) const override;
  android::status_t addService(const android::String16& name,
                               const android::sp<android::IBinder>& service, bool allow_isolated,
                               int dump_flags) override;
  android::Vector<android::String16> listServices(int dump_flags) override;

 protected:
  android::status_t onTransact(uint32_t code, const android::Parcel& data, android::Parcel* reply,
                               uint32_t flags) override;

 private:
  class Watcher;
  struct Entry {
    android::sp<android::IBinder> service;
    android::sp<Watcher> watcher;
  };

  android::status_t serve_check(const android::Parcel& data, android::Parcel* reply) const;
  android::status_t serve_add(const android::Parcel& data);
  android::status_t serve_list(const android::Parcel& data, android::Parcel* reply);
  void drop(const android::String16& name, const Watcher* watcher);

  const std::function<uid_t()> calling_uid_;
  mutable std::mutex lock_;
  std::map<android::String16, Entry> entries_;  // guarded by lock_
};

}  // namespace sentrova
