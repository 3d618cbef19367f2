#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "binder/BpBinder.h"
#include "binder/IPCThreadState.h"
#include "binder/Parcel.h"
#include "binder/ProcessState.h"
#include "platform/linux/binder/fake_driver.h"
#include "platform/linux/binder/process_context.h"

namespace android {

using sentrova::binder::FakeDriver;

// The one fake kernel of the test program, this process's driver from the first use on.
inline FakeDriver& fake_kernel() {
  static FakeDriver* const kernel = [] {
    auto made = std::make_unique<FakeDriver>();
    FakeDriver* const raw = made.get();
    sentrova::binder::use_driver(std::move(made));
    ProcessState::self();
    return raw;
  }();
  return *kernel;
}

// The bytes of a parcel without objects that holds `words`.
inline std::string words(std::initializer_list<int32_t> values) {
  return {reinterpret_cast<const char*>(std::data(values)), values.size() * sizeof(int32_t)};
}

inline std::string object_bytes(uint32_t type, uint32_t handle) {
  flat_binder_object object = {};
  object.hdr.type = type;
  object.handle = handle;
  return {reinterpret_cast<const char*>(&object), sizeof(object)};
}

// Calls made to a kernel that the test plays. Every test must leave the kernel's counts at zero and
// must not have broken the kernel's rules.
class RemoteTest : public testing::Test {
 protected:
  RemoteTest() : kernel_(fake_kernel()) { kernel_.restart(); }
  ~RemoteTest() override {
    IPCThreadState::self()->flushCommands();
    EXPECT_THAT(kernel_.breaches(), testing::IsEmpty());
    EXPECT_TRUE(kernel_.script_is_over());
    for (const auto& [handle, state] : kernel_.handles()) {
      if (handle == 0)
        continue;  // the process keeps the directory that it came to know
      EXPECT_EQ(0, state.strong) << handle;
      EXPECT_EQ(0, state.weak) << handle;
      EXPECT_EQ(0U, state.death_cookie) << handle;
    }
  }

  static status_t call(Parcel* reply, uint32_t flags = 0) {
    Parcel data;
    data.writeInt32(7);
    return IPCThreadState::self()->transact(3, 11, data, reply, flags);
  }
  static sp<IBinder> proxy(int32_t handle) {
    return ProcessState::self()->getStrongProxyForHandle(handle);
  }
  // Serves what the script says until it ends.
  static void serve_script() { IPCThreadState::self()->joinThreadPool(); }

  FakeDriver& kernel_;
};

}  // namespace android
