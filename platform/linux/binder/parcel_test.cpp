#include "binder/Parcel.h"

#include <android-base/unique_fd.h>
#include <errno.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <limits.h>
#include <linux/android/binder.h>
#include <unistd.h>

#include <algorithm>
#include <string>
#include <vector>

#include "binder/Binder.h"
#include "tests/support/allocation_count.h"

namespace android {
namespace {

using sentrova::AllocationCount;
using sentrova::FreedBlock;

using base::unique_fd;

const String16 kName("sentrova.test.IParcel");

class NamedBinder : public BBinder {
 public:
  const String16& getInterfaceDescriptor() const override { return kName; }
};

// A parcel of the given 32-bit words, as another process may have written it.
void set_words(Parcel* parcel, const std::vector<int32_t>& words) {
  const auto* const bytes = reinterpret_cast<const uint8_t*>(words.data());
  ASSERT_EQ(OK, parcel->setData(bytes, words.size() * sizeof(int32_t)));
}

bool is_open(int fd) {
  return fcntl(fd, F_GETFD) >= 0;
}

TEST(Parcel, GivesBackWhatWasWritten) {
  const sp<IBinder> binder = new BBinder();
  Parcel parcel;
  parcel.writeInt32(-5);
  parcel.writeUint32(4000000000U);
  parcel.writeInt64(INT64_MIN);
  parcel.writeUint64(UINT64_MAX);
  parcel.writeBool(true);
  parcel.writeString16(kName);
  parcel.writeStrongBinder(binder);
  parcel.writeStrongBinder(nullptr);
  parcel.write("abc", 3);
  ASSERT_EQ(OK, parcel.errorCheck());
  parcel.setDataPosition(0);
  EXPECT_EQ(-5, parcel.readInt32());
  EXPECT_EQ(4000000000U, parcel.readUint32());
  EXPECT_EQ(INT64_MIN, parcel.readInt64());
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
  const auto* const raw = static_cast<const char*>(parcel.readInplace(3));
  ASSERT_NE(nullptr, raw);
  EXPECT_EQ(std::string("abc\0", 4), std::string(raw, 4)) << "padded with zeros";
  EXPECT_EQ(0U, parcel.dataAvail());
}

TEST(Parcel, ShortReadsGiveZeroAndStay) {
  Parcel parcel;
  set_words(&parcel, {7});
  for (const size_t position : {size_t{4}, size_t{5}, size_t{4096}, SIZE_MAX}) {
    SCOPED_TRACE(position);
    parcel.setDataPosition(position);
    int32_t number = 9;
    int64_t wide = 9;
    bool flag = true;
    String16 text("old");
    sp<IBinder> binder = new BBinder();
    char raw[4] = {1};
    EXPECT_EQ(NOT_ENOUGH_DATA, parcel.readInt32(&number));
    EXPECT_EQ(NOT_ENOUGH_DATA, parcel.readInt64(&wide));
    EXPECT_EQ(NOT_ENOUGH_DATA, parcel.readBool(&flag));
    EXPECT_EQ(NOT_ENOUGH_DATA, parcel.readString16(&text));
    EXPECT_EQ(NOT_ENOUGH_DATA, parcel.readStrongBinder(&binder));
    EXPECT_EQ(NOT_ENOUGH_DATA, parcel.readFileDescriptor());
    EXPECT_EQ(NOT_ENOUGH_DATA, parcel.read(raw, sizeof(raw)));
    EXPECT_EQ(nullptr, parcel.readInplace(1));
    EXPECT_EQ(0, number);
    EXPECT_EQ(0, wide);
    EXPECT_FALSE(flag);
    EXPECT_EQ(0U, text.size());
    EXPECT_EQ(nullptr, binder);
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
      {"smallest length", {INT32_MIN, 0}, BAD_VALUE},
      {"largest length", {INT32_MAX, 0}, NOT_ENOUGH_DATA},
      {"bytes that wrap 32 bits", {0x7ffffffe, 0}, NOT_ENOUGH_DATA},
      {"one unit too long", {4, 0x00410041, 0x00410041}, NOT_ENOUGH_DATA},
      {"no zero unit", {1, 0x00420041}, BAD_VALUE},
      {"length alone", {0}, NOT_ENOUGH_DATA},
  };
  for (const auto& item : cases) {
    SCOPED_TRACE(item.what);
    Parcel parcel;
    set_words(&parcel, item.words);
    String16 text("old");
    EXPECT_EQ(item.status, parcel.readString16(&text));
    EXPECT_EQ(0U, text.size());
    EXPECT_EQ(item.status == UNEXPECTED_NULL ? 4U : parcel.dataSize(), parcel.dataPosition());
    parcel.setDataPosition(0);
    size_t length = 3;
    EXPECT_EQ(nullptr, parcel.readString16Inplace(&length));
    EXPECT_EQ(0U, length);
  }
}

TEST(Parcel, RefusesAbsurdSizesAndKeepsTheFirstError) {
  using Write = status_t (*)(Parcel*);
  const struct {
    const char* what;
    Write write;
  } cases[] = {
      {"bytes", [](Parcel* p) { return p->write("", SIZE_MAX); }},
      {"bytes that wrap when padded", [](Parcel* p) { return p->write("", SIZE_MAX - 2); }},
      {"string", [](Parcel* p) { return p->writeString16(u"", SIZE_MAX / 2); }},
      {"size", [](Parcel* p) { return p->setDataSize(size_t{INT_MAX} + 1); }},
      {"capacity", [](Parcel* p) { return p->setDataCapacity(SIZE_MAX); }},
      {"position", [](Parcel* p) { return p->setDataPosition(SIZE_MAX), p->writeInt32(1); }},
      {"gap", [](Parcel* p) { return p->setDataPosition(8), p->writeInt32(1); }},
      {"no data", [](Parcel* p) { return p->setData(nullptr, 4); }},
      {"descriptor", [](Parcel* p) { return p->writeFileDescriptor(-1); }},
  };
  for (const auto& item : cases) {
    SCOPED_TRACE(item.what);
    Parcel parcel;
    parcel.writeInt32(1);
    EXPECT_EQ(BAD_VALUE, item.write(&parcel));
    EXPECT_EQ(BAD_VALUE, parcel.errorCheck());
    parcel.setDataPosition(4);
    EXPECT_EQ(BAD_VALUE, parcel.writeInt32(2));
    EXPECT_EQ(4U, parcel.dataSize());
    parcel.freeData();
    EXPECT_EQ(OK, parcel.writeInt32(3)) << "as new";
  }
}

TEST(Parcel, ReadsObjectsOnlyWhereTheyAreListed) {
  Parcel source;
  source.writeStrongBinder(new BBinder());
  Parcel forged;
  forged.setData(source.data(), source.dataSize());
  EXPECT_EQ(nullptr, forged.readStrongBinder());
  EXPECT_EQ(BAD_TYPE, forged.readFileDescriptor());
  sp<IBinder> binder;
  EXPECT_EQ(BAD_TYPE, forged.readNullableStrongBinder(&binder));
  EXPECT_FALSE(forged.hasFileDescriptors());
  source.setDataPosition(0);
  EXPECT_EQ(BAD_TYPE, source.readFileDescriptor());
  EXPECT_EQ(0U, source.dataPosition());
}

TEST(Parcel, KeepsPlainAccessOffObjects) {
  Parcel parcel;
  parcel.writeInt32(1);
  parcel.writeStrongBinder(new BBinder());
  parcel.writeInt32(2);
  for (const size_t position : {size_t{0}, size_t{4}, size_t{24}}) {
    SCOPED_TRACE(position);
    int64_t value = 1;
    parcel.setDataPosition(position);
    EXPECT_EQ(PERMISSION_DENIED, parcel.readInt64(&value));
    EXPECT_EQ(0, value);
  }
  parcel.setDataPosition(8);
  EXPECT_EQ(PERMISSION_DENIED, parcel.writeInt32(3));
}

TEST(Parcel, HoldsItsObjects) {
  const sp<IBinder> binder = new BBinder();
  {
    Parcel parcel;
    parcel.writeStrongBinder(binder);
    Parcel copy;
    copy.writeInt32(1);
    EXPECT_EQ(OK, copy.appendFrom(&parcel, 0, parcel.dataSize()));
    EXPECT_EQ(3, binder->getStrongCount());
    copy.setDataPosition(4);
    EXPECT_EQ(binder, copy.readStrongBinder());
    EXPECT_EQ(OK, copy.setDataSize(4 + sizeof(flat_binder_object) - 1)) << "cut through";
    EXPECT_EQ(2, binder->getStrongCount());
  }
  EXPECT_EQ(1, binder->getStrongCount());
}

TEST(Parcel, ClosesTheDescriptorsItOwns) {
  unique_fd kept(open("/dev/null", O_RDONLY | O_CLOEXEC));
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
    ASSERT_GE(duplicate, 0);
    EXPECT_EQ(FD_CLOEXEC, fcntl(duplicate, F_GETFD));
  }
  EXPECT_TRUE(is_open(kept.get()));
  EXPECT_FALSE(is_open(given));
  EXPECT_FALSE(is_open(duplicate));
  Parcel parcel;
  EXPECT_EQ(-EBADF, parcel.writeDupFileDescriptor(duplicate));
}

TEST(Parcel, AppendsOnlyWholeRanges) {
  Parcel source;
  source.writeInt32(1);
  source.writeStrongBinder(new BBinder());
  const std::pair<size_t, size_t> ranges[] = {{32, 0}, {4, 28}, {4, SIZE_MAX - 3},
                                              {0, 8},  {8, 20}, {1, 4}};
  for (const auto& [start, length] : ranges) {
    Parcel parcel;
    EXPECT_EQ(BAD_VALUE, parcel.appendFrom(&source, start, length)) << start;
    EXPECT_EQ(0U, parcel.dataSize());
  }
}

TEST(Parcel, ChecksTheInterfaceToken) {
  const sp<IBinder> binder = new NamedBinder();
  Parcel right;
  right.writeInterfaceToken(kName);
  const auto check = [&](const String16& name, size_t size) {
    Parcel whole;
    whole.writeInterfaceToken(name);
    Parcel cut;
    cut.setData(whole.data(), std::min(size, whole.dataSize()));
    const bool accepted = cut.checkInterface(binder.get());
    EXPECT_EQ(accepted, cut.dataPosition() != 0) << "a wrong head is not consumed";
    return accepted;
  };
  EXPECT_TRUE(check(kName, SIZE_MAX));
  for (const char* name : {"", "sentrova.test.IParce", "sentrova.test.IParcelX"}) {
    EXPECT_FALSE(check(String16(name), SIZE_MAX)) << name;
  }
  for (size_t size = 0; size < right.dataSize(); ++size)
    EXPECT_FALSE(check(kName, size)) << size;
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

TEST(Parcel, SmallOnesAllocateNothing) {
  const sp<NamedBinder> binder = new NamedBinder();
  const String16 text("password");
  const AllocationCount count;
  {
    Parcel parcel;
    parcel.writeInterfaceToken(kName);
    parcel.writeInt32(10);
    parcel.writeString16(text);
    while (parcel.dataSize() < 256)
      parcel.writeInt32(1);
    parcel.setDataPosition(0);
    ASSERT_TRUE(parcel.checkInterface(binder.get()));
    ASSERT_EQ(10, parcel.readInt32());
    EXPECT_EQ(0U, count.since_start());
    String16 out;
    ASSERT_EQ(OK, parcel.readString16(&out));
    EXPECT_EQ(1U, count.since_start()) << "the string itself";
    parcel.setDataPosition(256);
    ASSERT_EQ(OK, parcel.writeInt32(1));
    EXPECT_EQ(2U, count.since_start()) << "the count itself works";
  }
}

}  // namespace
}  // namespace android
