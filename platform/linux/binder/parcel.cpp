#include "binder/Parcel.h"

#include <stdlib.h>
#include <string.h>

#include <algorithm>

#include "binder/IBinder.h"

namespace android {
namespace {

// Sizes and lengths travel as int32.
constexpr size_t kMaxSize = INT32_MAX;
constexpr size_t kAlignment = 4;

constexpr size_t padded(size_t length) {
  return (length + kAlignment - 1) & ~(kAlignment - 1);
}

}  // namespace

Parcel::Parcel() {
  reset();
}

Parcel::~Parcel() {
  free_storage();
}

void Parcel::reset() {
  data_ = inline_;
  data_size_ = 0;
  data_capacity_ = kInlineCapacity;
  position_ = 0;
  objects_ = nullptr;
  object_count_ = 0;
  object_capacity_ = 0;
  release_ = nullptr;
  error_ = OK;
  sensitive_ = false;
}

void Parcel::free_storage() {
  release_objects_from(0);
  if (is_received()) {
    release_(data_);
    return;
  }
  if (sensitive_)
    explicit_bzero(data_, data_capacity_);
  if (data_ != inline_)
    free(data_);
  free(objects_);
}

void Parcel::freeData() {
  free_storage();
  reset();
}

status_t Parcel::fail(status_t error) {
  if (error_ == OK)
    error_ = error;
  return error;
}

status_t Parcel::ensure_capacity(size_t capacity) {
  if (is_received())
    return INVALID_OPERATION;
  if (capacity > kMaxSize)
    return BAD_VALUE;
  if (capacity <= data_capacity_)
    return OK;
  // Not realloc, which would leave the old bytes of a sensitive parcel behind.
  auto* const block = static_cast<uint8_t*>(malloc(capacity));
  if (block == nullptr)
    return NO_MEMORY;
  memcpy(block, data_, data_size_);
  if (sensitive_)
    explicit_bzero(data_, data_capacity_);
  if (data_ != inline_)
    free(data_);
  data_ = block;
  data_capacity_ = capacity;
  return OK;
}

status_t Parcel::setDataCapacity(size_t capacity) {
  const status_t status = ensure_capacity(capacity);
  return status == OK ? OK : fail(status);
}

status_t Parcel::setDataSize(size_t size) {
  const status_t status = ensure_capacity(size);
  if (status != OK)
    return fail(status);
  if (size > data_size_) {
    memset(data_ + data_size_, 0, size - data_size_);
  } else if (object_count_ > 0) {
    size_t kept = object_count_;
    while (kept > 0 && object_end(kept - 1) > size)
      --kept;
    release_objects_from(kept);
  }
  data_size_ = size;
  position_ = std::min(position_, size);
  return OK;
}

status_t Parcel::setData(const uint8_t* buffer, size_t length) {
  if (length > kMaxSize || (buffer == nullptr && length != 0))
    return fail(BAD_VALUE);
  freeData();
  const status_t status = setDataSize(length);
  if (status == OK && length != 0)
    memcpy(data_, buffer, length);
  return status;
}

void* Parcel::writeInplace(size_t length) {
  if (error_ != OK)
    return nullptr;
  status_t status = BAD_VALUE;
  if (is_received()) {
    status = INVALID_OPERATION;
  } else if (length <= kMaxSize && position_ <= data_size_ &&
             padded(length) <= kMaxSize - position_) {
    status = touches_object(position_, padded(length)) ? PERMISSION_DENIED : OK;
  }
  const size_t end = status == OK ? position_ + padded(length) : 0;
  if (end > data_capacity_) {
    // Half as much again, so that many small writes do not copy the parcel each time.
    status =
        ensure_capacity(std::max(end, std::min(kMaxSize, data_capacity_ + data_capacity_ / 2)));
  }
  if (status != OK) {
    fail(status);
    return nullptr;
  }
  uint8_t* const place = data_ + position_;
  if (padded(length) != length)
    memset(place + length, 0, padded(length) - length);
  position_ = end;
  data_size_ = std::max(data_size_, end);
  return place;
}

const uint8_t* Parcel::peek(size_t length, status_t* status) const {
  *status = NOT_ENOUGH_DATA;
  if (position_ > data_size_ || length > kMaxSize || padded(length) > dataAvail())
    return nullptr;
  *status = touches_object(position_, padded(length)) ? PERMISSION_DENIED : OK;
  return *status == OK ? data_ + position_ : nullptr;
}

const void* Parcel::readInplace(size_t length) const {
  status_t status;
  const uint8_t* const place = peek(length, &status);
  if (place != nullptr)
    position_ += padded(length);
  return place;
}

status_t Parcel::read(void* out, size_t length) const {
  status_t status;
  const uint8_t* const place = peek(length, &status);
  if (place == nullptr)
    return status;
  memcpy(out, place, length);
  position_ += padded(length);
  return OK;
}

}  // namespace android
