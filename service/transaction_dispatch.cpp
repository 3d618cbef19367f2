#include <binder/Parcel.h>
#include <utils/Errors.h>
#include <utils/String16.h>
#include <utils/String8.h>

#include "common/wipe_utils_strings.h"
#include "service/sentrova_service.h"

namespace android {

template class BnInterface<ISentrovaService>;

namespace {

constexpr uint32_t kFirstCode = ISentrovaService::GET_USER_PASSWORD_TYPE;
constexpr uint32_t kOperationCount = 6;

// Statuses of the reads are ignored on purpose: a short parcel gives zeros and empty values.
int32_t read_user_id(const Parcel& data) {
  int32_t user_id = 0;
  data.readInt32(&user_id);
  return user_id;
}

bool read_flag(const Parcel& data) {
  bool flag = false;
  data.readBool(&flag);
  return flag;
}

// The password of a request in both forms that it passes through, wiped at the end.
class PasswordArgument {
 public:
  explicit PasswordArgument(const Parcel& data) : utf16_(read(data)), utf8_(utf16_) {}
  ~PasswordArgument() {
    sentrova::wipe(utf8_);
    sentrova::wipe(utf16_);
  }
  PasswordArgument(const PasswordArgument&) = delete;
  PasswordArgument& operator=(const PasswordArgument&) = delete;

  // Taken as a NUL-terminated string: the password ends at its first NUL character.
  const char* c_str() const { return utf8_.string(); }

 private:
  static String16 read(const Parcel& data) {
    String16 text;
    data.readString16(&text);
    return text;
  }

  const String16 utf16_;
  const String8 utf8_;  // built in place: assignment would leave a copy behind
};

status_t write_result(Parcel* reply, int32_t result) {
  if (reply != nullptr) {
    reply->writeInt32(result);
  }
  return NO_ERROR;
}

status_t verify_password(ISentrovaService& service, const Parcel& data, Parcel* reply) {
  const int32_t user_id = read_user_id(data);
  const PasswordArgument password(data);
  return write_result(reply, service.verifyUserPassWord(user_id, password.c_str()));
}

status_t decrypt_credential_storage(ISentrovaService& service, const Parcel& data, Parcel* reply) {
  const int32_t user_id = read_user_id(data);
  const PasswordArgument password(data);
  const bool flag = read_flag(data);
  return write_result(reply, service.fbeDecryptUserCe(user_id, password.c_str(), flag));
}

}  // namespace

status_t BnSentrovaService::onTransact(uint32_t code, const Parcel& data, Parcel* reply,
                                       uint32_t flags) {
  if (code - kFirstCode >= kOperationCount) {
    return BBinder::onTransact(code, data, reply, flags);
  }
  if (!data.checkInterface(this)) {
    return PERMISSION_DENIED;
  }
  switch (code) {
    case GET_USER_PASSWORD_TYPE:
      return write_result(reply, getUserPassWordType(read_user_id(data)));
    case VERIFY_USER_PASSWORD:
      return verify_password(*this, data, reply);
    case FDE_DECRYPT_USER:
      return write_result(reply, fdeDecryptUser(read_user_id(data)));
    case FBE_DECRYPT_METADATA:
      return write_result(reply, fbeDecryptMetadata());
    case FBE_DECRYPT_USER_DE:
      return write_result(reply, fbeDecryptUserDe(read_user_id(data)));
    default:
      return decrypt_credential_storage(*this, data, reply);
  }
}

}  // namespace android
