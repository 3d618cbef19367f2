#include <gtest/gtest.h>

#include <climits>
#include <string>
#include <utility>
#include <vector>

#include "service/sentrova_service.h"
#include "tests/support/fake_credential_library.h"

namespace {

class CredentialOperations : public testing::Test {
 protected:
  CredentialOperations() { library_.reset(); }

  FakeCredentialLibrary& library_ = FakeCredentialLibrary::instance();
  android::sp<android::SentrovaService> service_ = new android::SentrovaService();
};

TEST_F(CredentialOperations, MapsEveryLockStatus) {
  const std::vector<std::pair<int, int32_t>> table = {
      {0, 0}, {1, 11}, {2, 12},  {3, 13},       {4, 2},
      {5, 3}, {6, -1}, {-1, -1}, {INT_MAX, -1}, {INT_MIN, -1}};
  for (const auto& [lock_status, type] : table) {
    library_.lock_status = lock_status;
    EXPECT_EQ(service_->getUserPassWordType(0), type) << "lock status " << lock_status;
  }
}

TEST_F(CredentialOperations, AskAZeroFilledManagerOfTheOwnerWhateverUserIsNamed) {
  for (const std::string operation : {"status", "verify abc"}) {
    library_.reset();
    operation == "status" ? service_->getUserPassWordType(10)
                          : service_->verifyUserPassWord(10, "abc");
    const std::vector<std::string> calls = {"manager 0", operation, "storage gone 2",
                                            "storage gone 1"};
    EXPECT_EQ(library_.calls, calls);
    EXPECT_TRUE(library_.storage_was_zero);
  }
}

TEST_F(CredentialOperations, VerifyAnswersWhatTheLibrarySays) {
  library_.matches = [](const std::string& password) { return password == "right"; };
  EXPECT_EQ(service_->verifyUserPassWord(0, "right"), 0);
  EXPECT_EQ(service_->verifyUserPassWord(0, "wrong"), -1);
  EXPECT_EQ(service_->verifyUserPassWord(0, ""), -1);
}

}  // namespace
