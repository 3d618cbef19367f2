// Objects of this process, used without any driver.
#include <android-base/unique_fd.h>
#include <gtest/gtest.h>
#include <string.h>
#include <sys/types.h>
#include <unistd.h>

#include <chrono>

#include "binder/IInterface.h"
#include "binder/IPCThreadState.h"
#include "binder/IServiceManager.h"
#include "binder/Parcel.h"
#include "binder/ProcessState.h"

namespace android {
namespace {

class IAdder : public IInterface {
 public:
  DECLARE_META_INTERFACE(Adder)
  virtual int32_t add(int32_t a, int32_t b) = 0;
};

class BpAdder : public BpInterface<IAdder> {
 public:
  explicit BpAdder(const sp<IBinder>& remote) : BpInterface(remote) {}
  int32_t add(int32_t a, int32_t b) override {
    Parcel data;
    Parcel reply;
    data.writeInterfaceToken(descriptor);
    data.writeInt32(a);
    data.writeInt32(b);
    remote()->transact(IBinder::FIRST_CALL_TRANSACTION, data, &reply);
    return reply.readInt32();
  }
};

IMPLEMENT_META_INTERFACE(Adder, "sentrova.test.IAdder")

class Adder : public BnInterface<IAdder> {
 public:
  int32_t add(int32_t a, int32_t b) override { return a + b; }
  status_t dump(int fd, const Vector<String16>& args) override {
    for (const String16& arg : args)
      dprintf(fd, "%s;", String8(arg).string());
    return OK;
  }

  uint32_t last_flags = 0;
  bool reply_was_sensitive = false;

 protected:
  status_t onTransact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) override {
    if (code != FIRST_CALL_TRANSACTION)
      return BBinder::onTransact(code, data, reply, flags);
    last_flags = flags;
    reply_was_sensitive = reply->isSensitive();
    if (!data.checkInterface(this))
      return PERMISSION_DENIED;
    const int32_t a = data.readInt32();
    return reply->writeInt32(add(a, data.readInt32()));
  }
};

// Hides that its object is local, as the driver would.
class Distant : public BBinder {
 public:
  explicit Distant(const sp<IBinder>& target) : target_(target) {}

 protected:
  status_t onTransact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) override {
    return target_->transact(code, data, reply, flags);
  }

 private:
  const sp<IBinder> target_;
};

TEST(LocalObject, IsItsOwnInterface) {
  const sp<IBinder> object = new Adder();
  EXPECT_EQ(object.get(), IInterface::asBinder(interface_cast<IAdder>(object)).get());
  EXPECT_EQ(nullptr, object->queryLocalInterface(String16("sentrova.test.IAdde")));
  EXPECT_EQ(nullptr, object->queryLocalInterface(String16()));
  EXPECT_EQ(nullptr, interface_cast<IAdder>(nullptr));
  EXPECT_EQ(nullptr, IInterface::asBinder(static_cast<IInterface*>(nullptr)));
  EXPECT_EQ(IAdder::descriptor, object->getInterfaceDescriptor());
  EXPECT_EQ(object.get(), object->localBinder());
  EXPECT_EQ(nullptr, object->remoteBinder());
}

TEST(LocalObject, IsCalledThroughAProxyWhenItIsDistant) {
  const sp<IBinder> distant = new Distant(new Adder());
  const sp<IAdder> proxy = interface_cast<IAdder>(distant);
  ASSERT_NE(nullptr, proxy);
  EXPECT_EQ(distant.get(), IInterface::asBinder(proxy).get());
  EXPECT_EQ(12, proxy->add(5, 7));
}

TEST(LocalObject, RewindsBothParcels) {
  const sp<Adder> object = new Adder();
  Parcel data;
  data.writeInterfaceToken(IAdder::descriptor);
  data.writeInt32(1);
  data.writeInt32(2);
  Parcel reply;
  ASSERT_EQ(
      OK, object->transact(IBinder::FIRST_CALL_TRANSACTION, data, &reply, IBinder::FLAG_CLEAR_BUF));
  EXPECT_EQ(0U, reply.dataPosition());
  EXPECT_EQ(4U, reply.dataSize());
  EXPECT_EQ(3, reply.readInt32());
  EXPECT_EQ(uint32_t{IBinder::FLAG_CLEAR_BUF}, object->last_flags);
  EXPECT_TRUE(object->reply_was_sensitive);
  EXPECT_EQ(OK, object->transact(IBinder::FIRST_CALL_TRANSACTION, data, nullptr))
      << "no reply wanted";
}

TEST(LocalObject, AnswersThePlatformsCodes) {
  const sp<IBinder> object = new Adder();
  Parcel empty;
  Parcel reply;
  EXPECT_EQ(OK, object->transact(IBinder::PING_TRANSACTION, empty, &reply));
  EXPECT_EQ(OK, object->pingBinder());
  EXPECT_EQ(OK, object->transact(IBinder::INTERFACE_TRANSACTION, empty, &reply));
  EXPECT_EQ(IAdder::descriptor, reply.readString16());
  for (const uint32_t code : {uint32_t{0}, uint32_t{7}, uint32_t{IBinder::LAST_CALL_TRANSACTION},
                              uint32_t{IBinder::SHELL_COMMAND_TRANSACTION}, UINT32_MAX}) {
    EXPECT_EQ(UNKNOWN_TRANSACTION, object->transact(code, empty, &reply)) << code;
  }
}

