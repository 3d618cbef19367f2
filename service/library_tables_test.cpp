// What a loading program links against: the tables of the service in the built library.

#include <android-base/strings.h>
#include <dlfcn.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

namespace {

using Slot = const void*;
using ::testing::HasSubstr;

std::string name_of(Slot slot) {
  Dl_info info = {};
  return slot != nullptr && dladdr(slot, &info) != 0 && info.dli_sname != nullptr ? info.dli_sname
                                                                                  : "";
}

// A table starts with the offsets of its virtual bases, which differ with the class, then the
// offset to the top, the type descriptor and the functions: the first function is the complete
// destructor.
const Slot* functions_of(const char* table) {
  const Slot* slot = static_cast<const Slot*>(dlsym(RTLD_DEFAULT, table));
  while (name_of(*slot).empty()) {
    ++slot;
  }
  return slot;
}

TEST(ServiceTables, HaveTheSlotsInOrder) {
  // "S" and "B" stand for the service and its base, "T" for a string argument.
  const std::string primary =
      "SD1Ev SD0Ev B10onAsBinderEv K22getInterfaceDescriptorEv S19getUserPassWordTypeEi "
      "S18verifyUserPassWordEiT S14fdeDecryptUserEi S18fbeDecryptMetadataEv S16fbeDecryptUserDeEi "
      "S16fbeDecryptUserCeEiTb B19queryLocalInterfaceERKNS_8String16E "
      "_ZN7android17BnSentrovaService10onTransactEjRKNS_6ParcelEPS1_j";
  const Slot* slot = functions_of("_ZTVN7android15SentrovaServiceE");
  for (std::string name : android::base::Split(primary, " ")) {
    name = name.starts_with("S") ? "_ZN7android15SentrovaService" + name.substr(1)
           : name.starts_with("B")
               ? "_ZN7android11BnInterfaceINS_16ISentrovaServiceEE" + name.substr(1)
           : name.starts_with("K")
               ? "_ZNK7android11BnInterfaceINS_16ISentrovaServiceEE" + name.substr(1)
               : name;
    name = android::base::StringReplace(
        name, "EiT", "EiNSt7__cxx1112basic_stringIcSt11char_traitsIcESaIcEEE", false);
    const Slot function = dlsym(RTLD_DEFAULT, name.c_str());
    ASSERT_NE(function, nullptr) << name;
    EXPECT_EQ(*slot, function) << name_of(*slot);
    ++slot;
  }

  const std::string binder_part =
      "queryLocalInterface getInterfaceDescriptor isBinderAlive pingBinder dump transact "
      "linkToDeath unlinkToDeath checkSubclass attachObject findObject detachObject localBinder "
      "remoteBinder D1Ev D0Ev onTransact";
  while (name_of(*slot).find("queryLocalInterface") == std::string::npos) {
    ++slot;
  }
  for (const std::string& name : android::base::Split(binder_part, " ")) {
    EXPECT_THAT(name_of(*slot), HasSubstr(name));
    ++slot;
  }
}

TEST(ServiceTables, HaveNoTypeDescriptors) {
  for (const char* table : {"_ZTVN7android15SentrovaServiceE", "_ZTVN7android17BnSentrovaServiceE",
                            "_ZTVN7android11BnInterfaceINS_16ISentrovaServiceEEE"}) {
    EXPECT_EQ(functions_of(table)[-1], nullptr) << table;
  }
  EXPECT_EQ(dlsym(RTLD_DEFAULT, "_ZTIN7android15SentrovaServiceE"), nullptr);
}

}  // namespace
