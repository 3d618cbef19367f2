#include <binder/Binder.h>
#include <binder/Parcel.h>
#include <gtest/gtest.h>
#include <utils/Errors.h>
#include <utils/String16.h>

#include <cstdint>
#include <string>
#include <vector>

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
    password_ = std::move(password);
    return called("verify", userId);
  }
  int32_t fdeDecryptUser(int userId) override { return called("fde", userId); }
  int32_t fbeDecryptMetadata() override { return called("metadata", 0); }
  int32_t fbeDecryptUserDe(int userId) override { return called("de", userId); }
  int32_t fbeDecryptUserCe(int userId, std::string password, bool flag) override {
    password_ = std::move(password);
    flag_ = flag;
    return called("ce", userId);
  }

  std::string operation_;
  int32_t user_id_ = -99;
  std::string password_ = "untouched";
  bool flag_ = false;
  int32_t result_ = 7;

 private:
  int32_t called(const char* operation, int user_id) {
    operation_ = operation;
    user_id_ = user_id;
    return result_;
  }
};

class TransactionDispatch : public testing::Test {
 protected:
  TransactionDispatch() { data_.writeInterfaceToken(ISentrovaService::descriptor); }

  status_t transact(uint32_t code) {
    data_.setDataPosition(0);
    return service_->onTransact(code, data_, &reply_, 0);
  }

  int32_t only_word_of_reply() {
    EXPECT_EQ(reply_.dataSize(), 4u);
    reply_.setDataPosition(0);
    return reply_.readInt32();
  }

  sp<RecordingService> service_ = new RecordingService();
  Parcel data_;
  Parcel reply_;
};

struct Operation {
  uint32_t code;
  const char* name;
  bool has_password;
};

const Operation kOperations[] = {{1, "type", false},     {2, "verify", true}, {3, "fde", false},
                                 {4, "metadata", false}, {5, "de", false},    {6, "ce", true}};

TEST_F(TransactionDispatch, EachCodeCallsItsOperationAndRepliesWithItsResult) {
  data_.writeInt32(-5);
  data_.writeString16(String16("pässword"));
  data_.writeBool(true);
  for (const Operation& operation : kOperations) {
    SCOPED_TRACE(operation.name);
    service_ = new RecordingService();
    service_->result_ = -100 - static_cast<int32_t>(operation.code);
    reply_.setDataSize(0);
    EXPECT_EQ(transact(operation.code), android::NO_ERROR);
    EXPECT_EQ(service_->operation_, operation.name);
    EXPECT_EQ(service_->user_id_, operation.code == 4 ? 0 : -5);
    EXPECT_EQ(service_->password_, operation.has_password ? "pässword" : "untouched");
    EXPECT_EQ(service_->flag_, operation.code == 6);
    EXPECT_EQ(only_word_of_reply(), service_->result_);
  }
}

TEST_F(TransactionDispatch, OtherCodesGoToTheBinderBase) {
  for (const uint32_t code : {0u, 7u, 8u, 0x00ffffffu, 0x7fffffffu, 0x80000001u, 0xffffffffu}) {
    EXPECT_EQ(transact(code), android::UNKNOWN_TRANSACTION) << code;
  }
  EXPECT_EQ(reply_.dataSize(), 0u);
  EXPECT_EQ(service_->operation_, "");
}

TEST_F(TransactionDispatch, WithAWrongTokenNothingIsCalledAndTheReplyStaysAsItWas) {
  Parcel data;
  data.writeInterfaceToken(String16("android.ISomethingElse"));
  data.writeInt32(3);
  for (const Operation& operation : kOperations) {
    data.setDataPosition(0);
    EXPECT_EQ(service_->onTransact(operation.code, data, &reply_, 0), -1) << operation.name;
  }
  EXPECT_EQ(service_->operation_, "");
  EXPECT_EQ(reply_.dataSize(), 0u);
}

