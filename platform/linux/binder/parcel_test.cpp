#include "binder/Parcel.h"

#include <android-base/unique_fd.h>
#include <errno.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <limits.h>
#include <linux/android/binder.h>

#include <string>
#include <vector>

#include "binder/Binder.h"
#include "tests/support/freed_block.h"

namespace android {
namespace {

using sentrova::FreedBlock;

const String16 kName("sentrova.test.IParcel");

class NamedBinder : public BBinder {
 public:
  const String16& getInterfaceDescriptor() const override { return kName; }
};

TEST(Parcel, GivesBackWhatWasWritten) {
  const sp<IBinder> binder = new BBinder();
  Parcel parcel;
  parcel.writeInt32(-5);
  parcel.writeUint64(UINT64_MAX);
  parcel.writeBool(true);
  parcel.writeString16(kName);
  parcel.writeStrongBinder(binder);
  parcel.writeStrongBinder(nullptr);
  parcel.write("abc", 3);
  ASSERT_EQ(OK, parcel.errorCheck());
  parcel.setDataPosition(0);
  EXPECT_EQ(-5, parcel.readInt32());
  EXPECT_EQ(UINT64_MAX, parcel.readUint64());
  EXPECT_TRUE(parcel.readBool());
  EXPECT_EQ(kName, parcel.readString16());
  EXPECT_EQ(binder, parcel.readStrongBinder());
  sp<IBinder> null = binder;
  const size_t position = parcel.dataPosition();
  EXPECT_EQ(UNEXPECTED_NULL, parcel.readStrongBinder(&null));
  EXPECT_EQ(position, parcel.dataPosition());
  EXPECT_EQ(OK, parcel.readNullableStrongBinder(&null));
  EXPECT_EQ(nullptr, null);
  EXPECT_EQ(std::string("abc\0", 4),
            std::string(static_cast<const char*>(parcel.readInplace(3)), 4))
      << "padded with zeros";
  EXPECT_EQ(0U, parcel.dataAvail());
}

TEST(Parcel, ShortReadsGiveZeroAndStay) {
  Parcel parcel;
  parcel.writeInt32(7);
  for (const size_t position : {size_t{4}, size_t{5}, SIZE_MAX}) {
    SCOPED_TRACE(position);
    parcel.setDataPosition(position);
    int64_t wide = 9;
    bool flag = true;
    String16 text("old");
    sp<IBinder> binder = new BBinder();
    char raw[4];
    EXPECT_EQ(NOT_ENOUGH_DATA, parcel.readInt64(&wide));
    EXPECT_EQ(NOT_ENOUGH_DATA, parcel.readBool(&flag));
    EXPECT_EQ(NOT_ENOUGH_DATA, parcel.readString16(&text));
    EXPECT_EQ(NOT_ENOUGH_DATA, parcel.readStrongBinder(&binder));
    EXPECT_EQ(NOT_ENOUGH_DATA, parcel.readFileDescriptor());
    EXPECT_EQ(NOT_ENOUGH_DATA, parcel.read(raw, sizeof(raw)));
    EXPECT_EQ(nullptr, parcel.readInplace(1));
    EXPECT_TRUE(wide == 0 && !flag && text.size() == 0 && binder == nullptr);
    EXPECT_EQ(position, parcel.dataPosition());
    EXPECT_EQ(0U, parcel.dataAvail());
  }
}

TEST(Parcel, RefusesStringsThatNoWriterWrites) {
  const struct {
    const char* what;
    std::vector<int32_t> words;
    status_t status;
  } cases[] = {
      {"null", {-1, 0}, UNEXPECTED_NULL},
      {"negative length", {-2, 0}, BAD_VALUE},
      {"largest length", {INT32_MAX, 0}, NOT_ENOUGH_DATA},
      {"bytes that wrap 32 bits", {0x7ffffffe, 0}, NOT_ENOUGH_DATA},
      {"one unit too long", {4, 0x00410041, 0x00410041}, NOT_ENOUGH_DATA},
      {"no zero unit", {1, 0x00420041}, BAD_VALUE},
  };
  for (const auto& item : cases) {
    SCOPED_TRACE(item.what);
    Parcel parcel;
    parcel.setData(reinterpret_cast<const uint8_t*>(item.words.data()), item.words.size() * 4);
    String16 text("old");
    EXPECT_EQ(item.status, parcel.readString16(&text));
    EXPECT_EQ(0U, text.size());
    EXPECT_EQ(item.status == UNEXPECTED_NULL ? 4U : parcel.dataSize(), parcel.dataPosition());
  }
}

TEST(Parcel, RefusesAbsurdSizesAndKeepsTheFirstError) {
  using Write = status_t (*)(Parcel*);
  const Write cases[] = {
      [](Parcel* p) { return p->write("", SIZE_MAX); },
      [](Parcel* p) { return p->write("", SIZE_MAX - 2); },  // wraps when padded
      [](Parcel* p) { return p->writeString16(u"", SIZE_MAX / 2); },
      [](Parcel* p) { return p->setDataSize(size_t{INT_MAX} + 1); },
      [](Parcel* p) { return p->setDataCapacity(SIZE_MAX); },
      [](Parcel* p) { return p->setDataPosition(SIZE_MAX), p->writeInt32(1); },
      [](Parcel* p) { return p->setDataPosition(8), p->writeInt32(1); },
      [](Parcel* p) { return p->setData(nullptr, 4); },
      [](Parcel* p) { return p->writeFileDescriptor(-1); },
  };
  for (const Write& write : cases) {
    SCOPED_TRACE(&write - cases);
    Parcel parcel;
    parcel.writeInt32(1);
    EXPECT_EQ(BAD_VALUE, write(&parcel));
    parcel.setDataPosition(4);
    EXPECT_EQ(BAD_VALUE, parcel.writeInt32(2));
    EXPECT_EQ(4U, parcel.dataSize());
    parcel.freeData();
    EXPECT_EQ(OK, parcel.writeInt32(3)) << "as new";
  }
}

TEST(Parcel, ReadsObjectsWhereTheyAreListedAndPlainValuesElsewhere) {
  Parcel parcel;
  parcel.writeInt32(1);
  parcel.writeStrongBinder(new BBinder());
  parcel.writeInt32(2);
  for (const size_t position : {size_t{0}, size_t{4}, size_t{24}}) {
    int64_t value = 1;
    parcel.setDataPosition(position);
    EXPECT_EQ(PERMISSION_DENIED, parcel.readInt64(&value)) << position;
    EXPECT_EQ(0, value);
  }
  parcel.setDataPosition(8);
  EXPECT_EQ(PERMISSION_DENIED, parcel.writeInt32(3));

  Parcel forged;
  forged.setData(parcel.data(), parcel.dataSize());
  sp<IBinder> binder;
  for (Parcel* const source : {&parcel, &forged}) {
    source->setDataPosition(4);
    EXPECT_EQ(BAD_TYPE, source->readFileDescriptor());
    EXPECT_EQ(source == &forged ? BAD_TYPE : OK, source->readNullableStrongBinder(&binder));
    EXPECT_EQ(source == &forged, binder == nullptr);
  }
}

TEST(Parcel, HoldsItsObjectsAndAppendsThemWhole) {
  const sp<IBinder> binder = new BBinder();
  {
    Parcel parcel;
    parcel.writeInt32(1);
    parcel.writeStrongBinder(binder);
    Parcel copy;
    EXPECT_EQ(OK, copy.appendFrom(&parcel, 0, parcel.dataSize()));
    EXPECT_EQ(3, binder->getStrongCount());
    copy.setDataPosition(4);
    EXPECT_EQ(binder, copy.readStrongBinder());
    EXPECT_EQ(OK, copy.setDataSize(4 + sizeof(flat_binder_object) - 1)) << "cut through";
    EXPECT_EQ(2, binder->getStrongCount());
    const std::pair<size_t, size_t> ranges[] = {{32, 0}, {4, 28}, {4, SIZE_MAX - 3},
                                                {0, 8},  {8, 20}, {1, 4}};
    for (const auto& [start, length] : ranges) {
      Parcel part;
      EXPECT_EQ(BAD_VALUE, part.appendFrom(&parcel, start, length)) << start;
      EXPECT_EQ(0U, part.dataSize());
    }
  }
  EXPECT_EQ(1, binder->getStrongCount());
}

TEST(Parcel, ClosesTheDescriptorsItOwns) {
  const base::unique_fd kept(open("/dev/null", O_RDONLY | O_CLOEXEC));
  const int given = open("/dev/null", O_RDONLY | O_CLOEXEC);
  int duplicate;
  {
    Parcel parcel;
    parcel.writeFileDescriptor(kept.get());
    parcel.writeFileDescriptor(given, true);
    parcel.writeDupFileDescriptor(kept.get());
    EXPECT_TRUE(parcel.hasFileDescriptors());
    parcel.setDataPosition(0);
    EXPECT_EQ(kept.get(), parcel.readFileDescriptor());
    EXPECT_EQ(given, parcel.readFileDescriptor());
    duplicate = parcel.readFileDescriptor();
    EXPECT_EQ(FD_CLOEXEC, fcntl(duplicate, F_GETFD));
  }
  EXPECT_GE(fcntl(kept.get(), F_GETFD), 0);
  EXPECT_EQ(-1, fcntl(given, F_GETFD));
  EXPECT_EQ(-EBADF, Parcel().writeDupFileDescriptor(duplicate));
}

TEST(Parcel, ChecksTheInterfaceToken) {
  const sp<IBinder> binder = new NamedBinder();
  for (const char* name :
       {"sentrova.test.IParcel", "", "sentrova.test.IParce", "sentrova.test.IParcelX"}) {
    Parcel parcel;
    parcel.writeInterfaceToken(String16(name));
    parcel.setDataPosition(0);
    EXPECT_EQ(kName == String16(name), parcel.checkInterface(binder.get())) << name;
    EXPECT_EQ(kName == String16(name), parcel.dataPosition() != 0) << "a wrong head stays";
  }
}

TEST(Parcel, WipesASensitiveStoreBeforeItIsGivenBack) {
  // The block's bytes are looked at from inside free(), where they are still the parcel's.
  Parcel parcel;
  parcel.markSensitive();
  const std::string secret(300, 'S');
  parcel.write(secret.data(), secret.size());
  FreedBlock moved(parcel.data());
  ASSERT_EQ(OK, parcel.setDataCapacity(4096));
  EXPECT_EQ(FreedBlock::kWiped, moved.state());
  FreedBlock freed(parcel.data());
  parcel.freeData();
  EXPECT_EQ(FreedBlock::kWiped, freed.state());

  parcel.write(secret.data(), secret.size());
  FreedBlock plain(parcel.data());
  parcel.freeData();
  EXPECT_EQ(FreedBlock::kNotWiped, plain.state()) << "the look itself works";

  Parcel small;
  small.markSensitive();
  small.writeInt32(0x5a5a5a5a);
  const uint8_t* const inside = small.data();
  small.freeData();
  EXPECT_EQ(0, memcmp(inside, "\0\0\0\0", 4));
}

}  // namespace
}  // namespace android
