#include <binder/Binder.h>
#include <binder/Parcel.h>
#include <gtest/gtest.h>
#include <utils/Errors.h>
#include <utils/String16.h>

#include <algorithm>
#include <cstdint>
#include <string>
#include <utility>

#include "service/sentrova_service.h"

namespace {

using android::ISentrovaService;
using android::Parcel;
using android::sp;
using android::status_t;
using android::String16;

// Takes the place of the operations through their virtual slots.
class RecordingService : public android::BnSentrovaService {
 public:
  int32_t getUserPassWordType(int userId) override { return called("type", userId); }
  int32_t verifyUserPassWord(int userId, std::string password) override {
    return called("verify", userId, password);
  }
  int32_t fdeDecryptUser(int userId) override { return called("fde", userId); }
  int32_t fbeDecryptMetadata() override { return called("metadata", 0); }
  int32_t fbeDecryptUserDe(int userId) override { return called("de", userId); }
  int32_t fbeDecryptUserCe(int userId, std::string password, bool flag) override {
    return called("ce", userId, password + (flag ? " flag" : ""));
  }

  // The call since the last look: "verify 0 secret".
  std::string take_call() { return std::exchange(call_, ""); }

  int32_t result_ = 7;

 private:
  int32_t called(const char* operation, int user_id, const std::string& rest = "") {
    call_ = std::string(operation) + " " + std::to_string(user_id) + " " + rest;
    return result_;
  }

  std::string call_;
};

class TransactionDispatch : public testing::Test {
 protected:
  TransactionDispatch() { data_.writeInterfaceToken(ISentrovaService::descriptor); }

  // The call that the first `length` bytes of the request lead to, "" if there is none.
  std::string call(uint32_t code, size_t length = SIZE_MAX, status_t status = android::NO_ERROR) {
    Parcel cut;
    Parcel reply;
    cut.setData(data_.data(), std::min(length, data_.dataSize()));
    cut.setDataPosition(0);
    EXPECT_EQ(service_->onTransact(code, cut, &reply, 0), status);
    EXPECT_EQ(reply.dataSize(), status == android::NO_ERROR ? 4u : 0u);
    reply.setDataPosition(0);
    EXPECT_EQ(reply.readInt32(), status == android::NO_ERROR ? service_->result_ : 0);
    return service_->take_call();
  }

  sp<RecordingService> service_ = new RecordingService();
  Parcel data_;
};

TEST_F(TransactionDispatch, CallsTheOperationOfEachCodeWithWhatIsThere) {
  const size_t token_end = data_.dataSize();
  data_.writeInt32(-5);
  const size_t user_end = data_.dataSize();
  data_.writeString16(String16("pässword"));
  const size_t password_end = data_.dataSize();
  data_.writeBool(true);
  const char* const calls[] = {"type -5 ", "verify -5 pässword", "fde -5 ", "metadata 0 ",
                               "de -5 ",   "ce -5 pässword flag"};
  for (uint32_t code = 1; code <= 6; ++code) {
    service_->result_ = -100 - static_cast<int32_t>(code);
    EXPECT_EQ(call(code), calls[code - 1]);
    EXPECT_EQ(call(code, token_end - 1, -1), "");
  }
  for (size_t length = token_end; length < data_.dataSize(); ++length) {
    EXPECT_EQ(call(6, length), length >= password_end ? "ce -5 pässword"
                               : length >= user_end   ? "ce -5 "
                                                      : "ce 0 ");
  }
  for (const uint32_t code : {0u, 7u, 0x00ffffffu, 0x80000001u, 0xffffffffu}) {
    EXPECT_EQ(call(code, SIZE_MAX, android::UNKNOWN_TRANSACTION), "") << code;
  }
  data_.setDataSize(0);
  data_.writeInterfaceToken(String16("android.ISomethingElse"));
  EXPECT_EQ(call(1, SIZE_MAX, -1), "");
}

TEST_F(TransactionDispatch, TakesPasswordsOfAnyContent) {
  const std::string big(1 << 20, 'x');
  const char16_t with_nul[] = {u'a', u'b', 0, u'c'};
  const char16_t lone_surrogates[] = {u'a', 0xd800, u'b', 0xdc00};
  const std::pair<String16, std::string> rows[] = {
      {String16(with_nul, 4), "ab"},
      {String16(lone_surrogates, 4), "ab"},  // the platform's conversion leaves them out
      {String16("\xf0\x9f\x94\x91 key"), "\xf0\x9f\x94\x91 key"},
      {String16(big.data(), big.size()), big}};
  data_.writeInt32(1);
  const size_t head = data_.dataSize();
  for (const auto& [sent, received] : rows) {
    data_.setDataSize(head);
    data_.writeString16(sent);
    EXPECT_EQ(call(2), "verify 1 " + received);
  }
  for (const int32_t length : {-1, -2, INT32_MIN, 3, 0x7ffffffe, INT32_MAX}) {
    data_.setDataSize(head);
    data_.writeInt32(length);
    data_.writeInt32(0x00610061);
    EXPECT_EQ(call(2), "verify 1 ") << length;
  }
}

// The same binder reached as a remote one would be: through a proxy and its parcels.
class Relay : public android::BBinder {
 public:
  explicit Relay(const sp<android::IBinder>& target) : target_(target) {}
  status_t onTransact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) override {
    return status_ == android::NO_ERROR ? target_->transact(code, data, reply, flags) : status_;
  }
  sp<android::IBinder> target_;
  status_t status_ = android::NO_ERROR;
};

TEST_F(TransactionDispatch, ReadsWhatTheProxyWrites) {
  const sp<Relay> relay = new Relay(service_);
  const sp<ISentrovaService> proxy = ISentrovaService::asInterface(relay);
  ASSERT_NE(proxy.get(), service_.get());
  const auto expect_call = [this](int32_t result, const char* call) {
    EXPECT_EQ(result, 7);
    EXPECT_EQ(service_->take_call(), call);
  };
  expect_call(proxy->getUserPassWordType(1), "type 1 ");
  expect_call(proxy->verifyUserPassWord(2, "pass wörd"), "verify 2 pass wörd");
  expect_call(proxy->fdeDecryptUser(3), "fde 3 ");
  expect_call(proxy->fbeDecryptMetadata(), "metadata 0 ");
  expect_call(proxy->fbeDecryptUserDe(5), "de 5 ");
  expect_call(proxy->fbeDecryptUserCe(6, "x", true), "ce 6 x flag");
  for (const char* text : {"not UTF-8: \xff", "\xc1\xa1", "\xed\xa0\x80"}) {
    EXPECT_EQ(proxy->verifyUserPassWord(0, text), android::BAD_VALUE) << text;
  }
  EXPECT_EQ(service_->take_call(), "");
  relay->status_ = android::DEAD_OBJECT;
  EXPECT_EQ(proxy->fbeDecryptMetadata(), android::DEAD_OBJECT);
}

}  // namespace
