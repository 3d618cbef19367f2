// What a loading program links against: the tables of the service in the built library.

#include <android-base/strings.h>
#include <dlfcn.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

namespace {

using Slot = const void*;

const Slot* table(const char* symbol) {
  return static_cast<const Slot*>(dlsym(RTLD_DEFAULT, symbol));
}

std::string name_of(Slot slot) {
  Dl_info info = {};
  if (slot == nullptr || dladdr(slot, &info) == 0 || info.dli_sname == nullptr) {
    return "";
  }
  return info.dli_sname;
}

// A table starts with the offsets of its virtual bases, which differ with the class, then the
// offset to the top, the type descriptor and the functions: the first function is the complete
// destructor.
const Slot* primary_functions(const Slot* begin) {
  const Slot* slot = begin;
  while (name_of(*slot).empty()) {
    ++slot;
  }
  return slot;
}

// Compared by address: functions with the same code may share it.
TEST(ServiceTables, PrimaryTableHasTheSlotsInOrder) {
  const Slot* begin = table("_ZTVN7android15SentrovaServiceE");
  ASSERT_NE(begin, nullptr);
  const Slot* functions = primary_functions(begin);
  const std::string service = "_ZN7android15SentrovaService";
  const std::string bn_interface = "_ZN7android11BnInterfaceINS_16ISentrovaServiceEE";
  const std::vector<std::string> expected = {
      service + "D1Ev",
      service + "D0Ev",
      bn_interface + "10onAsBinderEv",
      "_ZNK7android11BnInterfaceINS_16ISentrovaServiceEE22getInterfaceDescriptorEv",
      service + "19getUserPassWordTypeEi",
      service + "18verifyUserPassWordEiNSt7__cxx1112basic_stringIcSt11char_traitsIcESaIcEEE",
      service + "14fdeDecryptUserEi",
      service + "18fbeDecryptMetadataEv",
      service + "16fbeDecryptUserDeEi",
      service + "16fbeDecryptUserCeEiNSt7__cxx1112basic_stringIcSt11char_traitsIcESaIcEEEb",
      bn_interface + "19queryLocalInterfaceERKNS_8String16E",
      "_ZN7android17BnSentrovaService10onTransactEjRKNS_6ParcelEPS1_j"};
  for (size_t i = 0; i < expected.size(); ++i) {
    ASSERT_NE(table(expected[i].c_str()), nullptr) << expected[i];
    EXPECT_EQ(functions[i], static_cast<Slot>(table(expected[i].c_str())))
        << "slot " << i + 1 << " is " << name_of(functions[i]);
  }
}

TEST(ServiceTables, TypeSlotsAreEmpty) {
  for (const char* symbol : {"_ZTVN7android15SentrovaServiceE", "_ZTVN7android17BnSentrovaServiceE",
                             "_ZTVN7android11BnInterfaceINS_16ISentrovaServiceEEE"}) {
    const Slot* begin = table(symbol);
    ASSERT_NE(begin, nullptr) << symbol;
    EXPECT_EQ(primary_functions(begin)[-1], nullptr) << symbol;
  }
  EXPECT_EQ(table("_ZTIN7android15SentrovaServiceE"), nullptr);
}

TEST(ServiceTables, BinderPartKeepsThePlatformsOrder) {
  const Slot* begin = table("_ZTVN7android15SentrovaServiceE");
  ASSERT_NE(begin, nullptr);
  const Slot* slot = primary_functions(begin) + 12;
  while (name_of(*slot).find("queryLocalInterface") == std::string::npos) {
    ++slot;
  }
  const std::string names =
      "queryLocalInterface getInterfaceDescriptor isBinderAlive pingBinder dump transact "
      "linkToDeath unlinkToDeath checkSubclass attachObject findObject detachObject localBinder "
      "remoteBinder D1Ev D0Ev onTransact";
  const std::vector<std::string> expected = android::base::Split(names, " ");
  for (size_t i = 0; i < expected.size(); ++i) {
    EXPECT_NE(name_of(slot[i]).find(expected[i]), std::string::npos)
        << "slot " << i << " is " << name_of(slot[i]);
  }
}

}  // namespace
