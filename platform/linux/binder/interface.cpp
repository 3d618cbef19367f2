#include "binder/IInterface.h"

namespace android {

IInterface::IInterface() = default;

IInterface::~IInterface() = default;

sp<IBinder> IInterface::asBinder(const IInterface* interface) {
  return interface == nullptr ? nullptr : const_cast<IInterface*>(interface)->onAsBinder();
}

sp<IBinder> IInterface::asBinder(const sp<IInterface>& interface) {
  return asBinder(interface.get());
}

}  // namespace android
