#pragma once

#include <stddef.h>
#include <stdint.h>
#include <utils/Errors.h>
#include <utils/RefBase.h>
#include <utils/String16.h>
#include <utils/Vector.h>

#include "common/export.h"

namespace android {

class BBinder;
class BpBinder;
class IInterface;
class Parcel;

// An object that can be called, in this process (BBinder) or in another one (BpBinder). All
// functions may be called on any thread. The order of the virtual functions is part of the binary
// interface that programs are built against.
class SENTROVA_API IBinder : public virtual RefBase {
 public:
  // Transaction codes and flags as all users of the driver share them.
  enum {
    FIRST_CALL_TRANSACTION = 0x00000001,
    LAST_CALL_TRANSACTION = 0x00ffffff,

    PING_TRANSACTION = ('_' << 24) | ('P' << 16) | ('N' << 8) | 'G',
    DUMP_TRANSACTION = ('_' << 24) | ('D' << 16) | ('M' << 8) | 'P',
    SHELL_COMMAND_TRANSACTION = ('_' << 24) | ('C' << 16) | ('M' << 8) | 'D',
    INTERFACE_TRANSACTION = ('_' << 24) | ('N' << 16) | ('T' << 8) | 'F',
    SYSPROPS_TRANSACTION = ('_' << 24) | ('S' << 16) | ('P' << 8) | 'R',

    FLAG_ONEWAY = 0x00000001,     // do not wait for an answer
    FLAG_CLEAR_BUF = 0x00000020,  // wipe the request and the reply once they were used
  };

  // Is told when the process behind a remote object ends. The proxy keeps only a weak reference to
  // it, so the one who links it keeps it alive.
  class SENTROVA_API DeathRecipient : public virtual RefBase {
   public:
    // Called once for each link, on a thread of the thread pool.
    virtual void binderDied(const wp<IBinder>& who) = 0;

   protected:
    ~DeathRecipient() override;
  };

  using object_cleanup_func = void (*)(const void* id, void* object, void* cleanup_cookie);

  IBinder();

  // The object as `descriptor`'s interface if it lives in this process and has it, else null.
  virtual sp<IInterface> queryLocalInterface(const String16& descriptor);

  // The name of the object's interface; empty when it has none or cannot be asked. The reference
  // is valid as long as the object.
  virtual const String16& getInterfaceDescriptor() const = 0;

  // False once the object is known to be gone.
  virtual bool isBinderAlive() const = 0;

  // OK if the object answers, else an error status.
  virtual status_t pingBinder() = 0;

  // Lets the object write its state as text to `fd`, which stays the caller's.
  virtual status_t dump(int fd, const Vector<String16>& args) = 0;

  // Calls the object: `data` is the request, `reply` (may be null) receives the answer and is
  // rewound. OK, the object's own status, DEAD_OBJECT (process gone), FAILED_TRANSACTION (refused
  // by the driver: too large, no such object, out of memory) or NO_INIT (no driver).
  virtual status_t transact(uint32_t code, const Parcel& data, Parcel* reply,
                            uint32_t flags = 0) = 0;

  // Asks for `recipient` to be told of the object's death. OK; DEAD_OBJECT if it has died already;
  // INVALID_OPERATION for an object of this process; BAD_VALUE without a recipient.
  virtual status_t linkToDeath(const sp<DeathRecipient>& recipient, void* cookie = nullptr,
                               uint32_t flags = 0) = 0;

  // Takes back a link made with the same recipient (or, where that is null, the same cookie) and
  // flags. OK; NAME_NOT_FOUND if there is none; DEAD_OBJECT after the death; INVALID_OPERATION for
  // an object of this process. `out_recipient` (may be null) receives the recipient that was
  // linked.
  virtual status_t unlinkToDeath(const wp<DeathRecipient>& recipient, void* cookie = nullptr,
                                 uint32_t flags = 0,
                                 wp<DeathRecipient>* out_recipient = nullptr) = 0;

  // Whether the object is of the class marked by `subclass_id`.
  virtual bool checkSubclass(const void* subclass_id) const;

  // Keeps `object` with this one under `id`; `cleanup` (may be null) is called with it when this
  // one is destroyed. An `id` that is taken keeps its first object.
  virtual void attachObject(const void* id, void* object, void* cleanup_cookie,
                            object_cleanup_func cleanup) = 0;
  // What is kept under `id`, or null.
  virtual void* findObject(const void* id) const = 0;
  // Forgets what is kept under `id` without cleaning it up.
  virtual void detachObject(const void* id) = 0;

  // This object if it is local, else null; and if it is remote, else null.
  virtual BBinder* localBinder();
  virtual BpBinder* remoteBinder();

 protected:
  ~IBinder() override;

 private:
  IBinder(const IBinder&) = delete;
  IBinder& operator=(const IBinder&) = delete;
};

}  // namespace android
