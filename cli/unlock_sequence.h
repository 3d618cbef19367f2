#pragma once

#include <chrono>
#include <functional>
#include <string>

#include "cli/device_state.h"
#include "cli/exit_status.h"
#include "cli/password_input.h"
#include "interface/isentrova_service.h"

namespace sentrova {

// The order of calls that unlocks the data of one kind of device.
enum class UnlockMethod {
  kNone,       // the data is readable as it is
  kFileBased,  // metadata, device-encrypted, then credential-encrypted storage
  kFullDisk,   // one call
  kUnknown,    // the device does not say
};

// Returns the method that the device's state asks for. The properties are set while the loading
// program loads the volume table, which also mounts /data if it can.
UnlockMethod method_for(const DeviceState& state);

struct UnlockStep {
  std::string name;
  std::string outcome;  // in words
  bool succeeded;
  std::chrono::duration<double> time;
};

// The person, or program, at the other end. Each step is begun, then ended.
class UnlockDialogue {
 public:
  virtual ~UnlockDialogue() = default;
  virtual void begin(const std::string& step_name) = 0;
  virtual void end(const UnlockStep& step) = 0;
  virtual PasswordInput ask_password() = 0;
  // How often a password may be asked for in all.
  virtual int password_tries() const = 0;
};

enum class Readable { kNothing, kDeviceEncrypted, kEverything };

struct UnlockEnd {
  ExitStatus status = kExitSuccess;
  Readable readable = Readable::kNothing;  // by what this sequence unlocked
  std::string error;                       // why the sequence stopped before its end
};

// Unlocks the data of `user_id` by calling the service in the method's order, and stops at the
// first step that fails. Unlocked steps stay unlocked. A password is checked before it is used to
// unlock, so that a wrong one changes nothing and is told from storage that does not open.
class UnlockSequence {
 public:
  // What is passed by reference must outlive the sequence. `look` shows the device at any time.
  UnlockSequence(android::ISentrovaService& service, int user_id, std::function<DeviceState()> look,
                 UnlockDialogue& dialogue);

  UnlockEnd run(UnlockMethod method);

 private:
  struct Outcome {
    std::string text;
    bool succeeded;
  };

  using Describe = std::function<Outcome(int32_t answer)>;

  static Describe yes_or_no(const char* yes, const char* no);
  int32_t call(const std::string& name, const std::function<int32_t()>& operation,
               const Describe& describe);
  // The calls of one step each; they return the service's answer.
  int32_t unlock_metadata();
  int32_t unlock_device_encrypted();
  int32_t ask_credential_type();
  // The rest of a sequence each.
  UnlockEnd unlock_full_disk();
  UnlockEnd unlock_file_based();
  UnlockEnd unlock_with_password();
  UnlockEnd unlock_credential_encrypted(const std::string& password);
  UnlockEnd stopped(int32_t answer, const std::string& error) const;
  UnlockEnd done() const;

  android::ISentrovaService& service_;
  const int user_id_;
  const std::function<DeviceState()> look_;
  UnlockDialogue& dialogue_;
  Readable readable_ = Readable::kNothing;
};

}  // namespace sentrova
