#include "binder/Binder.h"

#include "binder/IInterface.h"
#include "binder/Parcel.h"
#include "platform/linux/binder/attachments.h"

namespace android {

using sentrova::binder::Attachments;

IBinder::DeathRecipient::~DeathRecipient() = default;

IBinder::IBinder() = default;

IBinder::~IBinder() = default;

sp<IInterface> IBinder::queryLocalInterface(const String16&) {
  return nullptr;
}

bool IBinder::checkSubclass(const void*) const {
  return false;
}

BBinder* IBinder::localBinder() {
  return nullptr;
}

BpBinder* IBinder::remoteBinder() {
  return nullptr;
}

BBinder::BBinder() = default;

BBinder::~BBinder() {
  delete attachments_.load();
}

const String16& BBinder::getInterfaceDescriptor() const {
  static const auto* const no_name = new String16();
  return *no_name;
}

bool BBinder::isBinderAlive() const {
  return true;
}

status_t BBinder::pingBinder() {
  return OK;
}

status_t BBinder::dump(int, const Vector<String16>&) {
  return OK;
}

status_t BBinder::transact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) {
  if (code == PING_TRANSACTION)
    return pingBinder();
  data.setDataPosition(0);
  Parcel unwanted;
  Parcel* const answer = reply != nullptr ? reply : &unwanted;
  if ((flags & FLAG_CLEAR_BUF) != 0)
    answer->markSensitive();
  const status_t status = onTransact(code, data, answer, flags);
  answer->setDataPosition(0);
  return status;
}

status_t BBinder::onTransact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t) {
  switch (code) {
    case INTERFACE_TRANSACTION:
      if (reply == nullptr)
        return UNEXPECTED_NULL;
      return reply->writeString16(getInterfaceDescriptor());
    case DUMP_TRANSACTION:
      return serve_dump(data);
    default:
      return UNKNOWN_TRANSACTION;
  }
}

status_t BBinder::serve_dump(const Parcel& data) {
  const int fd = data.readFileDescriptor();
  if (fd < 0)
    return fd;
  int32_t count;
  status_t status = data.readInt32(&count);
  Vector<String16> args;
  for (int32_t i = 0; i < count && status == OK; ++i) {
    String16 arg;
    status = data.readString16(&arg);
    if (status == OK)
      args.add(arg);
  }
  return status == OK ? dump(fd, args) : status;
}

status_t BBinder::linkToDeath(const sp<DeathRecipient>&, void*, uint32_t) {
  return INVALID_OPERATION;
}

status_t BBinder::unlinkToDeath(const wp<DeathRecipient>&, void*, uint32_t, wp<DeathRecipient>*) {
  return INVALID_OPERATION;
}

void BBinder::attachObject(const void* id, void* object, void* cleanup_cookie,
                           object_cleanup_func cleanup) {
  Attachments* attachments = attachments_.load();
  if (attachments == nullptr) {
    auto* const made = new Attachments();
    if (attachments_.compare_exchange_strong(attachments, made)) {
      attachments = made;
    } else {
      delete made;
    }
  }
  attachments->attach(id, object, cleanup_cookie, cleanup);
}

void* BBinder::findObject(const void* id) const {
  const Attachments* const attachments = attachments_.load();
  return attachments == nullptr ? nullptr : attachments->find(id);
}

void BBinder::detachObject(const void* id) {
  Attachments* const attachments = attachments_.load();
  if (attachments != nullptr)
    attachments->detach(id);
}

BBinder* BBinder::localBinder() {
  return this;
}

BpRefBase::BpRefBase(const sp<IBinder>& remote) : remote_(remote) {}

BpRefBase::~BpRefBase() = default;

}  // namespace android
