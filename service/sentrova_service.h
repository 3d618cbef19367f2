#pragma once

#include <binder/IInterface.h>
#include <binder/Parcel.h>

#include <cstdint>
#include <string>

#include "common/export.h"
#include "interface/isentrova_service.h"

namespace android {

// Its tables stand in the library, so that a loading program needs no type descriptors of ours.
extern template class SENTROVA_API BnInterface<ISentrovaService>;

// The server side of ISentrovaService without the operations: it takes transactions apart and calls
// the operations through their virtual slots. A subclass brings the six operations; it is compiled
// without run-time type information (-fno-rtti), as the library has no type descriptors to link to.
class SENTROVA_API BnSentrovaService : public BnInterface<ISentrovaService> {
 public:
  // Handles codes 1 to 6 and leaves every other code to BBinder::onTransact. Returns NO_ERROR after
  // writing the operation's result as the only word of `reply`, or PERMISSION_DENIED (-1), without
  // calling the operation or touching `reply`, when the interface token is missing or wrong.
  // Arguments that the parcel does not hold are zero, empty or false. A password ends at its first
  // NUL character. May run on several threads at once; takes no lock.
  status_t onTransact(uint32_t code, const Parcel& data, Parcel* reply,
                      uint32_t flags = 0) override;
};

// The rescue service. The loading program constructs one object of it (it has no state), publishes
// it with the service manager and keeps a strong reference to it; calls then arrive on the
// process's binder threads. The operations are those of ISentrovaService; they are not serialised.
class SENTROVA_API SentrovaService : public BnSentrovaService {
 public:
  int32_t getUserPassWordType(int userId) override;
  int32_t verifyUserPassWord(int userId, std::string password) override;
  int32_t fdeDecryptUser(int userId) override;
  int32_t fbeDecryptMetadata() override;
  int32_t fbeDecryptUserDe(int userId) override;
  int32_t fbeDecryptUserCe(int userId, std::string password, bool flag) override;
};

}  // namespace android
