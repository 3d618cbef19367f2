// Binder over the kernel's driver, between processes: this program serves in copies of itself that
// the tests start. The device's service manager runs already.
#include <android-base/file.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <spawn.h>
#include <string.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "binder/IPCThreadState.h"
#include "binder/IServiceManager.h"
#include "binder/Parcel.h"
#include "binder/ProcessState.h"

namespace android {
namespace {

using std::chrono::milliseconds;
using std::chrono::steady_clock;

const String16 kInterface("sentrova.test.IPeer");

enum Code : uint32_t {
  kEcho = IBinder::FIRST_CALL_TRANSACTION,  // bytes and objects back
  kLargeReply,                              // size -> that many bytes
  kSleep,                                   // milliseconds
  kHold,                                    // a binder, or null to let go of the last one
  kExit,                                    // no answer
};

class Peer : public BBinder {
 public:
  const String16& getInterfaceDescriptor() const override { return kInterface; }

 protected:
  status_t onTransact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) override {
    if (code < kEcho || code > kExit)
      return BBinder::onTransact(code, data, reply, flags);
    if (!data.checkInterface(this))
      return PERMISSION_DENIED;
    switch (code) {
      case kEcho:
        return reply->appendFrom(&data, data.dataPosition(), data.dataAvail());
      case kLargeReply:
        return reply->setDataSize(data.readUint32());
      case kSleep:
        std::this_thread::sleep_for(milliseconds(data.readInt32()));
        return OK;
      case kHold: {
        const std::lock_guard guard(lock_);
        return data.readNullableStrongBinder(&held_);
      }
      default:
        _exit(0);
    }
  }

 private:
  std::mutex lock_;
  sp<IBinder> held_;  // guarded by lock_
};

int serve(const char* name) {
  const sp<IServiceManager> manager = defaultServiceManager();
  if (manager == nullptr || manager->addService(String16(name), new Peer()) != OK)
    return 1;
  ProcessState::self()->startThreadPool();
  IPCThreadState::self()->joinThreadPool();
  return 1;
}

// Whether an ordinary user is refused; the connection is root's.
int add_as_ordinary_user() {
  const sp<IServiceManager> manager = defaultServiceManager();
  if (manager == nullptr || setuid(2000) != 0)
    return 1;
  return manager->addService(String16("test.intruder"), new Peer()) == PERMISSION_DENIED ? 0 : 2;
}

// A copy of this program with other arguments, killed at the end if it still runs.
class Process {
 public:
  Process(const char* role, const char* name) {
    const char* const arguments[] = {"binder_device_test", role, name, nullptr};
    EXPECT_EQ(0, posix_spawn(&pid_, "/proc/self/exe", nullptr, nullptr,
                             const_cast<char* const*>(arguments), environ));
  }
  ~Process() {
    if (pid_ <= 0)
      return;
    kill(pid_, SIGKILL);
    wait();
  }
  Process(const Process&) = delete;
  Process& operator=(const Process&) = delete;

  // The exit status; -1 after a signal.
  int wait() {
    int status = 0;
    waitpid(pid_, &status, 0);
    pid_ = 0;
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  }

 private:
  pid_t pid_ = 0;
};

template <typename Condition>
bool soon(const Condition& condition) {
  const auto deadline = steady_clock::now() + std::chrono::seconds(10);
  while (!condition()) {
    if (steady_clock::now() > deadline)
      return false;
    std::this_thread::sleep_for(milliseconds(5));
  }
  return true;
}

// One peer process for each test.
class BinderDevice : public testing::Test {
 protected:
  void SetUp() override {
    ASSERT_TRUE(ProcessState::self()->hasDriver());
    ProcessState::self()->startThreadPool();
    manager_ = defaultServiceManager();
    ASSERT_NE(nullptr, manager_) << "the service manager does not run";
    peer_ = manager_->getService(kName);
    ASSERT_NE(nullptr, peer_);
  }
  void TearDown() override {
    process_.reset();
    EXPECT_TRUE(soon([this] { return manager_->checkService(kName) == nullptr; }));
  }

  static void begin(Parcel* request) { request->writeInterfaceToken(kInterface); }
  status_t echo(int32_t number, int32_t* answer) {
    Parcel request;
    Parcel reply;
    begin(&request);
    request.writeInt32(number);
    const status_t status = peer_->transact(kEcho, request, &reply);
    *answer = reply.readInt32();
    return status;
  }
  void expect_peer_answers() {
    int32_t answer = 0;
    EXPECT_EQ(OK, echo(77, &answer));
    EXPECT_EQ(77, answer);
  }

