#pragma once

#include <atomic>

#include "binder/IBinder.h"

namespace sentrova::binder {
class Attachments;
}

namespace android {

// The base of every object that this process offers. Objects are made with `new` and held by sp<>.
class SENTROVA_API BBinder : public IBinder {
 public:
  BBinder();

  const String16& getInterfaceDescriptor() const override;
  bool isBinderAlive() const override;
  status_t pingBinder() override;
  status_t dump(int fd, const Vector<String16>& args) override;

  // Rewinds `data`, answers PING_TRANSACTION, hands everything else to onTransact with a reply that
  // is never null, and rewinds the reply.
  status_t transact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags = 0) override;

  // Links are refused: an object of this process cannot die before its users.
  status_t linkToDeath(const sp<DeathRecipient>& recipient, void* cookie = nullptr,
                       uint32_t flags = 0) override;
  status_t unlinkToDeath(const wp<DeathRecipient>& recipient, void* cookie = nullptr,
                         uint32_t flags = 0, wp<DeathRecipient>* out_recipient = nullptr) override;

  void attachObject(const void* id, void* object, void* cleanup_cookie,
                    object_cleanup_func cleanup) override;
  void* findObject(const void* id) const override;
  void detachObject(const void* id) override;

  BBinder* localBinder() override;

 protected:
  ~BBinder() override;

  // Serves one call, possibly several at once on different threads. This one answers
  // INTERFACE_TRANSACTION and DUMP_TRANSACTION, and UNKNOWN_TRANSACTION to all else.
  virtual status_t onTransact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags = 0);

 private:
  status_t serve_dump(const Parcel& data);

  std::atomic<sentrova::binder::Attachments*> attachments_ = nullptr;
};

// Holds the remote object of a proxy class.
class SENTROVA_API BpRefBase : public virtual RefBase {
 protected:
  explicit BpRefBase(const sp<IBinder>& remote);
  ~BpRefBase() override;

  IBinder* remote() const { return remote_.get(); }

 private:
  BpRefBase(const BpRefBase&) = delete;
  BpRefBase& operator=(const BpRefBase&) = delete;

  const sp<IBinder> remote_;
};

}  // namespace android
