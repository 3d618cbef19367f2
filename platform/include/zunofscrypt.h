#pragma once

#include <string>

#include "common/export.h"

// The closed decryption library for file-based encryption. The three calls belong to one sequence,
// in the order in which they stand here. Each may take seconds; none may run twice at the same
// time.

// Unlocks the metadata encryption of "/data", so that its file system can be mounted. Returns false
// if it stays locked.
SENTROVA_API bool Decrypt_ME();

// Unlocks the device-encrypted storage; "/data" is mounted. Returns false if it stays locked.
SENTROVA_API bool Decrypt_DE();

// Unlocks the credential-encrypted storage of the user of this number, after the device-encrypted
// storage. `secret` is the user's lock-screen password, or "~" for a user who has no credential; it
// stays the caller's. `flag` is the client's, passed on as it came. Returns false if the storage
// stays locked, be it for a wrong secret or any other reason.
SENTROVA_API bool Decrypt_User(int userId, const std::string& secret, bool flag);