// Cuts the request at every length: with the whole token the operation is called with what is
// there and defaults for the rest, without it the request is refused.
TEST_F(TransactionDispatch, TruncatedRequestsUseDefaults) {
  const size_t token_size = data_.dataSize();
  data_.writeInt32(1234);
  const size_t user_end = data_.dataSize();
  data_.writeString16(String16("secret"));
  const size_t password_end = data_.dataSize();
  data_.writeBool(true);
  for (size_t length = 0; length <= data_.dataSize(); ++length) {
    SCOPED_TRACE(length);
    Parcel cut;
    ASSERT_EQ(cut.setData(data_.data(), length), android::NO_ERROR);
    cut.setDataPosition(0);
    service_ = new RecordingService();
    const status_t status = service_->onTransact(6, cut, &reply_, 0);
    if (length < token_size) {
      EXPECT_EQ(status, -1);
      EXPECT_EQ(service_->operation_, "");
      continue;
    }
    EXPECT_EQ(status, android::NO_ERROR);
    EXPECT_EQ(service_->user_id_, length >= user_end ? 1234 : 0);
    EXPECT_EQ(service_->password_, length >= password_end ? "secret" : "");
    EXPECT_EQ(service_->flag_, length == data_.dataSize());
  }
}

TEST_F(TransactionDispatch, PasswordsOfAnyContent) {
  const std::string big(1 << 20, 'x');
  const char16_t with_nul[] = {u'a', u'b', 0, u'c'};
  const char16_t lone_surrogates[] = {u'a', 0xd800, u'b', 0xdc00};
  const std::vector<std::pair<String16, std::string>> table = {
      {String16(with_nul, 4), "ab"},
      {String16(lone_surrogates, 4), "ab"},  // the platform's conversion leaves them out
      {String16("\xf0\x9f\x94\x91 key"), "\xf0\x9f\x94\x91 key"},
      {String16(big.data(), big.size()), big}};
  const size_t head = data_.dataSize();
  for (const auto& [sent, received] : table) {
    data_.setDataSize(head);
    data_.writeInt32(0);
    data_.writeString16(sent);
    EXPECT_EQ(transact(2), android::NO_ERROR);
    EXPECT_EQ(service_->password_, received);
  }
  for (const int32_t length : {-1, -2, INT32_MIN, 3, 0x7ffffffe, INT32_MAX}) {
    data_.setDataSize(head);
    data_.writeInt32(1);
    data_.writeInt32(length);
    data_.writeInt32(0x00610061);
    EXPECT_EQ(transact(2), android::NO_ERROR) << length;
    EXPECT_EQ(service_->password_, "") << length;
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

TEST_F(TransactionDispatch, TheProxyWritesWhatTheServiceReads) {
  const sp<Relay> relay = new Relay(service_);
  const sp<ISentrovaService> proxy = ISentrovaService::asInterface(relay);
  ASSERT_NE(proxy, nullptr);
  ASSERT_NE(proxy.get(), service_.get());
  const auto expect_called = [this](int32_t result, const char* operation, int32_t user_id) {
    EXPECT_EQ(result, 7);
    EXPECT_EQ(service_->operation_, operation);
    EXPECT_EQ(service_->user_id_, user_id);
  };
  expect_called(proxy->getUserPassWordType(1), "type", 1);
  expect_called(proxy->verifyUserPassWord(2, "pass wörd"), "verify", 2);
  EXPECT_EQ(service_->password_, "pass wörd");
  expect_called(proxy->fdeDecryptUser(3), "fde", 3);
  expect_called(proxy->fbeDecryptMetadata(), "metadata", 0);
  expect_called(proxy->fbeDecryptUserDe(5), "de", 5);
  expect_called(proxy->fbeDecryptUserCe(6, "x", true), "ce", 6);
  EXPECT_TRUE(service_->flag_);

  service_->operation_ = "";
  for (const char* text : {"not UTF-8: \xff", "\xc1\xa1", "\xed\xa0\x80"}) {
    EXPECT_EQ(proxy->verifyUserPassWord(0, text), android::BAD_VALUE) << text;
  }
  EXPECT_EQ(service_->operation_, "");
  relay->status_ = android::DEAD_OBJECT;
  EXPECT_EQ(proxy->fbeDecryptMetadata(), android::DEAD_OBJECT);
}

}  // namespace
