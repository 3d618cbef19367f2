#pragma once

#include <binder/IBinder.h>
#include <binder/IInterface.h>

#include <cstdint>
#include <string>

#include "common/export.h"

namespace android {

// The rescue service as a client sees it: what credential locks the owner's data, whether a
// password is that credential, and the unlocking of the data. `asInterface(binder)` gives a proxy
// for a remote service, or the service object itself where it lives in the same process.
//
// Every operation answers with one 32-bit number. Calls through a proxy answer with a negative
// platform status other than -1 (utils/Errors.h, for instance DEAD_OBJECT) when the call did not
// reach the service or its reply could not be read; -1 may also be the service refusing the
// caller's interface token. Operations may be called from any thread. The service takes no lock:
// queries run side by side, but a client lets one unlocking operation end before the next begins.
class SENTROVA_API ISentrovaService : public IInterface {
 public:
  DECLARE_META_INTERFACE(SentrovaService)

  // Transaction codes. Each request is the interface token followed by the operation's arguments in
  // order (int32 user id, String16 password, bool flag); each reply is the int32 result alone.
  enum Transaction : uint32_t {
    GET_USER_PASSWORD_TYPE = IBinder::FIRST_CALL_TRANSACTION,
    VERIFY_USER_PASSWORD,
    FDE_DECRYPT_USER,
    FBE_DECRYPT_METADATA,
    FBE_DECRYPT_USER_DE,
    FBE_DECRYPT_USER_CE,
  };

  // The kind of lock-screen credential: 0 for none, otherwise one of the codes 2, 3, 11, 12, 13
  // that the credential library and its clients agree on; -1 when it is not known. The owner (user
  // 0) is asked about whatever `userId` says.
  virtual int32_t getUserPassWordType(int userId) = 0;

  // 0 when `password` (UTF-8) is the owner's credential, -1 when it is not. The owner is user 0
  // whatever `userId` says.
  virtual int32_t verifyUserPassWord(int userId, std::string password) = 0;

  // Unlocks a device with full-disk encryption: 0 on success, -1 on failure. Takes up to ten
  // seconds, fifteen where the volume daemon cannot be killed. `userId` is not used.
  virtual int32_t fdeDecryptUser(int userId) = 0;

  // First step of a device with file-based encryption: 0 when the metadata encryption of /data is
  // unlocked or /data does not use it, -1 on failure.
  virtual int32_t fbeDecryptMetadata() = 0;

  // Second step: mounts /data and unlocks device-encrypted storage; without a credential also the
  // credential-encrypted storage of `userId`. 0 on success, -1 when unlocking fails, the non-zero
  // result of the mount when that fails.
  virtual int32_t fbeDecryptUserDe(int userId) = 0;

  // Third step, where a credential is set: 0 when `password` (UTF-8) is right and the
  // credential-encrypted storage of `userId` is unlocked, else -1. `flag` is handed to the
  // decryption library unchanged.
  virtual int32_t fbeDecryptUserCe(int userId, std::string password, bool flag) = 0;
};

}  // namespace android
