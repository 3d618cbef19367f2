#pragma once

#include <string>

#include "device/zunofscrypt/places.h"

namespace sentrova {

// Locks the user data again: takes away the keys of user 0's credential-encrypted and of the
// device-encrypted storage, if it has such, and closes it. Stops at the first that is in use, and
// returns false with what that is in `error`.
bool lock_user_data(const Places& places, std::string& error);

// Unmounts the user data, with which its keys go too, and removes the dm-crypt device, as far as
// each is there. Fails likewise.
bool close_user_data(const Places& places, std::string& error);

}  // namespace sentrova
