// The service behind the kernel's binder: a host process of its own, and clients in this one.

#include <android-base/file.h>
#include <binder/IPCThreadState.h>
#include <binder/IServiceManager.h>
#include <binder/ProcessState.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>
#include <utils/Errors.h>
#include <utils/String16.h>

#include <atomic>
#include <cstdio>
#include <filesystem>
#include <string>
#include <thread>
#include <vector>

#include "service/sentrova_service.h"
#include "tests/support/fake_credential_library.h"

namespace {

using android::ISentrovaService;
using android::sp;
using android::String16;

// Answers codes 1 and 2 from their arguments, so that a reply that went to the wrong call shows.
class EchoService : public android::BnSentrovaService {
 public:
  int32_t getUserPassWordType(int userId) override { return userId * 3 + 1; }
  int32_t verifyUserPassWord(int userId, std::string password) override {
    return password == "of " + std::to_string(userId) ? userId : -2;
  }
  int32_t fdeDecryptUser(int userId) override { return userId; }
  int32_t fbeDecryptMetadata() override { return 0; }
  int32_t fbeDecryptUserDe(int userId) override { return userId; }
  int32_t fbeDecryptUserCe(int /*userId*/, std::string password, bool /*flag*/) override {
    return static_cast<int32_t>(password.size());
  }
};

const String16 kRescueName("test.rescue");
const String16 kEchoName("test.echo");

[[noreturn]] void run_host() {
  prctl(PR_SET_PDEATHSIG, SIGKILL);
  FakeCredentialLibrary& library = FakeCredentialLibrary::instance();
  library.recording = false;
  library.lock_status = 4;
  library.matches = [](const std::string& password) { return password == "right"; };
  const sp<android::IServiceManager> manager = android::defaultServiceManager();
  if (manager == nullptr ||
      manager->addService(kRescueName, new android::SentrovaService()) != android::OK ||
      manager->addService(kEchoName, new EchoService()) != android::OK) {
    fprintf(stderr, "the host cannot register its services\n");
    _exit(1);
  }
  android::ProcessState::self()->startThreadPool();
  android::IPCThreadState::self()->joinThreadPool();
  _exit(0);
}

class ServiceOverBinder : public testing::Test {
 protected:
  static void SetUpTestSuite() {
    host_ = fork();
    ASSERT_GE(host_, 0);
    if (host_ == 0) {
      run_host();
    }
  }
  static void TearDownTestSuite() {
    kill(host_, SIGKILL);
    waitpid(host_, nullptr, 0);
  }

  void SetUp() override {
    const sp<android::IServiceManager> manager = android::defaultServiceManager();
    rescue_ = ISentrovaService::asInterface(manager->getService(kRescueName));
    echo_ = ISentrovaService::asInterface(manager->getService(kEchoName));
    ASSERT_TRUE(rescue_ != nullptr && echo_ != nullptr);
  }

  void TearDown() override {
    EXPECT_EQ(rescue_->getUserPassWordType(0), 2) << "the host did not survive";
  }

  static size_t host_descriptors() {
    const std::filesystem::directory_iterator fds("/proc/" + std::to_string(host_) + "/fd");
    return static_cast<size_t>(std::distance(begin(fds), end(fds)));
  }

  static long host_resident_pages() {
    std::string statm;
    android::base::ReadFileToString("/proc/" + std::to_string(host_) + "/statm", &statm);
    long size = 0;
    long resident = 0;
    EXPECT_EQ(sscanf(statm.c_str(), "%ld %ld", &size, &resident), 2);
    return resident;
  }

  // Eight threads, each with calls whose replies only it can get; returns the wrong replies.
  int call_from_eight_threads(int calls_per_thread) {
    std::atomic<int> wrong = 0;
    std::vector<std::thread> clients;
    for (int client = 0; client < 8; ++client) {
      clients.emplace_back([this, client, calls_per_thread, &wrong] {
        for (int call = 0; call < calls_per_thread; call += 2) {
          const int id = client * 1000000 + call;
          const bool right = echo_->getUserPassWordType(id) == id * 3 + 1 &&
                             echo_->verifyUserPassWord(id, "of " + std::to_string(id)) == id;
          wrong += right ? 0 : 1;
        }
      });
    }
    for (std::thread& client : clients) {
      client.join();
    }
    return wrong;
  }

  static inline pid_t host_ = -1;
  sp<ISentrovaService> rescue_;
  sp<ISentrovaService> echo_;
};

TEST_F(ServiceOverBinder, AnswersTypeAndPassword) {
  EXPECT_EQ(rescue_->getUserPassWordType(10), 2);
  EXPECT_EQ(rescue_->verifyUserPassWord(0, "right"), 0);
  EXPECT_EQ(rescue_->verifyUserPassWord(0, "wrong"), -1);
  EXPECT_EQ(rescue_->verifyUserPassWord(0, std::string("right\0 and more", 15)), 0);
}

TEST_F(ServiceOverBinder, EightClientsGetTheirOwnRepliesAndTheHostDoesNotGrow) {
  ASSERT_EQ(call_from_eight_threads(400), 0);
  const size_t descriptors = host_descriptors();
  const long pages = host_resident_pages();
  EXPECT_EQ(call_from_eight_threads(20000 / 8), 0);
  EXPECT_EQ(host_descriptors(), descriptors);
  EXPECT_LE(host_resident_pages(), pages + 64);
}

TEST_F(ServiceOverBinder, OversizedPasswordsAreRefusedByTheKernelAndLargeOnesPass) {
  EXPECT_EQ(rescue_->verifyUserPassWord(0, std::string(1 << 20, 'x')), android::FAILED_TRANSACTION);
  EXPECT_EQ(echo_->fbeDecryptUserCe(0, std::string(100000, 'x'), false), 100000);
}

}  // namespace
