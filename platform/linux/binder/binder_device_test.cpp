// Binder over the kernel's driver, between processes: this program serves in copies of itself that
// the tests start. The device's service manager runs already.
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <spawn.h>
#include <stdio.h>
#include <string.h>
#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <mutex>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "binder/IPCThreadState.h"
#include "binder/IServiceManager.h"
#include "binder/Parcel.h"
#include "binder/ProcessState.h"
#include "platform/linux/binder/raw_client.h"

namespace android {
namespace {

using sentrova::binder::RawClient;
using std::chrono::milliseconds;
using std::chrono::steady_clock;

const String16 kInterface("sentrova.test.IPeer");

enum Code : uint32_t {
  kEcho = IBinder::FIRST_CALL_TRANSACTION,  // bytes back
  kLargeReply,                              // size -> that many bytes
  kCaller,                                  // -> pid, uid
  kSleep,                                   // milliseconds
  kCallBack,                                // binder, number -> what the binder makes of it
  kGiveDescriptor,                          // -> a file that holds "from the peer"
  kTakeDescriptor,                          // a file -> what it holds
  kHold,                                    // a binder, or null to let go of the last one
  kCount,                                   // -> calls of kCount so far
  kExit,                                    // no answer
};

base::unique_fd file_with(const char* text) {
  base::unique_fd file(memfd_create("text", MFD_CLOEXEC));
  dprintf(file.get(), "%s", text);
  return file;
}

std::string text_of(int fd) {
  char text[64] = {};
  const ssize_t length = pread(fd, text, sizeof(text), 0);
  return std::string(text, length > 0 ? static_cast<size_t>(length) : 0);
}

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
      case kCaller:
        reply->writeInt32(IPCThreadState::self()->getCallingPid());
        return reply->writeUint32(IPCThreadState::self()->getCallingUid());
      case kSleep:
        std::this_thread::sleep_for(milliseconds(data.readInt32()));
        return OK;
      case kCallBack:
        return call_back(data, reply);
      case kGiveDescriptor:
        return reply->writeDupFileDescriptor(file_with("from the peer").get());
      case kTakeDescriptor: {
        const int fd = data.readFileDescriptor();
        return fd < 0 ? fd : reply->writeString16(String16(text_of(fd).c_str()));
      }
      case kHold: {
        const std::lock_guard guard(lock_);
        return data.readNullableStrongBinder(&held_);
      }
      case kCount:
        return reply->writeInt32(++count_);
      default:
        _exit(0);
    }
  }

 private:
  static status_t call_back(const Parcel& data, Parcel* reply) {
    sp<IBinder> target;
    const status_t status = data.readStrongBinder(&target);
    if (status != OK)
      return status;
    Parcel request;
    request.writeInt32(data.readInt32());
    return target->transact(IBinder::FIRST_CALL_TRANSACTION, request, reply);
  }

  std::mutex lock_;
  sp<IBinder> held_;  // guarded by lock_
  std::atomic<int32_t> count_ = 0;
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

  pid_t pid() const { return pid_; }
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
  bool listed = false;
  for (const String16& name : manager_->listServices())
    listed = listed || name == kName;
  EXPECT_TRUE(listed);
  EXPECT_EQ(kInterface, peer_->getInterfaceDescriptor());
  EXPECT_EQ(OK, peer_->pingBinder());
  EXPECT_EQ(0, Process("--add-as-ordinary-user", nullptr).wait()) << "only root and system add";
  const sp<IBinder> own = new Peer();
  ASSERT_EQ(OK, manager_->addService(String16("test.own"), own));
  EXPECT_EQ(own, manager_->checkService(String16("test.own"))) << "not a proxy of itself";
}

TEST_F(BinderDevice, TellsWhoCalls) {
  Parcel request;
  Parcel reply;
  begin(&request);
  ASSERT_EQ(OK, peer_->transact(kCaller, request, &reply));
  EXPECT_EQ(getpid(), reply.readInt32());
  EXPECT_EQ(getuid(), reply.readUint32());
}

