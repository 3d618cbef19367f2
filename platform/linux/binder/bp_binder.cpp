#include <algorithm>

#include "binder/BpBinder.h"
#include "binder/IPCThreadState.h"
#include "binder/Parcel.h"
#include "binder/ProcessState.h"
#include "platform/linux/binder/attachments.h"
#include "platform/linux/binder/process_context.h"

namespace android {
namespace {

sentrova::binder::ProxyTable& proxies() {
  return ProcessState::self()->context().proxies;
}

}  // namespace

BpBinder::BpBinder(int32_t handle, bool alive)
    : handle_(handle),
      alive_(alive),
      attachments_(std::make_unique<sentrova::binder::Attachments>()) {}

BpBinder::~BpBinder() = default;

void BpBinder::onLastStrongRef(const void*) {
  proxies().release(handle_, this);
}

const String16& BpBinder::getInterfaceDescriptor() const {
  {
    const std::lock_guard guard(lock_);
    if (descriptor_known_)
      return descriptor_;
  }
  Parcel data;
  Parcel reply;
  String16 answer;
  const bool answered =
      const_cast<BpBinder*>(this)->transact(INTERFACE_TRANSACTION, data, &reply) == OK &&
      reply.readString16(&answer) == OK;
  const std::lock_guard guard(lock_);
  if (answered && !descriptor_known_) {
    descriptor_ = answer;
    descriptor_known_ = true;
  }
  static const String16 unknown;
  return descriptor_known_ ? descriptor_ : unknown;
}

bool BpBinder::isBinderAlive() const {
  return alive_;
}

status_t BpBinder::pingBinder() {
  Parcel data;
  Parcel reply;
  return transact(PING_TRANSACTION, data, &reply);
}

status_t BpBinder::dump(int fd, const Vector<String16>& args) {
  Parcel data;
  Parcel reply;
  data.writeFileDescriptor(fd);
  data.writeInt32(static_cast<int32_t>(args.size()));
  for (const String16& arg : args)
    data.writeString16(arg);
  return transact(DUMP_TRANSACTION, data, &reply);
}

status_t BpBinder::transact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) {
  if (!alive_)
    return DEAD_OBJECT;
  IPCThreadState* const thread = IPCThreadState::self();
  if (thread == nullptr)
    return INVALID_OPERATION;
  const status_t status = thread->transact(handle_, code, data, reply, flags);
  if (status == DEAD_OBJECT)
    alive_ = false;
  return status;
}

status_t BpBinder::linkToDeath(const sp<DeathRecipient>& recipient, void* cookie, uint32_t flags) {
  if (recipient == nullptr)
    return BAD_VALUE;
  const std::lock_guard guard(lock_);
  if (!alive_)
    return DEAD_OBJECT;
  if (links_.empty()) {
    const status_t status = proxies().request_death(handle_);
    if (status != OK)
      return status;
  }
  links_.push_back({recipient, cookie, flags});
  return OK;
}

status_t BpBinder::unlinkToDeath(const wp<DeathRecipient>& recipient, void* cookie, uint32_t flags,
                                 wp<DeathRecipient>* out_recipient) {
  const bool by_cookie = recipient.unsafe_get() == nullptr;
  DeathLink removed;
  {
    const std::lock_guard guard(lock_);
    if (obituary_sent_)
      return DEAD_OBJECT;
    const auto found = std::find_if(links_.begin(), links_.end(), [&](const DeathLink& link) {
      return link.flags == flags &&
             (by_cookie ? link.cookie == cookie : link.recipient == recipient);
    });
    if (found == links_.end())
      return NAME_NOT_FOUND;
    removed = *found;
    links_.erase(found);
    if (links_.empty())
      proxies().clear_death(handle_);
  }
  if (out_recipient != nullptr)
    *out_recipient = removed.recipient;
  return OK;
}

void BpBinder::sendObituary() {
  std::vector<DeathLink> links;
  {
    const std::lock_guard guard(lock_);
    alive_ = false;
    if (obituary_sent_)
      return;
    obituary_sent_ = true;
    links.swap(links_);
  }
  for (const DeathLink& link : links) {
    const sp<DeathRecipient> recipient = link.recipient.promote();
    if (recipient != nullptr)
      recipient->binderDied(this);
  }
}

void BpBinder::attachObject(const void* id, void* object, void* cleanup_cookie,
                            object_cleanup_func cleanup) {
  attachments_->attach(id, object, cleanup_cookie, cleanup);
}

void* BpBinder::findObject(const void* id) const {
  return attachments_->find(id);
}

void BpBinder::detachObject(const void* id) {
  attachments_->detach(id);
}

BpBinder* BpBinder::remoteBinder() {
  return this;
}

}  // namespace android
