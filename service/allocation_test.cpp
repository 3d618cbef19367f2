// A local transaction allocates nothing beyond the strings of its arguments.

#include <binder/Parcel.h>
#include <gtest/gtest.h>
#include <utils/String16.h>

#include <atomic>
#include <cstddef>

#include "service/sentrova_service.h"
#include "tests/support/fake_credential_library.h"

#if defined(__SANITIZE_ADDRESS__)
#define SANITIZER_OWNS_MALLOC 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer)
#define SANITIZER_OWNS_MALLOC 1
#endif
#endif

#ifndef SANITIZER_OWNS_MALLOC

namespace {
std::atomic<int> allocations = 0;
}

extern "C" void* __libc_malloc(size_t size);
extern "C" void* malloc(size_t size) {
  ++allocations;
  return __libc_malloc(size);
}

namespace {

int allocations_of(uint32_t code, const char* password) {
  android::sp<android::SentrovaService> service = new android::SentrovaService();
  android::Parcel data;
  data.writeInterfaceToken(android::ISentrovaService::descriptor);
  data.writeInt32(0);
  data.writeString16(android::String16(password));
  data.setDataPosition(0);
  android::Parcel reply;
  const int before = allocations;
  EXPECT_EQ(service->onTransact(code, data, &reply, 0), 0);
  return allocations - before;
}

TEST(Allocations, OnlyTheStringsOfTheArguments) {
  FakeCredentialLibrary::instance().recording = false;
  EXPECT_EQ(allocations_of(1, ""), 0);
  // The UTF-16 and the UTF-8 form; a short std::string needs none.
  EXPECT_EQ(allocations_of(2, "short"), 2);
  // Also the operation's argument and the copy that the credential library gets.
  EXPECT_EQ(allocations_of(2, "a password longer than a short string"), 4);
}

}  // namespace

#else

TEST(Allocations, OnlyTheStringsOfTheArguments) {
  GTEST_SKIP() << "the sanitizer's allocator cannot be counted";
}

#endif
