#include <gtest/gtest.h>

#include <optional>
#include <string>

#include "service/sentrova_service.h"
#include "tests/support/fake_credential_library.h"
#include "tests/support/fake_decryption_library.h"
#include "tests/support/freed_block.h"

namespace {

TEST(UnlockWithAPassword, HandsOutItsOnlyCopyAndWipesIt) {
  FakeCredentialLibrary::instance().matches = [](const std::string&) { return true; };
  std::optional<sentrova::FreedBlock> handed_out;
  FakeDecryptionLibrary::instance().user = [&](int, const std::string& secret, bool) {
    handed_out.emplace(secret.data());
    return true;
  };
  EXPECT_EQ(android::sp(new android::SentrovaService())
                ->fbeDecryptUserCe(0, std::string(1000, 'x'), false),
            0);
  ASSERT_TRUE(handed_out);
  EXPECT_EQ(handed_out->state(), sentrova::FreedBlock::kWiped);
}

}  // namespace
