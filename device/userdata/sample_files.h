#pragma once

#include <string>

#include "device/zunofscrypt/places.h"

namespace sentrova {

// What is put into user 0's storage, below the mount point of the user data.
inline constexpr char kPhotographFile[] = "/media/0/DCIM/lake.png";  // credential-encrypted
inline constexpr char kMessagesFile[] = "/user/0/messages.txt";      // credential-encrypted
inline constexpr char kAlarmsFile[] = "/user_de/0/alarms.txt";       // device-encrypted

// Writes these files; their folders' storage is there and unlocked. The photograph's digest and
// path are put into `digest_file` as sha256sum takes them. False, with the reason in `error`, where
// a file cannot be written.
bool write_sample_files(const Places& places, const std::string& digest_file, std::string& error);

}  // namespace sentrova
