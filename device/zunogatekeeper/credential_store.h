#pragma once

#include <optional>
#include <string>

#include "device/zunogatekeeper/credential_digest.h"

namespace sentrova {

// The credential store: one SQLite file, application id 0x5a475254, schema version 1:
//
//   credential(user_id INTEGER PRIMARY KEY, status INTEGER, log2_n INTEGER, r INTEGER, p INTEGER,
//              salt BLOB of 32 bytes, digest BLOB of 32 bytes)
//
// The digest is scrypt of the password with that salt and cost; where the status is 0 the columns
// after it are null. A store is only ever replaced as a whole, so nobody sees one half written.

inline constexpr char kDefaultStorePath[] = "/metadata/credentials.db";
// Names another store. A "ro." property: fixed once it is set.
inline constexpr char kStorePathProperty[] = "ro.rescue.credential_store";

// Kinds of credential, as the stand-in takes them: 0 none, 1 pattern, 2 PIN, 3 password, 4 and 5
// two further kinds. A credential of any kind is a string of bytes here, checked alike.
inline constexpr int kNoCredential = 0;
inline constexpr int kHighestStatus = 5;

// What the store says of one user.
struct Credential {
  int status = kNoCredential;
  // These three have no meaning where the status is kNoCredential.
  ScryptCost cost;
  Salt salt = {};
  Digest digest = {};
};

// Reads the credential of a user from the store at `path`. Returns nothing, and the reason in
// `error`, where there is no store, it is locked for longer than two seconds, it is damaged or of
// another version, it has no such user, or a number in it is out of bounds. Memory and time are
// bounded whatever the file holds.
std::optional<Credential> read_credential(const std::string& path, int user_id, std::string& error);

// Replaces the store at `path` by one that holds this user alone; mode 0600, on disk on return.
// Returns false, with the reason in `error` and the old store as it was, where that fails; where
// only the last step fails, the syncing of the folder, the new store stands.
bool replace_store(const std::string& path, int user_id, const Credential& credential,
                   std::string& error);

}  // namespace sentrova
