// A program that is compiled with run-time type information derives from the library's classes,
// which themselves are used without. This file is compiled that way.
#include <gtest/gtest.h>

#include <typeinfo>

#include "binder/IInterface.h"

namespace android {
namespace {

class INothing : public IInterface {
 public:
  DECLARE_META_INTERFACE(Nothing)
};

class BpNothing : public BpInterface<INothing> {
 public:
  using BpInterface::BpInterface;
};

IMPLEMENT_META_INTERFACE(Nothing, "sentrova.test.INothing")

class Nothing : public BnInterface<INothing> {};

class Recipient : public IBinder::DeathRecipient {
  void binderDied(const wp<IBinder>&) override {}
};

TEST(HostWithTypeInformation, DerivesAndCasts) {
  const sp<IBinder> object = new Nothing();
  EXPECT_NE(nullptr, dynamic_cast<INothing*>(object.get()));
  const IBinder& binder = *object;
  EXPECT_EQ(typeid(Nothing), typeid(binder));
  EXPECT_NE(nullptr, interface_cast<INothing>(object));
  const sp<INothing> proxy = new BpNothing(object);
  EXPECT_NE(nullptr, dynamic_cast<BpRefBase*>(proxy.get()));
  EXPECT_EQ(INVALID_OPERATION, object->linkToDeath(new Recipient()));
}

}  // namespace
}  // namespace android
