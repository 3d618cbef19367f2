#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "common/export.h"

// Requests to the platform's init process and help for running programs.

// Asks init to reboot the device, by the property "sys.powerctl", and sleeps until init has done
// so: it never returns. `reason` says where to boot to ("recovery", "bootloader"; may be empty). On
// a device that was booted quiescently ("ro.boot.quiescent" is true) the next boot is quiescent
// too, except to exactly "bootloader" or "fastboot". If the property cannot be set, one fatal line
// in the base log aborts the process. From any thread.
[[noreturn]] SENTROVA_API void Reboot(std::string_view reason);

// Asks init to power the device off, with a reason that may be empty. Returns at once: true if the
// property was set and the device is about to go down, false if not; nothing is logged. From any
// thread.
SENTROVA_API bool Shutdown(std::string_view reason);

// Returns the array that the exec functions take: a pointer to each argument's characters, in
// order, and a null pointer last. Nothing is copied: the pointers hold while the argument strings
// live unchanged.
SENTROVA_API std::vector<char*> StringVectorToNullTerminatedArray(
    const std::vector<std::string>& arguments);
