#include <binder/Parcel.h>
#include <gtest/gtest.h>
#include <utils/String16.h>

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

#include "service/sentrova_service.h"
#include "tests/support/allocation_count.h"
#include "tests/support/fake_credential_library.h"
#include "tests/support/fake_decryption_library.h"

namespace {

size_t allocations_of(uint32_t code, const char* password) {
  const android::sp<android::SentrovaService> service = new android::SentrovaService();
  android::Parcel data;
  data.writeInterfaceToken(android::ISentrovaService::descriptor);
  data.writeInt32(0);
  data.writeString16(android::String16(password));
  data.setDataPosition(0);
  android::Parcel reply;
  const sentrova::AllocationCount allocations;
  const android::status_t status = service->onTransact(code, data, &reply, 0);
  const size_t count = allocations.since_start();
  EXPECT_EQ(status, android::NO_ERROR);
  return count;
}

TEST(LocalTransaction, AllocatesOnlyTheStringsOfItsArguments) {
  FakeCredentialLibrary::instance().recording = false;
  EXPECT_EQ(allocations_of(1, ""), 0u);
  // The UTF-16 and the UTF-8 form; a short std::string needs none.
  EXPECT_EQ(allocations_of(2, "short"), 2u);
  // Also the operation's argument and the copy that the credential library gets.
  EXPECT_EQ(allocations_of(2, "a password longer than a short string"), 4u);
  EXPECT_EQ(allocations_of(6, "a password longer than a short string"), 4u);
}

TEST(UnlockWithAPassword, HandsOutItsOnlyCopyAndWipesIt) {
  FakeCredentialLibrary::instance().recording = false;
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
