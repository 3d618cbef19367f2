// Compiled with run-time type information, unlike the library: as some loading programs are.

#include <gtest/gtest.h>

#include "service/sentrova_service.h"

namespace {

TEST(HostWithTypeInformation, ConstructsCallsAndDestroysTheService) {
  const android::sp<android::ISentrovaService> service = new android::SentrovaService();
  EXPECT_EQ(service->getUserPassWordType(0), 0);
  EXPECT_EQ(android::IInterface::asBinder(service)->getInterfaceDescriptor(),
            android::ISentrovaService::descriptor);
}

}  // namespace
