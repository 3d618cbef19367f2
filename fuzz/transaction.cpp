// A transaction: the first byte of the input is its code, the second says whether the right
// interface token stands before the rest. The operations only count.
#include <android-base/logging.h>
#include <binder/Parcel.h>

#include <string>

#include "fuzz/fuzz_target.h"
#include "service/sentrova_service.h"

namespace {

using android::Parcel;

class CountingService : public android::BnSentrovaService {
 public:
  int32_t getUserPassWordType(int) override { return ++calls; }
  int32_t verifyUserPassWord(int, std::string password) override { return called_with(password); }
  int32_t fdeDecryptUser(int) override { return ++calls; }
  int32_t fbeDecryptMetadata() override { return ++calls; }
  int32_t fbeDecryptUserDe(int) override { return ++calls; }
  int32_t fbeDecryptUserCe(int, std::string password, bool) override {
    return called_with(password);
  }

  int32_t calls = 0;

 private:
  int32_t called_with(const std::string& password) {
    CHECK(password.find('\0') == std::string::npos);
    return ++calls;
  }
};

// Exactly one operation has been called, and its result is the only word of the reply.
void check_called(const CountingService& service, android::status_t status, const Parcel& reply) {
  CHECK_EQ(service.calls, 1);
  CHECK_EQ(status, android::NO_ERROR);
  CHECK_EQ(reply.dataSize(), sizeof(int32_t));
  reply.setDataPosition(0);
  CHECK_EQ(reply.readInt32(), 1);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size < 2) {
    return 0;
  }
  const uint32_t code = data[0];
  const bool has_token = (data[1] & 1) != 0;
  Parcel request, reply;
  if (has_token) {
    request.writeInterfaceToken(android::ISentrovaService::descriptor);
  }
  request.write(data + 2, size - 2);
  request.setDataPosition(0);
  const android::sp<CountingService> service = new CountingService();
  const android::status_t status = service->onTransact(code, request, &reply, 0);
  if (service->calls != 0 || (has_token && code >= 1 && code <= 6)) {
    check_called(*service, status, reply);
  } else {
    CHECK(code < 1 || code > 6 || (status == -1 && reply.dataSize() == 0));
  }
  return 0;
}