TEST_F(BinderDevice, HandsStatusesThrough) {
  Parcel stranger;
  Parcel reply;
  EXPECT_EQ(PERMISSION_DENIED, peer_->transact(kEcho, stranger, &reply));
  EXPECT_EQ(UNKNOWN_TRANSACTION, peer_->transact(4711, stranger, &reply));
  EXPECT_EQ(0U, reply.dataSize());
}

TEST_F(BinderDevice, EightThreadsCallAtOnce) {
  constexpr int kThreads = 8;
  constexpr int kCalls = 250;
  std::atomic<int> right = 0;
  std::vector<std::thread> threads;
  const auto start = steady_clock::now();
  for (int thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([&, thread] {
      for (int call = 0; call < kCalls; ++call) {
        int32_t answer = -1;
        const int32_t number = thread * kCalls + call;
        if (echo(number, &answer) == OK && answer == number)
          ++right;
      }
    });
  }
  for (std::thread& thread : threads)
    thread.join();
  const std::chrono::duration<double, std::micro> spent = steady_clock::now() - start;
  RecordProperty("microseconds_per_call", static_cast<int>(spent.count() / (kThreads * kCalls)));
  printf("%d calls on %d threads: %.0f us each\n", kThreads * kCalls, kThreads,
         spent.count() / (kThreads * kCalls));
  EXPECT_EQ(kThreads * kCalls, right);
}

TEST_F(BinderDevice, ThePoolGrowsWithTheCallsUnderWay) {
  constexpr int kThreads = 6;
  std::vector<std::thread> threads;
  const auto start = steady_clock::now();
  for (int thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([this] {
      Parcel request;
      begin(&request);
      request.writeInt32(1000);
      EXPECT_EQ(OK, peer_->transact(kSleep, request, nullptr));
    });
  }
  for (std::thread& thread : threads)
    thread.join();
  EXPECT_LT(steady_clock::now() - start, milliseconds(1000 * (kThreads - 1)))
      << "one after the other";
}

// Doubles numbers, and counts how often on the thread that made the outer call.
class Doubler : public BBinder {
 public:
  std::atomic<int> on_the_callers_thread = 0;
  const std::thread::id caller = std::this_thread::get_id();

 protected:
  status_t onTransact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) override {
    if (code != FIRST_CALL_TRANSACTION)
      return BBinder::onTransact(code, data, reply, flags);
    if (std::this_thread::get_id() == caller)
      ++on_the_callers_thread;
    return reply->writeInt32(2 * data.readInt32());
  }
};

TEST_F(BinderDevice, ACallMayComeBack) {
  const sp<Doubler> doubler = new Doubler();
  Parcel request;
  Parcel reply;
  begin(&request);
  request.writeStrongBinder(doubler);
  request.writeInt32(21);
  ASSERT_EQ(OK, peer_->transact(kCallBack, request, &reply));
  EXPECT_EQ(42, reply.readInt32());
  EXPECT_EQ(1, doubler->on_the_callers_thread) << "served by the thread that waits";
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
    const sp<IBinder> object = new Doubler();
    watched = object;
    hold(object);
  }
  EXPECT_NE(nullptr, watched.promote()) << "the peer holds it";
  hold(nullptr);
  EXPECT_TRUE(soon([&] { return watched.promote() == nullptr; }));
}

