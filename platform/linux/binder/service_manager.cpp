#include <chrono>
#include <mutex>
#include <thread>

#include "binder/IServiceManager.h"
#include "binder/Parcel.h"
#include "binder/ProcessState.h"

namespace android {
namespace {

constexpr std::chrono::seconds kLongestWait{5};
constexpr std::chrono::milliseconds kPollInterval{50};

// Calls `look_up` until it finds something, the wait is over, or it `is_hopeless`.
template <typename LookUp, typename IsHopeless>
auto wait_for(const LookUp& look_up, const IsHopeless& is_hopeless) {
  const auto deadline = std::chrono::steady_clock::now() + kLongestWait;
  auto found = look_up();
  while (found == nullptr && !is_hopeless() && std::chrono::steady_clock::now() < deadline) {
    std::this_thread::sleep_for(kPollInterval);
    found = look_up();
  }
  return found;
}

class BpServiceManager : public BpInterface<IServiceManager> {
 public:
  explicit BpServiceManager(const sp<IBinder>& remote) : BpInterface(remote) {}

  sp<IBinder> getService(const String16& name) const override {
    return wait_for([&] { return checkService(name); },
                    [this] { return !remote()->isBinderAlive(); });
  }

  sp<IBinder> checkService(const String16& name) const override {
    Parcel data;
    Parcel reply;
    data.writeInterfaceToken(descriptor);
    data.writeString16(name);
    if (remote()->transact(CHECK_SERVICE_TRANSACTION, data, &reply) != OK)
      return nullptr;
    return reply.readStrongBinder();
  }

  status_t addService(const String16& name, const sp<IBinder>& service, bool allow_isolated,
                      int dump_flags) override {
    Parcel data;
    Parcel reply;
    data.writeInterfaceToken(descriptor);
    data.writeString16(name);
    data.writeStrongBinder(service);
    data.writeBool(allow_isolated);
    data.writeInt32(dump_flags);
    return remote()->transact(ADD_SERVICE_TRANSACTION, data, &reply);
  }

  Vector<String16> listServices(int dump_flags) override {
    Parcel data;
    Parcel reply;
    data.writeInterfaceToken(descriptor);
    data.writeInt32(dump_flags);
    Vector<String16> names;
    if (remote()->transact(LIST_SERVICES_TRANSACTION, data, &reply) != OK)
      return names;
    const int32_t count = reply.readInt32();
    String16 name;
    for (int32_t i = 0; i < count && reply.readString16(&name) == OK; ++i)
      names.add(name);
    return names;
  }
};

// The directory as this process knows it, dropped when it turns out to be dead.
struct Known {
  std::mutex lock;
  sp<IServiceManager> manager;  // guarded by lock
};

sp<IServiceManager> look_up_manager() {
  if (!ProcessState::self()->hasDriver())
    return nullptr;
  static auto* const known = new Known();
  const std::lock_guard guard(known->lock);
  if (known->manager != nullptr && !IInterface::asBinder(known->manager)->isBinderAlive()) {
    known->manager.clear();
  }
  if (known->manager == nullptr) {
    known->manager =
        interface_cast<IServiceManager>(ProcessState::self()->getContextObject(nullptr));
  }
  return known->manager;
}

}  // namespace

IMPLEMENT_META_INTERFACE(ServiceManager, "android.os.IServiceManager")

sp<IServiceManager> defaultServiceManager() {
  return wait_for(look_up_manager, [] { return !ProcessState::self()->hasDriver(); });
}

}  // namespace android
