// What the driver counts: references to remote and local objects, and death notifications.
#include <functional>
#include <latch>
#include <thread>
#include <vector>

#include "binder/Binder.h"
#include "platform/linux/binder/remote_fixture.h"

namespace android {
namespace {

using testing::ElementsAre;
using testing::SizeIs;

class Recipient : public IBinder::DeathRecipient {
 public:
  void binderDied(const wp<IBinder>& who) override {
    ++deaths;
    last = who;
    if (when_told)
      when_told();
  }

  int deaths = 0;
  wp<IBinder> last;
  std::function<void()> when_told;
};

class RemoteReferences : public RemoteTest {
 protected:
  uint64_t requested_cookie(size_t index) {
    return kernel_.written(BC_REQUEST_DEATH_NOTIFICATION)
        .at(index)
        .as<binder_handle_cookie>()
        .cookie;
  }
};

TEST_F(RemoteReferences, OneProxyAHandle) {
  sp<IBinder> first = proxy(5);
  const sp<IBinder> second = proxy(5);
  EXPECT_EQ(first, second);
  EXPECT_NE(first, proxy(6));
  EXPECT_THAT(kernel_.codes(),
              ElementsAre(BC_INCREFS, BC_ACQUIRE, BC_INCREFS, BC_ACQUIRE, BC_RELEASE, BC_DECREFS));
  first.clear();
  EXPECT_THAT(kernel_.codes(), SizeIs(6));

  kernel_.restart();
  kernel_.add_reply(object_bytes(BINDER_TYPE_HANDLE, 8), {0});
  sp<IBinder> received;
  {
    Parcel reply;
    ASSERT_EQ(OK, call(&reply));
    ASSERT_EQ(OK, reply.readStrongBinder(&received));
  }
  EXPECT_THAT(kernel_.codes(), ElementsAre(BC_TRANSACTION, BC_INCREFS, BC_ACQUIRE, BC_FREE_BUFFER))
      << "before the reply is given back";
}

// Makes a call of its own when it is destroyed.
class LastWords : public BBinder {
 public:
  explicit LastWords(status_t* status) : status_(status) {}

 protected:
  ~LastWords() override {
    Parcel data;
    *status_ = IPCThreadState::self()->transact(4, 12, data, nullptr, 0);
  }