TEST_F(BinderDevice, DescriptorsPassBothWays) {
  Parcel request;
  Parcel reply;
  begin(&request);
  ASSERT_EQ(OK, peer_->transact(kGiveDescriptor, request, &reply));
  const int received = reply.readFileDescriptor();
  ASSERT_GE(received, 0);
  EXPECT_EQ(FD_CLOEXEC, fcntl(received, F_GETFD));
  EXPECT_EQ("from the peer", text_of(received));
  reply.freeData();
  EXPECT_EQ(-1, fcntl(received, F_GETFD));

  const base::unique_fd own = file_with("from here");
  request.writeFileDescriptor(own.get());
  ASSERT_EQ(OK, peer_->transact(kTakeDescriptor, request, &reply));
  EXPECT_EQ(String16("from here"), reply.readString16());
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

TEST_F(BinderDevice, OneWayCallsAreServedInOrder) {
  Parcel request;
  Parcel reply;
  begin(&request);
  for (int i = 0; i < 100; ++i) {
    ASSERT_EQ(OK, peer_->transact(kCount, request, nullptr, IBinder::FLAG_ONEWAY));
  }
  int32_t count = 0;
  EXPECT_TRUE(soon([&] {
    peer_->transact(kCount, request, &reply);
    // The calls that ask are counted as well.
    return reply.readInt32() > 100 + count++;
  }));
}

class Mourner : public IBinder::DeathRecipient {
 public:
  void binderDied(const wp<IBinder>& who) override {
    const std::lock_guard guard(lock_);
    EXPECT_FALSE(who.promote()->isBinderAlive());
    ++deaths_;
  }
  int deaths() const {
    const std::lock_guard guard(lock_);
    return deaths_;
  }

 private:
  mutable std::mutex lock_;
  int deaths_ = 0;
};

TEST_F(BinderDevice, TellsOfThePeersDeath) {
  const sp<Mourner> mourner = new Mourner();
  ASSERT_EQ(OK, peer_->linkToDeath(mourner));
  Parcel request;
  Parcel reply;
  begin(&request);
  EXPECT_EQ(DEAD_OBJECT, peer_->transact(kExit, request, &reply));
  EXPECT_TRUE(soon([&] { return mourner->deaths() == 1; }));
  EXPECT_TRUE(soon([this] { return manager_->checkService(kName) == nullptr; }));
  EXPECT_EQ(DEAD_OBJECT, peer_->pingBinder());
  EXPECT_EQ(DEAD_OBJECT, peer_->linkToDeath(mourner));

  // Its successor is another object under the same name.
  process_ = std::make_unique<Process>("--serve", "test.peer");
  peer_ = manager_->getService(kName);
  ASSERT_NE(nullptr, peer_);
  expect_peer_answers();
  process_.reset();
  EXPECT_TRUE(soon([this] { return peer_->pingBinder() == DEAD_OBJECT; }));
  EXPECT_EQ(1, mourner->deaths());
}

TEST_F(BinderDevice, AForkedChildHasNoConnection) {
  const pid_t child = fork();
  if (child == 0) {
    int32_t answer;
    _exit(echo(1, &answer) == NO_INIT && defaultServiceManager() == nullptr ? 0 : 1);
  }
  int status = 0;
  ASSERT_EQ(child, waitpid(child, &status, 0));
  EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0) << status;
  expect_peer_answers();
}

std::string bytes_of(const Parcel& parcel) {
  return {reinterpret_cast<const char*>(parcel.data()), parcel.dataSize()};
}

std::string object_of(uint32_t type, uint32_t handle) {
  flat_binder_object object = {};
  object.hdr.type = type;
  object.handle = handle;
  return {reinterpret_cast<const char*>(&object), sizeof(object)};
}

class HostileClient : public BinderDevice {
 protected:
  void SetUp() override {
    BinderDevice::SetUp();
    ASSERT_TRUE(client_.ok());
    Parcel check;
    check.writeInterfaceToken(IServiceManager::descriptor);
    check.writeString16(kName);
    raw_peer_ = client_.call(0, IServiceManager::CHECK_SERVICE_TRANSACTION, bytes_of(check)).handle;
    ASSERT_NE(0U, raw_peer_);
  }

  RawClient client_;
  uint32_t raw_peer_ = 0;
};

