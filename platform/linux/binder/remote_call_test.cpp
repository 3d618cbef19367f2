// Calls through the driver, in both directions, with the kernel played by the test.
#include <errno.h>
#include <unistd.h>

#include <functional>

#include "binder/Binder.h"
#include "binder/IServiceManager.h"
#include "platform/linux/binder/remote_fixture.h"

namespace android {
namespace {

using testing::ElementsAre;
using testing::SizeIs;

// Runs a function for each call.
class Handler : public BBinder {
 public:
  using Function = std::function<status_t(const Parcel&, Parcel*)>;
  explicit Handler(Function function) : function_(std::move(function)) {}

 protected:
  status_t onTransact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) override {
    if (code != 11)
      return BBinder::onTransact(code, data, reply, flags);
    return function_(data, reply);
  }

 private:
  const Function function_;
};

void aim_at(binder_transaction_data* transaction, const sp<IBinder>& object) {
  transaction->target.ptr = reinterpret_cast<uintptr_t>(object->getWeakRefs());
  transaction->cookie = reinterpret_cast<uintptr_t>(object.get());
  transaction->code = 11;
}

TEST_F(RemoteTest, SendsTheRequestAndTakesTheReply) {
  kernel_.add_reply(words({41}), {}, TF_CLEAR_BUF);
  Parcel data;
  data.markSensitive();
  data.writeInt32(7);
  Parcel reply;
  ASSERT_EQ(OK, IPCThreadState::self()->transact(3, 11, data, &reply, 0));
  EXPECT_EQ(41, reply.readInt32());
  EXPECT_TRUE(reply.isSensitive());
  const auto sent = kernel_.written(BC_TRANSACTION);
  const auto transaction = sent[0].as<binder_transaction_data>();
  EXPECT_EQ(3U, transaction.target.handle);
  EXPECT_EQ(11U, transaction.code);
  EXPECT_EQ(uint32_t{TF_ACCEPT_FDS | TF_CLEAR_BUF}, transaction.flags);
  EXPECT_EQ(words({7}), sent[0].data);
  EXPECT_EQ(INVALID_OPERATION, reply.writeInt32(1)) << "received parcels are read-only";
  const auto address = reinterpret_cast<uintptr_t>(reply.data());
  reply.freeData();
  const auto freed = kernel_.written(BC_FREE_BUFFER);
  ASSERT_THAT(freed, SizeIs(1)) << "at once: this thread may not talk to the driver again";
  EXPECT_EQ(address, freed[0].as<uint64_t>());
  EXPECT_EQ(OK, reply.writeInt32(1));
}

TEST_F(RemoteTest, TurnsTheDriversAnswersIntoStatuses) {
  const std::string complete = FakeDriver::returned(BR_TRANSACTION_COMPLETE);
  const auto status_reply = [this](int32_t status) {
    binder_transaction_data answer = kernel_.deliver(words({status}));
    answer.flags = TF_STATUS_CODE;
    return FakeDriver::returned(BR_REPLY, answer);
  };
  const struct {
    std::string returned;
    status_t status;
  } cases[] = {
      {FakeDriver::returned(BR_DEAD_REPLY), DEAD_OBJECT},
      {FakeDriver::returned(BR_FAILED_REPLY), FAILED_TRANSACTION},
      {complete + FakeDriver::returned(BR_FROZEN_REPLY), FAILED_TRANSACTION},
      {FakeDriver::returned(BR_ERROR, int32_t{-ENOMEM}), NO_MEMORY},
      {complete + status_reply(PERMISSION_DENIED), PERMISSION_DENIED},
      {complete + status_reply(UNKNOWN_TRANSACTION), UNKNOWN_TRANSACTION},
  };
  for (const auto& item : cases) {
    kernel_.add_step(item.returned);
    Parcel reply;
    reply.writeInt32(1);
    EXPECT_EQ(item.status, call(&reply));
    EXPECT_EQ(0U, reply.dataSize()) << "nothing of an older reply";
  }
  EXPECT_THAT(kernel_.written(BC_FREE_BUFFER), SizeIs(2)) << "status replies are freed as well";
  kernel_.add_error(-ENOMEM);
  EXPECT_EQ(NO_MEMORY, call(nullptr));
  kernel_.add_step(complete);
  EXPECT_EQ(OK, call(nullptr, TF_ONE_WAY)) << "without waiting";
  kernel_.restart();
  kernel_.add_error(-EINTR);
  kernel_.add_error(-EINTR);
  kernel_.add_reply(words({1}));
  EXPECT_EQ(OK, call(nullptr));
  EXPECT_THAT(kernel_.written(BC_TRANSACTION), SizeIs(1)) << "an interrupted call is sent once";
}

TEST_F(RemoteTest, ServesCallsWhileItWaits) {
  const sp<IBinder> object = new Handler([](const Parcel& data, Parcel* reply) {
    EXPECT_EQ(4321, IPCThreadState::self()->getCallingPid());
    EXPECT_EQ(1000U, IPCThreadState::self()->getCallingUid());
    return reply->writeInt32(data.readInt32() + 1);
  });
  binder_transaction_data incoming = kernel_.deliver(words({30}));
  aim_at(&incoming, object);
  incoming.sender_pid = 4321;
  incoming.sender_euid = 1000;
  incoming.flags = TF_CLEAR_BUF;
  kernel_.add_step(FakeDriver::returned(BR_TRANSACTION_COMPLETE) +
                   FakeDriver::returned(BR_TRANSACTION, incoming));
  kernel_.add_step(FakeDriver::returned(BR_TRANSACTION_COMPLETE));
  kernel_.add_step(FakeDriver::returned(BR_REPLY, kernel_.deliver(words({5}))));
  Parcel reply;
  ASSERT_EQ(OK, call(&reply));
  EXPECT_EQ(5, reply.readInt32());
  EXPECT_THAT(kernel_.codes(), ElementsAre(BC_TRANSACTION, BC_FREE_BUFFER, BC_REPLY))
      << "the request goes back before its reply leaves";
  const auto answer = kernel_.written(BC_REPLY)[0];
  EXPECT_EQ(words({31}), answer.data);
  EXPECT_EQ(uint32_t{TF_CLEAR_BUF}, answer.as<binder_transaction_data>().flags);
  EXPECT_EQ(getpid(), IPCThreadState::self()->getCallingPid());
  EXPECT_EQ(getuid(), IPCThreadState::self()->getCallingUid());
}

TEST_F(RemoteTest, AsksTheServiceManager) {
  kernel_.add_reply({});  // the ping
  const sp<IServiceManager> manager = defaultServiceManager();
  const String16 name("sentrova.rescue");
  Parcel list;
  list.writeInt32(1000);
  list.writeString16(name);
  kernel_.add_reply({reinterpret_cast<const char*>(list.data()), list.dataSize()});
  EXPECT_EQ(1U, manager->listServices().size()) << "as many as there are, whatever the count says";
  kernel_.add_step(FakeDriver::returned(BR_DEAD_REPLY));
  EXPECT_EQ(nullptr, manager->checkService(name));
  EXPECT_EQ(nullptr, manager->getService(name)) << "no use waiting";
}

TEST_F(RemoteTest, SurvivesAHostileDriver) {
  const std::string two_objects =
      object_bytes(BINDER_TYPE_HANDLE, 5) + object_bytes(BINDER_TYPE_HANDLE, 6);
  using Damage = void (*)(binder_transaction_data*);
  const Damage none = [](binder_transaction_data*) {};
  const struct {
    const char* what;
    std::string data;
    std::vector<uint64_t> offsets;
    Damage damage;
  } cases[] = {
      {"offset that wraps", two_objects, {UINT64_MAX - 3}, none},
      {"object over the end", words({1, 2}) + two_objects.substr(0, 20), {8}, none},
      {"misaligned offset", two_objects, {2}, none},
      {"offsets in descending order", two_objects, {24, 0}, none},
      {"overlapping objects", two_objects, {0, 4}, none},
      {"unknown type", words({1, 2, 3, 4, 5, 6}), {0}, none},
      {"half an offset", two_objects, {0}, [](auto* t) { t->offsets_size = 4; }},
      {"offsets outside the area", two_objects, {0}, [](auto* t) { t->data.ptr.offsets = 8; }},
      {"endless offsets", two_objects, {0}, [](auto* t) { t->offsets_size = UINT64_MAX - 7; }},
      {"data over the area's end", two_objects, {}, [](auto* t) { t->data_size = 1U << 20; }},
      {"data that wraps", two_objects, {}, [](auto* t) { t->data_size = UINT64_MAX; }},
      {"data outside the area", two_objects, {}, [](auto* t) { t->data.ptr.buffer = 0; }},
  };
  for (const auto& item : cases) {
    SCOPED_TRACE(item.what);
    kernel_.restart();
    binder_transaction_data answer = kernel_.deliver(item.data, item.offsets);
    const uint64_t buffer = answer.data.ptr.buffer;
    item.damage(&answer);
    kernel_.add_step(FakeDriver::returned(BR_REPLY, answer));
    Parcel reply;
    EXPECT_EQ(BAD_VALUE, call(&reply));
    EXPECT_EQ(0U, reply.dataSize());

    const sp<IBinder> object = new Handler([](const Parcel&, Parcel*) { return OK; });
    aim_at(&answer, object);
    kernel_.add_step(FakeDriver::returned(BR_TRANSACTION, answer));
    kernel_.add_step(FakeDriver::returned(BR_TRANSACTION_COMPLETE));
    serve_script();
    ASSERT_THAT(kernel_.written(BC_REPLY), SizeIs(1));
    EXPECT_EQ(words({BAD_VALUE}), kernel_.written(BC_REPLY)[0].data);
    const size_t given_back = answer.data.ptr.buffer == buffer ? 2 : 0;
    EXPECT_THAT(kernel_.written(BC_FREE_BUFFER), SizeIs(given_back));
  }
}

TEST_F(RemoteTest, SurvivesHalfReturns) {
  const std::string whole = FakeDriver::returned(BR_REPLY, kernel_.deliver(words({1})));
  for (size_t length = 0; length < whole.size(); length += 3) {
    kernel_.add_step(whole.substr(0, length));
    EXPECT_EQ(UNKNOWN_ERROR, call(nullptr)) << length;
  }
  kernel_.miscount_next();
  EXPECT_EQ(-EPROTO, call(nullptr));
  kernel_.add_step(FakeDriver::returned(_IOR('r', 99, uint64_t), uint64_t{1}) +
                   FakeDriver::returned(BR_DEAD_REPLY));
  EXPECT_EQ(DEAD_OBJECT, call(nullptr)) << "unknown returns are skipped by their size";
  for (int i = 0; i < 100; ++i)
    kernel_.add_step({});
  serve_script();
  EXPECT_THAT(kernel_.written(BC_EXIT_LOOPER), SizeIs(1));
  EXPECT_FALSE(kernel_.script_is_over()) << "no endless loop over a silent driver";
  kernel_.restart();
}

}  // namespace
}  // namespace android