  const String16 kName{"test.peer"};
  std::unique_ptr<Process> process_ = std::make_unique<Process>("--serve", "test.peer");
  sp<IServiceManager> manager_;
  sp<IBinder> peer_;
};

TEST_F(BinderDevice, ServicesAreFoundByName) {
  EXPECT_EQ(nullptr, manager_->checkService(String16("test.nobody")));
  const Vector<String16> names = manager_->listServices();
  EXPECT_NE(names.end(), std::find(names.begin(), names.end(), kName));
  EXPECT_EQ(kInterface, peer_->getInterfaceDescriptor());
  EXPECT_EQ(OK, peer_->pingBinder());
  EXPECT_EQ(0, Process("--add-as-ordinary-user", nullptr).wait()) << "only root and system add";
  const sp<IBinder> own = new Peer();
  ASSERT_EQ(OK, manager_->addService(String16("test.own"), own));
  EXPECT_EQ(own, manager_->checkService(String16("test.own"))) << "not a proxy of itself";
}

TEST_F(BinderDevice, ThePoolGrowsWithTheCallsUnderWayAndTellsThemApart) {
  constexpr int kThreads = 8;
  std::vector<std::thread> threads;
  const auto start = steady_clock::now();
  for (int thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([this, thread, start] {
      Parcel request;
      begin(&request);
      request.writeInt32(1000);
      EXPECT_EQ(OK, peer_->transact(kSleep, request, nullptr));
      EXPECT_LT(steady_clock::now() - start, milliseconds(1000 * (kThreads - 1)))
          << "one after the other";
      for (int32_t number = thread * 1000, answer; number < thread * 1000 + 300; ++number) {
        EXPECT_EQ(OK, echo(number, &answer));
        EXPECT_EQ(number, answer) << "each thread gets its own";
      }
    });
  }
  for (std::thread& thread : threads)
    thread.join();
}

TEST_F(BinderDevice, ObjectsLiveAsLongAsTheirRemoteHolders) {
  const auto hold = [this](const sp<IBinder>& object) {
    Parcel request;
    begin(&request);
    request.writeStrongBinder(object);
    ASSERT_EQ(OK, peer_->transact(kHold, request, nullptr));
  };
  wp<IBinder> watched;
  {
    const sp<IBinder> object = new BBinder();
    watched = object;
    hold(object);
  }
  EXPECT_NE(nullptr, watched.promote()) << "the peer holds it";
  hold(nullptr);
  EXPECT_TRUE(soon([&] { return watched.promote() == nullptr; }));
}

TEST_F(BinderDevice, DescriptorsAreCopiedAndClosedWithTheirReply) {
  TemporaryFile file;
  ASSERT_TRUE(base::WriteStringToFd("from here", file.fd));
  Parcel request;
  Parcel reply;
  begin(&request);
  request.writeFileDescriptor(file.fd);
  ASSERT_EQ(OK, peer_->transact(kEcho, request, &reply));
  const int received = reply.readFileDescriptor();
  ASSERT_GE(received, 0);
  EXPECT_NE(file.fd, received);
  EXPECT_EQ(FD_CLOEXEC, fcntl(received, F_GETFD));
  char text[16] = {};
  EXPECT_EQ(9, pread(received, text, sizeof(text), 0));
  EXPECT_STREQ("from here", text);
  reply.freeData();
  EXPECT_EQ(-1, fcntl(received, F_GETFD));
}

TEST_F(BinderDevice, TooLargeParcelsFailCleanly) {
  for (const uint32_t code : {kEcho, kLargeReply}) {
    Parcel request;
    Parcel reply;
    begin(&request);
    request.writeUint32(1024 * 1024);
    if (code == kEcho)
      request.setDataSize(1024 * 1024);
    EXPECT_EQ(FAILED_TRANSACTION, peer_->transact(code, request, &reply));
    EXPECT_EQ(0U, reply.dataSize());
    expect_peer_answers();
  }
  Parcel request;
  Parcel reply;
  begin(&request);
  request.setDataSize(200 * 1024);
  for (int i = 0; i < 20; ++i) {
    ASSERT_EQ(OK, peer_->transact(kEcho, request, &reply)) << "buffers are given back";
  }
}

class Mourner : public IBinder::DeathRecipient {
 public:
  void binderDied(const wp<IBinder>& who) override {
    EXPECT_FALSE(who.promote()->isBinderAlive());
    ++deaths;
  }

  std::atomic<int> deaths = 0;
};

TEST_F(BinderDevice, TellsOfThePeersDeath) {
  const sp<Mourner> mourner = new Mourner();
  ASSERT_EQ(OK, peer_->linkToDeath(mourner));
  Parcel request;
  Parcel reply;
  begin(&request);
  EXPECT_EQ(DEAD_OBJECT, peer_->transact(kExit, request, &reply));
  EXPECT_TRUE(soon([&] { return mourner->deaths == 1; }));
  EXPECT_TRUE(soon([this] { return manager_->checkService(kName) == nullptr; }));
  EXPECT_EQ(DEAD_OBJECT, peer_->pingBinder());
  EXPECT_EQ(DEAD_OBJECT, peer_->linkToDeath(mourner));

  // Its successor is another object under the same name.
  process_ = std::make_unique<Process>("--serve", "test.peer");
  peer_ = manager_->getService(kName);
  ASSERT_NE(nullptr, peer_);
  expect_peer_answers();
  EXPECT_EQ(1, mourner->deaths);
}

}  // namespace
}  // namespace android

int main(int argc, char** argv) {
  if (argc > 2 && strcmp(argv[1], "--serve") == 0)
    return android::serve(argv[2]);
  if (argc > 1 && strcmp(argv[1], "--add-as-ordinary-user") == 0) {
    return android::add_as_ordinary_user();
  }
  testing::InitGoogleTest(&argc, argv);
  return RUN_ALL_TESTS();
}