TEST_F(HostileClient, DamagedRequestsAreAnsweredWithErrors) {
  Parcel token;
  begin(&token);
  const std::string head = bytes_of(token);
  const std::string binder = object_of(BINDER_TYPE_HANDLE, raw_peer_);
  const struct {
    const char* what;
    Code code;
    std::string data;
    std::vector<uint64_t> offsets;
    uint32_t command;
  } cases[] = {
      {"nothing", kEcho, "", {}, BR_REPLY},
      {"half a token", kEcho, head.substr(0, 10), {}, BR_REPLY},
      {"endless name", kEcho, std::string("\0\0\0\0\0\0\0\0\xff\xff\xff\x7f", 12), {}, BR_REPLY},
      {"no binder", kCallBack, head, {}, BR_REPLY},
      {"unlisted binder", kCallBack, head + binder, {}, BR_REPLY},
      {"unlisted local pointer",
       kCallBack,
       head + object_of(BINDER_TYPE_BINDER, 0x41414141),
       {},
       BR_REPLY},
      {"unlisted descriptor", kTakeDescriptor, head + object_of(BINDER_TYPE_FD, 0), {}, BR_REPLY},
      {"binder for descriptor", kTakeDescriptor, head + binder, {head.size()}, BR_REPLY},
      {"weak binder",
       kCallBack,
       head + object_of(BINDER_TYPE_WEAK_HANDLE, raw_peer_),
       {head.size()},
       BR_REPLY},
      {"foreign handle",
       kCallBack,
       head + object_of(BINDER_TYPE_HANDLE, 999),
       {head.size()},
       BR_FAILED_REPLY},
      {"closed descriptor",
       kTakeDescriptor,
       head + object_of(BINDER_TYPE_FD, 999),
       {head.size()},
       BR_FAILED_REPLY},
      {"offset outside", kCallBack, head + binder, {head.size() + 4}, BR_FAILED_REPLY},
  };
  for (const auto& item : cases) {
    SCOPED_TRACE(item.what);
    const RawClient::Answer answer = client_.call(raw_peer_, item.code, item.data, item.offsets);
    EXPECT_EQ(item.command, answer.command);
    EXPECT_EQ(item.command == BR_REPLY, answer.is_status);
    expect_peer_answers();
  }
}

TEST_F(HostileClient, RandomRequestsBreakNothing) {
  std::mt19937 random(8);
  Parcel tokens[2];
  tokens[0].writeInterfaceToken(IServiceManager::descriptor);
  begin(&tokens[1]);
  for (int round = 0; round < 1500; ++round) {
    const bool to_peer = round % 2 == 1;
    std::string data = random() % 4 == 0 ? "" : bytes_of(tokens[to_peer ? 1 : 0]);
    std::vector<uint64_t> offsets;
    for (uint32_t words = static_cast<uint32_t>(random() % 10); words > 0; --words) {
      if (random() % 8 == 0) {
        offsets.push_back(data.size());
        data += object_of(BINDER_TYPE_HANDLE, raw_peer_);
      }
      const auto word = static_cast<uint32_t>(random() % 2 == 0 ? random() : random() % 40);
      data.append(reinterpret_cast<const char*>(&word), random() % 16 == 0 ? 3 : 4);
    }
    // Not the peer's sleep and exit, which do what they are asked.
    const uint32_t codes[] = {kEcho, kCaller, kCallBack, kTakeDescriptor, kHold, kCount, 99, 0};
    const uint32_t code =
        to_peer ? codes[random() % std::size(codes)] : static_cast<uint32_t>(random() % 6);
    ASSERT_NE(0U, client_.call(to_peer ? raw_peer_ : 0, code, data, offsets).command);
  }
  expect_peer_answers();
  EXPECT_EQ(OK, IInterface::asBinder(manager_)->pingBinder());
  EXPECT_EQ(nullptr, manager_->checkService(String16("test.nobody")));
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
