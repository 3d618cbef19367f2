#include "platform/linux/servicemanager/service_directory.h"

#include <algorithm>
#include <string_view>
#include <utility>

#include "binder/Parcel.h"

namespace sentrova {

using android::BAD_VALUE;
using android::IBinder;
using android::Parcel;
using android::sp;
using android::status_t;
using android::String16;
using android::Vector;
using android::wp;

namespace {

constexpr uid_t kRoot = 0;
constexpr uid_t kSystem = 1000;

bool is_name_character(char16_t c) {
  constexpr std::u16string_view kPunctuation = u"._-/:";
  return (c >= u'a' && c <= u'z') || (c >= u'A' && c <= u'Z') || (c >= u'0' && c <= u'9') ||
         kPunctuation.find(c) != std::u16string_view::npos;
}

bool is_name(const String16& name) {
  const std::u16string_view text(name.string(), name.size());
  return !text.empty() && text.size() <= ServiceDirectory::kMaxNameLength &&
         std::all_of(text.begin(), text.end(), is_name_character);
}

}  // namespace

// Drops one entry when its service dies. Kept alive by the entry.
class ServiceDirectory::Watcher : public IBinder::DeathRecipient {
 public:
  Watcher(ServiceDirectory* directory, const String16& name) : directory_(directory), name_(name) {}

  void binderDied(const wp<IBinder>&) override {
    const sp<ServiceDirectory> directory = directory_.promote();
    if (directory != nullptr)
      directory->drop(name_, this);
  }

 private:
  const wp<ServiceDirectory> directory_;
  const String16 name_;
};

ServiceDirectory::ServiceDirectory(std::function<uid_t()> calling_uid)
    : calling_uid_(std::move(calling_uid)) {}

sp<IBinder> ServiceDirectory::getService(const String16& name) const {
  return checkService(name);
}

sp<IBinder> ServiceDirectory::checkService(const String16& name) const {
  const std::lock_guard guard(lock_);
  const auto found = entries_.find(name);
  return found == entries_.end() ? nullptr : found->second.service;
}

status_t ServiceDirectory::addService(const String16& name, const sp<IBinder>& service, bool, int) {
  const uid_t uid = calling_uid_();
  if (uid != kRoot && uid != kSystem)
    return android::PERMISSION_DENIED;
  if (service == nullptr || !is_name(name))
    return BAD_VALUE;
  const sp<Watcher> watcher = new Watcher(this, name);
  Entry entry = {service, watcher};
  {
    const std::lock_guard guard(lock_);
    const auto found = entries_.find(name);
    if (found == entries_.end() && entries_.size() >= kMaxServices)
      return android::NO_MEMORY;
    // An object of this process cannot die and cannot be watched.
    const status_t status = service->linkToDeath(watcher);
    if (status != android::OK && status != android::INVALID_OPERATION)
      return android::BAD_VALUE;
    std::swap(entries_[name], entry);
  }
  if (entry.service != nullptr)
    entry.service->unlinkToDeath(entry.watcher);
  return android::OK;
}

Vector<String16> ServiceDirectory::listServices(int) {
  const std::lock_guard guard(lock_);
  Vector<String16> names;
  for (const auto& [name, entry] : entries_)
    names.add(name);
  return names;
}

void ServiceDirectory::drop(const String16& name, const Watcher* watcher) {
  Entry dropped;  // destroyed after the lock is let go
  const std::lock_guard guard(lock_);
  const auto found = entries_.find(name);
  if (found == entries_.end() || found->second.watcher.get() != watcher)
    return;
  dropped = found->second;
  entries_.erase(found);
}

status_t ServiceDirectory::onTransact(uint32_t code, const Parcel& data, Parcel* reply,
                                      uint32_t flags) {
  if (code < GET_SERVICE_TRANSACTION || code > LIST_SERVICES_TRANSACTION) {
    return BBinder::onTransact(code, data, reply, flags);
  }
  if (!data.checkInterface(this))
    return android::PERMISSION_DENIED;
  switch (code) {
    case ADD_SERVICE_TRANSACTION:
      return serve_add(data);
    case LIST_SERVICES_TRANSACTION:
      return serve_list(data, reply);
    default:
      return serve_check(data, reply);
  }
}

status_t ServiceDirectory::serve_check(const Parcel& data, Parcel* reply) const {
  String16 name;
  const status_t status = data.readString16(&name);
  return status == android::OK ? reply->writeStrongBinder(checkService(name)) : status;
}

status_t ServiceDirectory::serve_add(const Parcel& data) {
  String16 name;
  sp<IBinder> service;
  bool allow_isolated = false;
  int32_t dump_flags = 0;
  status_t status = data.readString16(&name);
  if (status == android::OK)
    status = data.readStrongBinder(&service);
  if (status == android::OK)
    status = data.readBool(&allow_isolated);
  if (status == android::OK)
    status = data.readInt32(&dump_flags);
  return status == android::OK ? addService(name, service, allow_isolated, dump_flags) : status;
}

status_t ServiceDirectory::serve_list(const Parcel& data, Parcel* reply) {
  int32_t dump_flags;
  const status_t status = data.readInt32(&dump_flags);
  if (status != android::OK)
    return status;
  const Vector<String16> names = listServices(dump_flags);
  reply->writeInt32(static_cast<int32_t>(names.size()));
  for (const String16& name : names)
    reply->writeString16(name);
  return reply->errorCheck();
}

}  // namespace sentrova
