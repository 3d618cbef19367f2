// What a parcel holds besides objects: numbers, strings and the head of a request.
#include <string.h>

#include "binder/IBinder.h"
#include "binder/Parcel.h"

namespace android {
namespace {

constexpr int32_t kStrictModePolicy = 0;
constexpr int32_t kNoWorkSource = -1;
constexpr int32_t kNullString = -1;
constexpr size_t kMaxStringLength = INT32_MAX / sizeof(char16_t) - 1;

}  // namespace

template <typename T>
status_t Parcel::write_value(T value) {
  void* const place = writeInplace(sizeof(value));
  if (place == nullptr)
    return error_;
  memcpy(place, &value, sizeof(value));
  return OK;
}

template <typename T>
status_t Parcel::read_value(T* out) const {
  status_t status;
  const uint8_t* const place = peek(sizeof(T), &status);
  *out = 0;
  if (place == nullptr)
    return status;
  memcpy(out, place, sizeof(T));
  position_ += sizeof(T);
  return OK;
}

status_t Parcel::write(const void* data, size_t length) {
  void* const place = writeInplace(length);
  if (place == nullptr)
    return error_;
  if (length != 0)
    memcpy(place, data, length);
  return OK;
}

status_t Parcel::writeInt32(int32_t value) {
  return write_value(value);
}

status_t Parcel::writeUint32(uint32_t value) {
  return write_value(value);
}

status_t Parcel::writeInt64(int64_t value) {
  return write_value(value);
}

status_t Parcel::writeUint64(uint64_t value) {
  return write_value(value);
}

status_t Parcel::writeBool(bool value) {
  return writeInt32(value ? 1 : 0);
}

status_t Parcel::writeString16(const String16& text) {
  return writeString16(text.string(), text.size());
}

status_t Parcel::writeString16(const char16_t* text, size_t length) {
  if (text == nullptr)
    return writeInt32(kNullString);
  if (length > kMaxStringLength)
    return fail(BAD_VALUE);
  const status_t status = writeInt32(static_cast<int32_t>(length));
  if (status != OK)
    return status;
  const size_t byte_count = length * sizeof(char16_t);
  auto* const place = static_cast<uint8_t*>(writeInplace(byte_count + sizeof(char16_t)));
  if (place == nullptr)
    return error_;
  if (length != 0)
    memcpy(place, text, byte_count);
  memset(place + byte_count, 0, sizeof(char16_t));
  return OK;
}

status_t Parcel::readInt32(int32_t* out) const {
  return read_value(out);
}

int32_t Parcel::readInt32() const {
  int32_t value;
  readInt32(&value);
  return value;
}

status_t Parcel::readUint32(uint32_t* out) const {
  return read_value(out);
}

uint32_t Parcel::readUint32() const {
  uint32_t value;
  readUint32(&value);
  return value;
}

status_t Parcel::readInt64(int64_t* out) const {
  return read_value(out);
}

int64_t Parcel::readInt64() const {
  int64_t value;
  readInt64(&value);
  return value;
}

status_t Parcel::readUint64(uint64_t* out) const {
  return read_value(out);
}

uint64_t Parcel::readUint64() const {
  uint64_t value;
  readUint64(&value);
  return value;
}

status_t Parcel::readBool(bool* out) const {
  int32_t value;
  const status_t status = readInt32(&value);
  *out = value != 0;
  return status;
}

bool Parcel::readBool() const {
  return readInt32() != 0;
}

status_t Parcel::read_string(const char16_t** out, size_t* out_length) const {
  *out = nullptr;
  *out_length = 0;
  int32_t length;
  status_t status = readInt32(&length);
  if (status != OK)
    return status;
  if (length == kNullString)
    return UNEXPECTED_NULL;
  const uint8_t* place = nullptr;
  if (length < 0) {
    status = BAD_VALUE;
  } else {
    const size_t byte_count = (static_cast<size_t>(length) + 1) * sizeof(char16_t);
    place = static_cast<const uint8_t*>(readInplace(byte_count));
    if (place == nullptr) {
      peek(byte_count, &status);
    } else if (reinterpret_cast<uintptr_t>(place) % alignof(char16_t) != 0 ||
               place[byte_count - 1] != 0 || place[byte_count - 2] != 0) {
      status = BAD_VALUE;
    }
  }
  if (status != OK) {
    position_ = data_size_;
    return status;
  }
  *out = reinterpret_cast<const char16_t*>(place);
  *out_length = static_cast<size_t>(length);
  return OK;
}

status_t Parcel::readString16(String16* out) const {
  const char16_t* text;
  size_t length;
  const size_t start = position_;
  const status_t status = read_string(&text, &length);
  if (status != OK) {
    // The shared empty string, unless it is that already: nothing to allocate.
    if (out->size() != 0)
      *out = String16();
    return status;
  }
  if (out->setTo(text, length) == OK)
    return OK;
  position_ = start;
  return NO_MEMORY;
}

String16 Parcel::readString16() const {
  String16 text;
  readString16(&text);
  return text;
}

const char16_t* Parcel::readString16Inplace(size_t* out_length) const {
  const char16_t* text;
  read_string(&text, out_length);
  return text;
}

status_t Parcel::writeInterfaceToken(const String16& interface) {
  writeInt32(kStrictModePolicy);
  writeInt32(kNoWorkSource);
  return writeString16(interface);
}

bool Parcel::enforceInterface(const String16& interface) const {
  const size_t start = position_;
  int32_t policy;
  int32_t work_source;
  const char16_t* name = nullptr;
  size_t length = 0;
  if (readInt32(&policy) == OK && readInt32(&work_source) == OK) {
    name = readString16Inplace(&length);
  }
  if (name != nullptr && strzcmp16(name, length, interface.string(), interface.size()) == 0) {
    return true;
  }
  position_ = start;
  return false;
}

bool Parcel::checkInterface(IBinder* binder) const {
  return enforceInterface(binder->getInterfaceDescriptor());
}

}  // namespace android
