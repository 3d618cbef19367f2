// What a parcel holds besides plain values: binders and file descriptors, listed by their offsets.
#include <android-base/unique_fd.h>
#include <errno.h>
#include <fcntl.h>
#include <linux/android/binder.h>
#include <stdlib.h>
#include <string.h>

#include <algorithm>

#include "binder/Binder.h"
#include "binder/BpBinder.h"
#include "binder/Parcel.h"
#include "binder/ProcessState.h"

namespace android {
namespace {

// In a parcel of this process, the cookie of a binder object of either kind is its IBinder; the
// driver gives it back for the process's own objects and clears it for everybody else's. The cookie
// of a descriptor says whether the parcel closes it.
constexpr binder_uintptr_t kOwned = 1;
constexpr size_t kOffsetAlignment = sizeof(uint32_t);
constexpr size_t kFirstObjectCapacity = 4;
// The lowest least priority that an object can have: calls run with their callers' priority.
constexpr uint32_t kCallersPriority = 0x7f;

IBinder* cookie_of(const flat_binder_object& object) {
  return reinterpret_cast<IBinder*>(static_cast<uintptr_t>(object.cookie));
}

flat_binder_object flatten(const sp<IBinder>& binder) {
  flat_binder_object object = {};
  object.hdr.type = BINDER_TYPE_BINDER;
  if (binder == nullptr)
    return object;
  object.flags = kCallersPriority;
  object.cookie = reinterpret_cast<uintptr_t>(binder.get());
  if (BpBinder* const proxy = binder->remoteBinder(); proxy != nullptr) {
    object.hdr.type = BINDER_TYPE_HANDLE;
    object.binder = 0;
    object.handle = static_cast<uint32_t>(proxy->handle());
  } else {
    object.flags |= FLAT_BINDER_FLAG_ACCEPTS_FDS;
    object.binder = reinterpret_cast<uintptr_t>(binder->getWeakRefs());
  }
  return object;
}

flat_binder_object flatten(int fd, bool owned) {
  flat_binder_object object = {};
  object.hdr.type = BINDER_TYPE_FD;
  object.handle = static_cast<uint32_t>(fd);
  object.cookie = owned ? kOwned : 0;
  return object;
}

bool is_binder(const flat_binder_object& object) {
  return object.hdr.type == BINDER_TYPE_BINDER || object.hdr.type == BINDER_TYPE_HANDLE;
}

bool is_null_binder(const flat_binder_object& object) {
  return object.hdr.type == BINDER_TYPE_BINDER && object.binder == 0 && object.cookie == 0;
}

// The size of an object of the driver, 0 for an unknown type.
size_t size_of_type(uint32_t type) {
  switch (type) {
    case BINDER_TYPE_BINDER:
    case BINDER_TYPE_WEAK_BINDER:
    case BINDER_TYPE_HANDLE:
    case BINDER_TYPE_WEAK_HANDLE:
    case BINDER_TYPE_FD:
      return sizeof(flat_binder_object);
    case BINDER_TYPE_FDA:
      return sizeof(binder_fd_array_object);
    case BINDER_TYPE_PTR:
      return sizeof(binder_buffer_object);
    default:
      return 0;
  }
}

uint32_t type_at(const uint8_t* place) {
  uint32_t type;
  memcpy(&type, place, sizeof(type));
  return type;
}

// Whether the offsets name known objects, in ascending order, aligned, apart and inside the data.
bool are_sound(const uint8_t* data, size_t size, const uint64_t* objects, size_t count) {
  size_t free_from = 0;
  for (size_t i = 0; i < count; ++i) {
    const uint64_t offset = objects[i];
    if (offset < free_from || offset % kOffsetAlignment != 0)
      return false;
    if (offset > size || size - offset < sizeof(uint32_t))
      return false;
    const size_t length = size_of_type(type_at(data + offset));
    if (length == 0 || length > size - offset)
      return false;
    free_from = offset + length;
  }
  return true;
}

}  // namespace

status_t Parcel::take_received(const uint8_t* data, size_t size, const uint64_t* objects,
                               size_t object_count, ReleaseBuffer release) {
  if (size > INT32_MAX || !are_sound(data, size, objects, object_count))
    return BAD_VALUE;
  freeData();
  // Nothing writes to a received parcel; the members are shared with parcels that are written.
  data_ = const_cast<uint8_t*>(data);
  data_size_ = size;
  data_capacity_ = size;
  objects_ = const_cast<uint64_t*>(objects);
  object_count_ = object_count;
  release_ = release;
  return OK;
}

const uint64_t* Parcel::first_object_from(size_t offset) const {
  return std::lower_bound(objects_, objects_ + object_count_, offset);
}

flat_binder_object Parcel::object_at(size_t offset) const {
  flat_binder_object object;
  memcpy(&object, data_ + offset, sizeof(object));
  return object;
}

size_t Parcel::object_end(size_t index) const {
  return objects_[index] + size_of_type(type_at(data_ + objects_[index]));
}

bool Parcel::touches_object(size_t begin, size_t length) const {
  if (object_count_ == 0 || length == 0)
    return false;
  const uint64_t* const next = first_object_from(begin);
  const auto index = static_cast<size_t>(next - objects_);
  const bool touches_next = index < object_count_ && *next - begin < length;
  return touches_next || (index > 0 && object_end(index - 1) > begin);
}

status_t Parcel::reserve_object() {
  if (error_ != OK)
    return error_;
  if (is_received())
    return fail(INVALID_OPERATION);
  if (object_count_ < object_capacity_)
    return OK;
  const size_t capacity = std::max(kFirstObjectCapacity, object_capacity_ * 2);
  void* const block = reallocarray(objects_, capacity, sizeof(*objects_));
  if (block == nullptr)
    return fail(NO_MEMORY);
  objects_ = static_cast<uint64_t*>(block);
  object_capacity_ = capacity;
  return OK;
}

status_t Parcel::write_object(const flat_binder_object& object) {
  if (position_ % kOffsetAlignment != 0)
    return fail(BAD_VALUE);
  const status_t status = reserve_object();
  if (status != OK)
    return status;
  const size_t offset = position_;
  void* const place = writeInplace(sizeof(object));
  if (place == nullptr)
    return error_;
  memcpy(place, &object, sizeof(object));
  const auto index = static_cast<size_t>(first_object_from(offset) - objects_);
  memmove(objects_ + index + 1, objects_ + index, (object_count_ - index) * sizeof(*objects_));
  objects_[index] = offset;
  ++object_count_;
  return OK;
}

void Parcel::hold(const sp<IBinder>& binder) {
  binder->incStrong(this);
}

status_t Parcel::writeStrongBinder(const sp<IBinder>& binder) {
  const flat_binder_object object = flatten(binder);
  // A null binder is no object to the driver.
  if (binder == nullptr)
    return write(&object, sizeof(object));
  const status_t status = write_object(object);
  if (status == OK)
    hold(binder);
  return status;
}

status_t Parcel::writeFileDescriptor(int fd, bool take_ownership) {
  return fd < 0 ? fail(BAD_VALUE) : write_object(flatten(fd, take_ownership));
}

status_t Parcel::writeDupFileDescriptor(int fd) {
  base::unique_fd duplicate(fcntl(fd, F_DUPFD_CLOEXEC, 0));
  if (!duplicate.ok())
    return fail(-errno);
  const status_t status = writeFileDescriptor(duplicate.get(), true);
  if (status != OK)
    return status;
  [[maybe_unused]] const int parcels_own = duplicate.release();
  return OK;
}

status_t Parcel::read_object(flat_binder_object* out) const {
  if (dataAvail() < sizeof(*out))
    return NOT_ENOUGH_DATA;
  *out = object_at(position_);
  const uint64_t* const listed = first_object_from(position_);
  if (listed != objects_ + object_count_ && *listed == position_)
    return OK;
  const bool plain_null = is_null_binder(*out) && !touches_object(position_, sizeof(*out));
  return plain_null ? OK : BAD_TYPE;
}

status_t Parcel::binder_of(const flat_binder_object& object, sp<IBinder>* out) const {
  if (object.hdr.type == BINDER_TYPE_BINDER || !is_received()) {
    *out = cookie_of(object);
    return OK;
  }
  *out = ProcessState::self()->getStrongProxyForHandle(static_cast<int32_t>(object.handle));
  return *out == nullptr ? DEAD_OBJECT : OK;
}

status_t Parcel::readNullableStrongBinder(sp<IBinder>* out) const {
  out->clear();
  flat_binder_object object;
  status_t status = read_object(&object);
  if (status == OK && !is_binder(object))
    status = BAD_TYPE;
  if (status == OK)
    status = binder_of(object, out);
  if (status == OK)
    position_ += sizeof(object);
  return status;
}

status_t Parcel::readStrongBinder(sp<IBinder>* out) const {
  const size_t start = position_;
  const status_t status = readNullableStrongBinder(out);
  if (status != OK || *out != nullptr)
    return status;
  position_ = start;
  return UNEXPECTED_NULL;
}

sp<IBinder> Parcel::readStrongBinder() const {
  sp<IBinder> binder;
  readNullableStrongBinder(&binder);
  return binder;
}

int Parcel::readFileDescriptor() const {
  flat_binder_object object;
  const status_t status = read_object(&object);
  if (status != OK)
    return status;
  if (object.hdr.type != BINDER_TYPE_FD)
    return BAD_TYPE;
  position_ += sizeof(object);
  return static_cast<int>(object.handle);
}

bool Parcel::hasFileDescriptors() const {
  return std::any_of(objects_, objects_ + object_count_, [this](uint64_t offset) {
    const uint32_t type = type_at(data_ + offset);
    return type == BINDER_TYPE_FD || type == BINDER_TYPE_FDA;
  });
}

status_t Parcel::appendFrom(const Parcel* parcel, size_t start, size_t length) {
  if (parcel == this || start > parcel->data_size_ || length > parcel->data_size_ - start ||
      start % kOffsetAlignment != 0 || length % kOffsetAlignment != 0) {
    return fail(BAD_VALUE);
  }
  if (position_ != data_size_ || position_ % kOffsetAlignment != 0)
    return fail(BAD_VALUE);
  if (parcel->sensitive_)
    sensitive_ = true;
  const size_t destination = position_;
  status_t status = write(parcel->data_ + start, length);
  if (status != OK)
    return status;
  status = copy_objects(*parcel, start, length, destination);
  if (status == OK)
    return OK;
  setDataSize(destination);
  return fail(status);
}

status_t Parcel::copy_objects(const Parcel& from, size_t start, size_t length, size_t destination) {
  auto index = static_cast<size_t>(from.first_object_from(start) - from.objects_);
  if (index > 0 && length != 0 && from.object_end(index - 1) > start)
    return BAD_VALUE;
  for (; index < from.object_count_ && from.objects_[index] - start < length; ++index) {
    if (from.object_end(index) - start > length)
      return BAD_VALUE;
    const uint64_t offset = from.objects_[index];
    const status_t status = copy_object(from, offset, destination + (offset - start));
    if (status != OK)
      return status;
  }
  return OK;
}

status_t Parcel::copy_object(const Parcel& from, size_t offset, size_t destination) {
  flat_binder_object object = from.object_at(offset);
  status_t status = reserve_object();
  if (status != OK)
    return status;
  sp<IBinder> binder;
  base::unique_fd duplicate;
  if (is_binder(object)) {
    status = from.binder_of(object, &binder);
    if (status != OK)
      return status;
    object = flatten(binder);
  } else if (object.hdr.type == BINDER_TYPE_FD) {
    duplicate.reset(fcntl(static_cast<int>(object.handle), F_DUPFD_CLOEXEC, 0));
    if (!duplicate.ok())
      return -errno;
    object = flatten(duplicate.get(), true);
  } else {
    return BAD_TYPE;
  }
  memcpy(data_ + destination, &object, sizeof(object));
  if (is_null_binder(object))
    return OK;
  objects_[object_count_++] = destination;
  if (binder != nullptr)
    hold(binder);
  [[maybe_unused]] const int parcels_own = duplicate.release();
  return OK;
}

void Parcel::release_objects_from(size_t first) {
  while (object_count_ > first)
    release_object(object_at(objects_[--object_count_]));
}

void Parcel::release_object(const flat_binder_object& object) {
  if (object.hdr.type == BINDER_TYPE_FD) {
    // The driver makes a received descriptor the receiver's, whatever its cookie.
    if (is_received() || object.cookie == kOwned) {
      base::unique_fd closed(static_cast<int>(object.handle));
    }
  } else if (is_binder(object) && !is_received() && object.cookie != 0) {
    cookie_of(object)->decStrong(this);
  }
}

}  // namespace android
