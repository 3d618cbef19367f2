#include "device/zunofscrypt/wrapped_key.h"

#include <gtest/gtest.h>

#include <cstring>

namespace sentrova {
namespace {

constexpr ScryptCost kCheap = {.log2_n = 1};

class WrappedKeyTest : public testing::Test {
 protected:
  WrappedKeyTest() {
    EXPECT_TRUE(fill_randomly(key_.data(), MasterKey::size()));
    EXPECT_TRUE(fill_randomly(device_secret_.data(), WrappingKey::size()));
  }

  bool is_key(const std::optional<MasterKey>& found) const {
    return found && memcmp(found->data(), key_.data(), MasterKey::size()) == 0;
  }

  MasterKey key_;
  WrappingKey device_secret_;
  std::string error_;
};

TEST_F(WrappedKeyTest, OpensUnderItsSecretAndForItsPurposeAlone) {
  const auto wrapped = wrap_with_credential(key_, "1234", "photographs", kCheap);
  ASSERT_TRUE(wrapped);
  EXPECT_TRUE(is_key(unwrap_with_credential(*wrapped, "1234", "photographs", error_))) << error_;
  const std::string long_secret("1234\0", 5);
  for (const std::string& secret :
       {std::string("1235"), std::string(), std::string("~"), long_secret}) {
    error_.clear();
    EXPECT_FALSE(unwrap_with_credential(*wrapped, secret, "photographs", error_)) << secret;
    EXPECT_NE(error_, "");
  }
  EXPECT_FALSE(unwrap_with_credential(*wrapped, "1234", "messages", error_));
  EXPECT_FALSE(unwrap_with_device_secret(*wrapped, device_secret_, "photographs", error_));
  EXPECT_FALSE(wrap_with_credential(key_, long_secret, "photographs", kCheap));
  EXPECT_NE(*wrapped, *wrap_with_credential(key_, "1234", "photographs", kCheap));
}

TEST_F(WrappedKeyTest, OneChangedByteAnywhereIsNoticed) {
  const auto with_device = wrap_with_device_secret(key_, device_secret_, "messages");
  const auto with_credential = wrap_with_credential(key_, "1234", "messages", kCheap);
  ASSERT_TRUE(with_device && with_credential);
  EXPECT_TRUE(is_key(unwrap_with_device_secret(*with_device, device_secret_, "messages", error_)));
  for (size_t i = 0; i < kWrappedKeyBytes; ++i) {
    WrappedKey changed = *with_device;
    changed[i] ^= 1;
    EXPECT_FALSE(unwrap_with_device_secret(changed, device_secret_, "messages", error_)) << i;
    changed = *with_credential;
    changed[i] ^= 0x80;
    EXPECT_FALSE(unwrap_with_credential(changed, "1234", "messages", error_)) << i;
  }
}

}  // namespace
}  // namespace sentrova
