#include "interface/isentrova_service.h"

#include <binder/Parcel.h>
#include <utils/Errors.h>
#include <utils/String16.h>
#include <utils/String8.h>

#include <string_view>

#include "common/wipe.h"
#include "common/wipe_utils_strings.h"

namespace android {
namespace {

// One request to the remote service: the interface token, then the arguments, then the call.
class Request {
 public:
  Request() { status_ = data_.writeInterfaceToken(ISentrovaService::descriptor); }

  Request& user_id(int32_t user_id) {
    if (status_ == NO_ERROR) {
      status_ = data_.writeInt32(user_id);
    }
    return *this;
  }

  Request& flag(bool flag) {
    if (status_ == NO_ERROR) {
      status_ = data_.writeBool(flag);
    }
    return *this;
  }

  // The parcel that carries the password is cleared when it is done with, here and in the receiver.
  // Text that is not UTF-8 would become another password, and is refused: the conversion passes
  // over what it does not understand, so its result is converted back and compared.
  Request& password(const std::string& password) {
    if (status_ != NO_ERROR) {
      return *this;
    }
    data_.markSensitive();
    const String16 utf16(password.data(), password.size());
    const String8 back(utf16);
    const bool same = std::string_view(back.string(), back.size()) == password;
    status_ = same ? data_.writeString16(utf16) : BAD_VALUE;
    sentrova::wipe(back);
    sentrova::wipe(utf16);
    return *this;
  }

  int32_t call(IBinder* remote, uint32_t code) {
    Parcel reply;
    if (status_ == NO_ERROR) {
      status_ = remote->transact(code, data_, &reply, 0);
    }
    int32_t result = 0;
    if (status_ == NO_ERROR) {
      status_ = reply.readInt32(&result);
    }
    return status_ == NO_ERROR ? result : status_;
  }

 private:
  Parcel data_;
  status_t status_;
};

class BpSentrovaService : public BpInterface<ISentrovaService> {
 public:
  explicit BpSentrovaService(const sp<IBinder>& remote) : BpInterface<ISentrovaService>(remote) {}

  int32_t getUserPassWordType(int userId) override {
    return Request().user_id(userId).call(remote(), GET_USER_PASSWORD_TYPE);
  }

  int32_t verifyUserPassWord(int userId, std::string password) override {
    const sentrova::WipeOnExit wipe_password(password);
    return Request().user_id(userId).password(password).call(remote(), VERIFY_USER_PASSWORD);
  }

  int32_t fdeDecryptUser(int userId) override {
    return Request().user_id(userId).call(remote(), FDE_DECRYPT_USER);
  }

  int32_t fbeDecryptMetadata() override { return Request().call(remote(), FBE_DECRYPT_METADATA); }

  int32_t fbeDecryptUserDe(int userId) override {
    return Request().user_id(userId).call(remote(), FBE_DECRYPT_USER_DE);
  }

  int32_t fbeDecryptUserCe(int userId, std::string password, bool flag) override {
    const sentrova::WipeOnExit wipe_password(password);
    return Request().user_id(userId).password(password).flag(flag).call(remote(),
                                                                        FBE_DECRYPT_USER_CE);
  }
};

}  // namespace

IMPLEMENT_META_INTERFACE(SentrovaService, "android.ISentrovaService")

}  // namespace android
