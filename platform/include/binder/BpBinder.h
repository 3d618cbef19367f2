#pragma once

#include <atomic>
#include <memory>
#include <mutex>
#include <vector>

#include "binder/IBinder.h"

namespace sentrova::binder {
class Attachments;
class ProxyTable;
}  // namespace sentrova::binder

namespace android {

// The proxy of an object in another process. There is one for each handle in a process; they are
// got from a Parcel or from ProcessState, never made directly.
class SENTROVA_API BpBinder : public IBinder {
 public:
  // The driver's number for the object, valid while this proxy lives.
  int32_t handle() const { return handle_; }

  // Asks the remote object the first time; empty until it has answered.
  const String16& getInterfaceDescriptor() const override;
  bool isBinderAlive() const override;
  status_t pingBinder() override;
  status_t dump(int fd, const Vector<String16>& args) override;
  status_t transact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags = 0) override;
  // Deaths are reported on looper threads: a process without a thread pool is never told.
  status_t linkToDeath(const sp<DeathRecipient>& recipient, void* cookie = nullptr,
                       uint32_t flags = 0) override;
  status_t unlinkToDeath(const wp<DeathRecipient>& recipient, void* cookie = nullptr,
                         uint32_t flags = 0, wp<DeathRecipient>* out_recipient = nullptr) override;

  void attachObject(const void* id, void* object, void* cleanup_cookie,
                    object_cleanup_func cleanup) override;
  void* findObject(const void* id) const override;
  void detachObject(const void* id) override;

  BpBinder* remoteBinder() override;

  // Marks the object as dead and tells all recipients, once. For the thread that reads the driver.
  void sendObituary();

 protected:
  ~BpBinder() override;
  void onLastStrongRef(const void* id) override;

 private:
  friend class sentrova::binder::ProxyTable;

  struct DeathLink {
    wp<DeathRecipient> recipient;
    void* cookie;
    uint32_t flags;
  };

  BpBinder(int32_t handle, bool alive);

  const int32_t handle_;
  std::atomic<bool> alive_;
  mutable std::mutex lock_;  // guards what follows
  bool obituary_sent_ = false;
  std::vector<DeathLink> links_;
  mutable bool descriptor_known_ = false;
  mutable String16 descriptor_;  // never changes once known
  const std::unique_ptr<sentrova::binder::Attachments> attachments_;
};

}  // namespace android