TEST(LocalObject, DumpsToTheGivenDescriptor) {
  const sp<IBinder> object = new Adder();
  base::unique_fd read_end;
  base::unique_fd write_end;
  ASSERT_TRUE(base::Pipe(&read_end, &write_end));
  const auto dump = [&](int32_t count, std::initializer_list<const char*> args) {
    Parcel data;
    data.writeFileDescriptor(write_end.get());
    data.writeInt32(count);
    for (const char* arg : args)
      data.writeString16(String16(arg));
    Parcel reply;
    return object->transact(IBinder::DUMP_TRANSACTION, data, &reply);
  };
  EXPECT_EQ(OK, dump(2, {"-a", "all"}));
  char text[16] = {};
  EXPECT_EQ(7, read(read_end.get(), text, sizeof(text)));
  EXPECT_STREQ("-a;all;", text);
  EXPECT_EQ(NOT_ENOUGH_DATA, dump(INT32_MAX, {"one"}));
  Parcel empty;
  EXPECT_EQ(NOT_ENOUGH_DATA, object->transact(IBinder::DUMP_TRANSACTION, empty, nullptr));
}

TEST(LocalObject, KeepsAttachmentsUntilItsEnd) {
  static int cleaned = 0;
  cleaned = 0;
  int first = 0;
  int second = 0;
  const auto clean = [](const void*, void*, void* cookie) {
    cleaned += *static_cast<int*>(cookie);
  };
  int one = 1;
  int ten = 10;
  {
    const sp<IBinder> object = new Adder();
    EXPECT_EQ(nullptr, object->findObject(&first));
    object->attachObject(&first, &first, &one, clean);
    object->attachObject(&first, &second, &ten, clean);
    object->attachObject(&second, &second, &ten, clean);
    EXPECT_EQ(&first, object->findObject(&first)) << "the first stays";
    object->detachObject(&second);
    EXPECT_EQ(nullptr, object->findObject(&second));
  }
  EXPECT_EQ(1, cleaned);
}

// The number of a virtual function in its class's table, by the C++ ABI of the two machines.
template <typename Function>
size_t slot_of(Function function) {
  static_assert(sizeof(function) == 2 * sizeof(uintptr_t));
  uintptr_t words[2];
  memcpy(words, &function, sizeof(words));
#if defined(__aarch64__)
  EXPECT_EQ(1U, words[1] & 1U) << "not virtual";
  return words[0] / sizeof(void*);
#else
  EXPECT_EQ(1U, words[0] & 1U) << "not virtual";
  return words[0] / sizeof(void*);
#endif
}

class Slots : public BBinder {
 public:
  using BBinder::onTransact;
};

TEST(BinaryInterface, KeepsTheOrderOfTheVirtualFunctions) {
  const size_t slots[] = {
      slot_of(&BBinder::queryLocalInterface),
      slot_of(&BBinder::getInterfaceDescriptor),
      slot_of(&BBinder::isBinderAlive),
      slot_of(&BBinder::pingBinder),
      slot_of(&BBinder::dump),
      slot_of(&BBinder::transact),
      slot_of(&BBinder::linkToDeath),
      slot_of(&BBinder::unlinkToDeath),
      slot_of(&BBinder::checkSubclass),
      slot_of(&BBinder::attachObject),
      slot_of(&BBinder::findObject),
      slot_of(&BBinder::detachObject),
      slot_of(&BBinder::localBinder),
      slot_of(&BBinder::remoteBinder),
  };
  for (size_t i = 0; i < std::size(slots); ++i)
    EXPECT_EQ(i, slots[i]);
  EXPECT_EQ(16U, slot_of(&Slots::onTransact)) << "behind the two destructors";
  EXPECT_EQ(3U, slot_of(&IAdder::getInterfaceDescriptor)) << "behind destructors and onAsBinder";
  EXPECT_EQ(4U, slot_of(&IAdder::add));
}

// The environment of every test of this program: no driver at all.
TEST(WithoutADriver, EverythingEndsWithAStatus) {
  const sp<ProcessState> process = ProcessState::initWithDriver("/dev/no-such-driver");
  ASSERT_NE(nullptr, process);
  EXPECT_EQ(process, ProcessState::self());
  EXPECT_FALSE(process->hasDriver());
  EXPECT_FALSE(process->becomeContextManager());
  EXPECT_EQ(ENODEV, errno);
  EXPECT_EQ(NO_INIT, process->setThreadPoolMaxThreadCount(4));
  EXPECT_EQ(nullptr, process->getStrongProxyForHandle(1));
  EXPECT_EQ(nullptr, process->getContextObject(nullptr));
  process->startThreadPool();
  IPCThreadState* const thread = IPCThreadState::self();
  Parcel data;
  Parcel reply;
  EXPECT_EQ(NO_INIT, thread->transact(0, IBinder::PING_TRANSACTION, data, &reply, 0));
  EXPECT_EQ(getpid(), thread->getCallingPid());
  EXPECT_EQ(getuid(), thread->getCallingUid());
  thread->flushCommands();
  thread->joinThreadPool();
  const auto start = std::chrono::steady_clock::now();
  EXPECT_EQ(nullptr, defaultServiceManager());
  EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(1)) << "no use waiting";
}

}  // namespace
}  // namespace android
