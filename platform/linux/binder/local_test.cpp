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

class Dumper : public BBinder {
 public:
  status_t dump(int fd, const Vector<String16>& args) override {
    for (const String16& arg : args)
      dprintf(fd, "%s;", String8(arg).string());
    return OK;
  }
};

TEST(LocalObject, DumpsToADescriptorAndCleansItsAttachmentsOnce) {
  int cleaned = 0;
  int first = 0;
  int second = 0;
  const TemporaryFile file;
  {
    const sp<IBinder> object = new Dumper();
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
