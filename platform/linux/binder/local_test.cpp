// Objects of this process, used without any driver.
#include <android-base/file.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <chrono>

#include "binder/Binder.h"
#include "binder/IPCThreadState.h"
#include "binder/IServiceManager.h"
#include "binder/Parcel.h"
#include "binder/ProcessState.h"

namespace android {
namespace {

const String16 kName("sentrova.test.IAdder");

class Adder : public BBinder {
 public:
  const String16& getInterfaceDescriptor() const override { return kName; }
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
    return reply->writeInt32(a + data.readInt32());
  }
};

TEST(LocalObject, RewindsBothParcels) {
  const sp<Adder> object = new Adder();
  Parcel data;
  data.writeInterfaceToken(kName);
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
  EXPECT_EQ(OK, object->transact(IBinder::FIRST_CALL_TRANSACTION, data, nullptr));
}

TEST(LocalObject, DumpsToADescriptorAndCleansItsAttachmentsOnce) {
  int cleaned = 0;
  int first = 0;
  int second = 0;
  const TemporaryFile file;
  {
    const sp<IBinder> object = new Adder();
    Parcel data;
    data.writeFileDescriptor(file.fd);
    data.writeInt32(2);
    data.writeString16(String16("-a"));
    EXPECT_EQ(NOT_ENOUGH_DATA, object->transact(IBinder::DUMP_TRANSACTION, data, nullptr));
    data.writeString16(String16("all"));
    EXPECT_EQ(OK, object->transact(IBinder::DUMP_TRANSACTION, data, nullptr));
    std::string text;
    EXPECT_TRUE(base::ReadFileToString(file.path, &text));
    EXPECT_EQ("-a;all;", text);

    const auto clean = [](const void*, void*, void* cookie) { ++*static_cast<int*>(cookie); };
    object->attachObject(&first, &first, &cleaned, clean);
    object->attachObject(&first, &second, &cleaned, clean);
    object->attachObject(&second, &second, &cleaned, clean);
    EXPECT_EQ(&first, object->findObject(&first)) << "the first stays";
    object->detachObject(&second);
    EXPECT_EQ(nullptr, object->findObject(&second));
  }
  EXPECT_EQ(1, cleaned);
}

// The environment of every test of this program: no driver at all.
TEST(WithoutADriver, EverythingEndsWithAStatus) {
  const sp<ProcessState> process = ProcessState::initWithDriver("/dev/no-such-driver");
  EXPECT_EQ(process, ProcessState::self());
  EXPECT_FALSE(process->hasDriver());
  EXPECT_FALSE(process->becomeContextManager());
  EXPECT_EQ(ENODEV, errno);
  EXPECT_EQ(NO_INIT, process->setThreadPoolMaxThreadCount(4));
  EXPECT_EQ(nullptr, process->getStrongProxyForHandle(1));
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