 private:
  status_t* const status_;
};

TEST_F(RemoteReferences, LocalObjectsAreNotReleasedInTheMiddleOfACall) {
  status_t last_words = NO_INIT;
  auto* const object = new LastWords(&last_words);
  object->incStrong(this);
  const binder_ptr_cookie named = {reinterpret_cast<uintptr_t>(object->getWeakRefs()),
                                   reinterpret_cast<uintptr_t>(static_cast<IBinder*>(object))};
  kernel_.add_step(FakeDriver::returned(BR_RELEASE, named));
  kernel_.add_step(FakeDriver::returned(BR_REPLY, kernel_.deliver(words({1}))));
  kernel_.add_step(FakeDriver::returned(BR_DEAD_REPLY));
  Parcel reply;
  EXPECT_EQ(OK, call(&reply));
  EXPECT_EQ(1, reply.readInt32()) << "the outer call got its own answer";
  EXPECT_EQ(DEAD_OBJECT, last_words);
}

TEST_F(RemoteReferences, DeathIsToldToAllOnce) {
  const sp<IBinder> object = proxy(5);
  const sp<Recipient> first = new Recipient();
  const sp<Recipient> second = new Recipient();
  const sp<Recipient> unlinked = new Recipient();
  for (const sp<Recipient>& recipient : {first, second, unlinked}) {
    EXPECT_EQ(OK, object->linkToDeath(recipient, this));
  }
  EXPECT_THAT(kernel_.written(BC_REQUEST_DEATH_NOTIFICATION), SizeIs(1));
  EXPECT_EQ(OK, object->unlinkToDeath(unlinked));
  EXPECT_EQ(NAME_NOT_FOUND, object->unlinkToDeath(unlinked));
  status_t link_in_obituary = OK;
  first->when_told = [&] { link_in_obituary = object->linkToDeath(first); };

  const uint64_t cookie = requested_cookie(0);
  kernel_.add_step(FakeDriver::returned(BR_DEAD_BINDER, cookie) +
                   FakeDriver::returned(BR_DEAD_BINDER, cookie + 1000) +
                   FakeDriver::returned(BR_DEAD_BINDER, cookie));
  kernel_.add_error(-EBADF);
  serve_script();
  EXPECT_EQ(1, first->deaths);
  EXPECT_EQ(1, second->deaths);
  EXPECT_EQ(0, unlinked->deaths);
  EXPECT_EQ(object, first->last.promote());
  EXPECT_EQ(DEAD_OBJECT, link_in_obituary);
  EXPECT_THAT(kernel_.written(BC_DEAD_BINDER_DONE), SizeIs(3)) << "unknown cookies as well";

  EXPECT_FALSE(object->isBinderAlive());
  EXPECT_EQ(DEAD_OBJECT, object->unlinkToDeath(first));
  EXPECT_EQ(DEAD_OBJECT, object->pingBinder()) << "without asking the driver";
}

TEST_F(RemoteReferences, UnlinkingTheLastTakesTheRequestBack) {
  const sp<IBinder> object = proxy(5);
  const sp<Recipient> recipient = new Recipient();
  int cookie = 0;
  ASSERT_EQ(OK, object->linkToDeath(recipient, &cookie));
  wp<IBinder::DeathRecipient> unlinked;
  EXPECT_EQ(OK, object->unlinkToDeath(nullptr, &cookie, 0, &unlinked)) << "by its cookie";
  EXPECT_EQ(recipient.get(), unlinked.promote().get());
  EXPECT_EQ(0U, kernel_.handles()[5].death_cookie);
  ASSERT_EQ(OK, object->linkToDeath(recipient));
  EXPECT_NE(requested_cookie(0), requested_cookie(1));
  const uint64_t late = requested_cookie(0);
  kernel_.add_step(FakeDriver::returned(BR_DEAD_BINDER, late) +
                   FakeDriver::returned(BR_CLEAR_DEATH_NOTIFICATION_DONE, late));
  kernel_.add_error(-EBADF);
  serve_script();
  EXPECT_EQ(0, recipient->deaths) << "a late notice of the request taken back";
}

// The handle of a context manager that died is its successor's, also while the old proxy is held.
TEST_F(RemoteReferences, ADeadManagersProxyIsNotHandedOutAgain) {
  const sp<IBinder> first = ProcessState::self()->getStrongProxyForHandle(0);
  kernel_.add_step(FakeDriver::returned(BR_NOOP) + FakeDriver::returned(BR_DEAD_REPLY));
  EXPECT_EQ(DEAD_OBJECT, first->pingBinder());
  const size_t released = kernel_.written(BC_RELEASE).size();
  const sp<IBinder> second = ProcessState::self()->getStrongProxyForHandle(0);
  EXPECT_NE(first, second);
  EXPECT_TRUE(second->isBinderAlive());
  EXPECT_EQ(second, ProcessState::self()->getStrongProxyForHandle(0));
  EXPECT_THAT(kernel_.written(BC_RELEASE), SizeIs(released + 1));
}

TEST_F(RemoteReferences, SurviveTheRaceOfLastReleaseAndNewLookUp) {
  constexpr int kThreads = 4;
  constexpr int kRounds = 2000;
  std::latch start(kThreads);
  std::vector<std::thread> threads;
  for (int i = 0; i < kThreads; ++i) {
    threads.emplace_back([this, &start] {
      start.arrive_and_wait();
      const sp<Recipient> recipient = new Recipient();
      for (int round = 0; round < kRounds; ++round) {
        const sp<IBinder> object = proxy(5);
        ASSERT_NE(nullptr, object);
        ASSERT_EQ(5, object->remoteBinder()->handle());
        ASSERT_EQ(OK, object->linkToDeath(recipient));
        ASSERT_GE(kernel_.handles()[5].strong, 1) << "while a proxy lives";
        ASSERT_NE(0U, kernel_.handles()[5].death_cookie);
        if (round % 2 == 0) {
          ASSERT_EQ(OK, object->unlinkToDeath(recipient));
        }
      }
    });
  }
  for (std::thread& thread : threads)
    thread.join();
}

TEST_F(RemoteReferences, TellTheDriverOfTheEndOfAThread) {
  std::thread([] { EXPECT_NE(nullptr, proxy(5)); }).join();
  EXPECT_EQ(1, kernel_.threads_ended());
  // A reference that outlives the thread's own conversation is told of once more.
  std::thread([] {
    thread_local sp<IBinder> last_one;
    last_one = proxy(5);
  }).join();
  EXPECT_EQ(0, kernel_.handles()[5].strong);
  EXPECT_EQ(3, kernel_.threads_ended());
}

}  // namespace
}  // namespace android
