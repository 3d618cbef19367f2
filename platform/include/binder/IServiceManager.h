#pragma once

#include <utils/Vector.h>

#include "binder/IInterface.h"

namespace android {

// The directory of named services. A name has 1 to 127 characters out of letters, digits and
// "._-/:". The directory forgets a service when its process ends.
class SENTROVA_API IServiceManager : public IInterface {
 public:
  DECLARE_META_INTERFACE(ServiceManager)

  // Which services a list names and how dumps treat one; kept for callers, not told apart here.
  static constexpr int DUMP_FLAG_PRIORITY_DEFAULT = 1 << 3;
  static constexpr int DUMP_FLAG_PRIORITY_ALL = 0xf;

  enum {
    GET_SERVICE_TRANSACTION = IBinder::FIRST_CALL_TRANSACTION,
    CHECK_SERVICE_TRANSACTION,
    ADD_SERVICE_TRANSACTION,
    LIST_SERVICES_TRANSACTION,
  };

  // The service, waited for up to 5 seconds; null if it is still not there.
  virtual sp<IBinder> getService(const String16& name) const = 0;

  // The service if it is there now, else null.
  virtual sp<IBinder> checkService(const String16& name) const = 0;

  // Enters `service`, instead of one of that name that is there. OK; PERMISSION_DENIED unless the
  // caller is root or the system user (1000); BAD_VALUE for a bad name, no service or a
  // dead one; NO_MEMORY when the directory is full; or a failure of the call itself.
  virtual status_t addService(const String16& name, const sp<IBinder>& service,
                              bool allow_isolated = false,
                              int dump_flags = DUMP_FLAG_PRIORITY_DEFAULT) = 0;

  // All names, in order; empty when the directory cannot be asked.
  virtual Vector<String16> listServices(int dump_flags = DUMP_FLAG_PRIORITY_ALL) = 0;
};

// The device's directory, waited for up to 5 seconds; null without a driver or when it is still not
// there. May be called on any thread.
SENTROVA_API sp<IServiceManager> defaultServiceManager();

// The service `name` as INTERFACE. OK, or NAME_NOT_FOUND if there is no such service.
template <typename INTERFACE>
status_t getService(const String16& name, sp<INTERFACE>* out_service) {
  const sp<IServiceManager> manager = defaultServiceManager();
  *out_service =
      manager == nullptr ? nullptr : interface_cast<INTERFACE>(manager->getService(name));
  return *out_service == nullptr ? NAME_NOT_FOUND : OK;
}

}  // namespace android
