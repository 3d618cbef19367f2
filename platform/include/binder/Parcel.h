#pragma once

#include <stddef.h>
#include <stdint.h>
#include <utils/Errors.h>
#include <utils/RefBase.h>
#include <utils/String16.h>

#include "common/export.h"

struct flat_binder_object;

namespace android {

class IBinder;
class IPCThreadState;

// The content of a call or of its answer: values one after the other, each padded with zeros to
// four bytes, and objects (binders and file descriptors), whose places are listed beside the data.
//
// Up to 256 bytes without objects need no memory of their own. A parcel that was received lies in
// the driver's memory and is read-only until freeData(); its descriptors are closed with it.
// Positions and sizes are in bytes. One thread at a time may use a parcel.
//
// Reading: a status other than OK leaves the position unchanged and the output zero or empty.
// NOT_ENOUGH_DATA past the end; PERMISSION_DENIED where the bytes belong to an object; BAD_VALUE
// for lengths that no writer writes. Functions that return the value itself return zero or empty
// instead. A string that is cut or malformed leaves the position at the end, so that no value after
// it is read from its characters; a null string counts as read.
//
// Writing happens at the position, over what is there or beyond the end: NO_MEMORY; BAD_VALUE for
// an absurd size or a position beyond the end; PERMISSION_DENIED over an object; INVALID_OPERATION
// on a received parcel. The first failure is kept: errorCheck() returns it, nothing more is
// written, and such a parcel cannot be sent.
class SENTROVA_API Parcel {
 public:
  Parcel();
  ~Parcel();
  Parcel(const Parcel&) = delete;
  Parcel& operator=(const Parcel&) = delete;

  const uint8_t* data() const { return data_; }
  size_t dataSize() const { return data_size_; }
  // What is left behind the position; 0 when that is beyond the end.
  size_t dataAvail() const { return position_ < data_size_ ? data_size_ - position_ : 0; }
  size_t dataPosition() const { return position_; }
  size_t dataCapacity() const { return data_capacity_; }
  // Any position may be set; beyond the end every read and write fails.
  void setDataPosition(size_t position) const { position_ = position; }

  // Cuts the parcel (objects that are cut go as a whole) or extends it with zeros.
  status_t setDataSize(size_t size);
  // Makes room for `capacity` bytes in all; never less than there is.
  status_t setDataCapacity(size_t capacity);
  // Replaces everything with a copy of `length` bytes that hold no objects, and rewinds.
  status_t setData(const uint8_t* buffer, size_t length);
  // Adds `length` bytes of another parcel from `start`, with the objects in them (descriptors are
  // duplicated), at the end of this one, where the position must be. BAD_VALUE when the range
  // leaves the other parcel, cuts an object, or is not aligned to four bytes.
  status_t appendFrom(const Parcel* parcel, size_t start, size_t length);
  // Gives everything back; the parcel is as new.
  void freeData();

  // The first failed write since the parcel was new, or what setError gave it.
  status_t errorCheck() const { return error_; }
  void setError(status_t error) { error_ = error; }

  // The memory is wiped when the parcel gives it back or moves, and so is the driver's copy once
  // the receiver has used it. Mark before writing the secret.
  void markSensitive() const { sensitive_ = true; }
  bool isSensitive() const { return sensitive_; }

  // The head of a request: strict-mode policy (int32, 0), work source (int32, -1), interface name.
  status_t writeInterfaceToken(const String16& interface);
  // Reads that head and compares the name with `interface` or the interface of `binder`. False,
  // with the position unchanged, when it is another name or no such head. Allocates nothing.
  bool enforceInterface(const String16& interface) const;
  bool checkInterface(IBinder* binder) const;

  status_t write(const void* data, size_t length);
  // Room for `length` bytes to be filled in before the parcel's next use; null on failure.
  void* writeInplace(size_t length);
  status_t writeInt32(int32_t value);
  status_t writeUint32(uint32_t value);
  status_t writeInt64(int64_t value);
  status_t writeUint64(uint64_t value);
  status_t writeBool(bool value);
  // Length in UTF-16 units (int32), the units, a zero unit. A null pointer is written as length -1.
  status_t writeString16(const String16& text);
  status_t writeString16(const char16_t* text, size_t length);
  // The parcel holds a reference to the object until it is freed. Null may be written.
  status_t writeStrongBinder(const sp<IBinder>& binder);
  // With `take_ownership` the parcel closes `fd` when it is freed, unless the write failed.
  // BAD_VALUE for a negative descriptor.
  status_t writeFileDescriptor(int fd, bool take_ownership = false);
  // As above with a duplicate that is the parcel's own.
  status_t writeDupFileDescriptor(int fd);

