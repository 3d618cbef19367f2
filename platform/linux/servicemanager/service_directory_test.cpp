#include "platform/linux/servicemanager/service_directory.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace sentrova {
namespace {

using android::BBinder;
using android::IBinder;
using android::sp;
using android::status_t;
using android::String16;
using android::wp;

// A service whose death the test decides.
class Mortal : public BBinder {
 public:
  status_t linkToDeath(const sp<DeathRecipient>& recipient, void*, uint32_t) override {
    if (dead)
      return android::DEAD_OBJECT;
    recipients.push_back(recipient);
    return android::OK;
  }
  status_t unlinkToDeath(const wp<DeathRecipient>& recipient, void*, uint32_t,
                         wp<DeathRecipient>*) override {
    std::erase(recipients, recipient);
    return android::OK;
  }
  void die() {
    dead = true;
    for (const auto& recipient : recipients) {
      if (const auto told = recipient.promote(); told != nullptr)
        told->binderDied(this);
    }
  }

  bool dead = false;
  std::vector<wp<DeathRecipient>> recipients;
};

class ServiceDirectoryTest : public testing::Test {
 protected:
  status_t add(const String16& name, const sp<IBinder>& service) {
    return directory_->addService(name, service, false, 0);
  }

  uid_t uid_ = 0;
  const sp<ServiceDirectory> directory_ = new ServiceDirectory([this] { return uid_; });
};

TEST_F(ServiceDirectoryTest, TakesRootsAndTheSystemsServicesUpToItsBound) {
  EXPECT_EQ(android::BAD_VALUE, add(String16("null"), nullptr));
  const std::string longest(127, 'x');
  const std::pair<std::string, status_t> rows[] = {
      {longest, android::OK},           {"A.b_c-d/e:9", android::OK},
      {"", android::BAD_VALUE},         {longest + "x", android::BAD_VALUE},
      {"a b", android::BAD_VALUE},      {std::string("a\0b", 3), android::BAD_VALUE},
      {"\xc3\xa9", android::BAD_VALUE}, {"a*", android::BAD_VALUE}};
  for (const auto& [name, status] : rows) {
    EXPECT_EQ(status, add(String16(name.data(), name.size()), new BBinder())) << name;
  }
  for (const uid_t uid : {0U, 1000U, 1U, 2000U, 101000U}) {
    uid_ = uid;
    const bool allowed = uid == 0 || uid == 1000;
    EXPECT_EQ(allowed ? android::OK : android::PERMISSION_DENIED,
              add(String16("by.any"), new BBinder()))
        << uid;
  }
  uid_ = 1000;
  for (size_t i = 3; i < ServiceDirectory::kMaxServices; ++i) {
    ASSERT_EQ(android::OK, add(String16(std::to_string(i).c_str()), new BBinder()));
  }
  EXPECT_EQ(android::NO_MEMORY, add(String16("one.more"), new BBinder()));
  EXPECT_EQ(android::OK, add(String16("7"), new BBinder())) << "replacing takes no room";
}

TEST_F(ServiceDirectoryTest, ForgetsTheDeadButNotTheirSuccessors) {
  const sp<Mortal> first = new Mortal();
  const sp<Mortal> second = new Mortal();
  const String16 name("sentrova.rescue");
  ASSERT_EQ(android::OK, add(name, first));
  ASSERT_EQ(android::OK, add(String16("other"), first));
  const sp<IBinder::DeathRecipient> late = first->recipients[0].promote();
  ASSERT_EQ(android::OK, add(name, second));
  EXPECT_EQ(1U, first->recipients.size()) << "the replaced entry watches no more";
  first->die();
  late->binderDied(first);
  EXPECT_EQ(second, directory_->checkService(name));
  EXPECT_EQ(nullptr, directory_->checkService(String16("other")));
  EXPECT_EQ(android::BAD_VALUE, add(name, first)) << "a dead service is not entered";
  EXPECT_EQ(second, directory_->checkService(name));
  second->die();
  EXPECT_EQ(0U, directory_->listServices(0).size());
}

}  // namespace
}  // namespace sentrova
