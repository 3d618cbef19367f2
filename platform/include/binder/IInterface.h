#pragma once

#include "binder/Binder.h"

namespace android {

// The base of every interface class.
class SENTROVA_API IInterface : public virtual RefBase {
 public:
  IInterface();

  // The binder object behind an interface; null for null.
  static sp<IBinder> asBinder(const IInterface* interface);
  static sp<IBinder> asBinder(const sp<IInterface>& interface);

 protected:
  ~IInterface() override;
  virtual IBinder* onAsBinder() = 0;

 private:
  IInterface(const IInterface&) = delete;
  IInterface& operator=(const IInterface&) = delete;
};

// The interface INTERFACE of an object: the local implementation itself, or a new proxy. Null for
// null.
template <typename INTERFACE>
inline sp<INTERFACE> interface_cast(const sp<IBinder>& object) {
  return INTERFACE::asInterface(object);
}

// The base of a class that implements INTERFACE in this process.
template <typename INTERFACE>
class SENTROVA_API BnInterface : public INTERFACE, public BBinder {
 public:
  sp<IInterface> queryLocalInterface(const String16& wanted) override {
    const String16& own = INTERFACE::descriptor;
    const bool same = strzcmp16(wanted.string(), wanted.size(), own.string(), own.size()) == 0;
    return same ? sp<IInterface>(this) : sp<IInterface>();
  }
  const String16& getInterfaceDescriptor() const override {
    return INTERFACE::getInterfaceDescriptor();
  }

 protected:
  IBinder* onAsBinder() override { return this; }
};

// The base of a class that calls INTERFACE in another process.
template <typename INTERFACE>
class SENTROVA_API BpInterface : public INTERFACE, public BpRefBase {
 public:
  explicit BpInterface(const sp<IBinder>& remote) : BpRefBase(remote) {}

 protected:
  IBinder* onAsBinder() override { return remote(); }
};

// Inside `class INAME : public IInterface`: the members that every interface has.
#define DECLARE_META_INTERFACE(NAME)                                                          \
 public:                                                                                      \
  static const ::android::String16 descriptor;                                                \
  static ::android::sp<I##NAME> asInterface(const ::android::sp<::android::IBinder>& object); \
  virtual const ::android::String16& getInterfaceDescriptor() const;                          \
  I##NAME();                                                                                  \
  virtual ~I##NAME();

// In one source file, where both INAME and its proxy class BpNAME are complete: their definitions.
#define IMPLEMENT_META_INTERFACE(NAME, DESCRIPTOR)                                               \
  const ::android::String16 I##NAME::descriptor(DESCRIPTOR);                                     \
  const ::android::String16& I##NAME::getInterfaceDescriptor() const {                           \
    return I##NAME::descriptor;                                                                  \
  }                                                                                              \
  ::android::sp<I##NAME> I##NAME::asInterface(const ::android::sp<::android::IBinder>& object) { \
    if (object == nullptr)                                                                       \
      return nullptr;                                                                            \
    const ::android::sp<::android::IInterface> local =                                           \
        object->queryLocalInterface(I##NAME::descriptor);                                        \
    if (local != nullptr)                                                                        \
      return static_cast<I##NAME*>(local.get());                                                 \
    return new Bp##NAME(object);                                                                 \
  }                                                                                              \
  I##NAME::I##NAME() {}                                                                          \
  I##NAME::~I##NAME() {}

}  // namespace android