  // On failure `out` is left as it was.
  status_t read(void* out, size_t length) const;
  // The next `length` bytes where they lie, valid until the parcel changes; null on failure.
  const void* readInplace(size_t length) const;
  status_t readInt32(int32_t* out) const;
  int32_t readInt32() const;
  status_t readUint32(uint32_t* out) const;
  uint32_t readUint32() const;
  status_t readInt64(int64_t* out) const;
  int64_t readInt64() const;
  status_t readUint64(uint64_t* out) const;
  uint64_t readUint64() const;
  // An int32 that is not zero is true.
  status_t readBool(bool* out) const;
  bool readBool() const;
  // UNEXPECTED_NULL for a null string, BAD_VALUE if the zero unit is missing. Allocates `out`'s
  // characters only.
  status_t readString16(String16* out) const;
  String16 readString16() const;
  // The units where they lie; null on failure. `out_length` does not count the zero unit.
  const char16_t* readString16Inplace(size_t* out_length) const;

  // BAD_TYPE where no object of the kind is listed at the position. UNEXPECTED_NULL for null,
  // unless it is allowed; DEAD_OBJECT when the driver gives no reference to the remote object.
  status_t readStrongBinder(sp<IBinder>* out) const;
  status_t readNullableStrongBinder(sp<IBinder>* out) const;
  sp<IBinder> readStrongBinder() const;

  // The descriptor, which stays the parcel's, or a negative status (BAD_TYPE, NOT_ENOUGH_DATA).
  int readFileDescriptor() const;
  bool hasFileDescriptors() const;

 private:
  friend class IPCThreadState;

  using ReleaseBuffer = void (*)(const uint8_t* data);
  static constexpr size_t kInlineCapacity = 256;

  // Takes over a buffer of the driver, given back through `release`. BAD_VALUE, and nothing taken,
  // unless `objects` lists known objects in ascending order, aligned, apart and inside the data.
  status_t take_received(const uint8_t* data, size_t size, const uint64_t* objects,
                         size_t object_count, ReleaseBuffer release);
  bool is_received() const { return release_ != nullptr; }
  void reset();
  status_t fail(status_t error);

  status_t ensure_capacity(size_t capacity);
  void free_storage();
  template <typename T>
  status_t write_value(T value);

  const uint8_t* peek(size_t length, status_t* status) const;
  template <typename T>
  status_t read_value(T* out) const;
  status_t read_string(const char16_t** out, size_t* out_length) const;

  bool touches_object(size_t begin, size_t length) const;
  const uint64_t* first_object_from(size_t offset) const;
  size_t object_end(size_t index) const;
  flat_binder_object object_at(size_t offset) const;
  status_t reserve_object();
  status_t write_object(const flat_binder_object& object);
  status_t read_object(flat_binder_object* out) const;
  status_t binder_of(const flat_binder_object& object, sp<IBinder>* out) const;
  status_t copy_objects(const Parcel& from, size_t start, size_t length, size_t destination);
  status_t copy_object(const Parcel& from, size_t offset, size_t destination);
  void hold(const sp<IBinder>& binder);
  void release_objects_from(size_t first);
  void release_object(const flat_binder_object& object);

  uint8_t* data_;  // inline_, a block of malloc, or the driver's buffer
  size_t data_size_;
  size_t data_capacity_;
  mutable size_t position_;
  uint64_t* objects_;  // ascending offsets; a block of malloc or in the driver's buffer
  size_t object_count_;
  size_t object_capacity_;
  ReleaseBuffer release_;  // set for a received parcel
  status_t error_;
  mutable bool sensitive_;
  alignas(8) uint8_t inline_[kInlineCapacity];
};

}  // namespace android
