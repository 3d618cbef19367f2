#include "device/zunogatekeeper/credential_store.h"

#include <android-base/file.h>
#include <android-base/unique_fd.h>
#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include "device/zunogatekeeper/sqlite_handles.h"

namespace sentrova {
namespace {

using android::base::unique_fd;

constexpr int kApplicationId = 0x5a475254;
constexpr int kSchemaVersion = 1;
constexpr int kBusyTimeoutMilliseconds = 2000;

// A sound store needs a few dozen steps of SQLite's machine and values of 32 bytes; what a hostile
// file may make it do ends here.
constexpr int kProgressSteps = 1000;
constexpr int kMaxProgressCalls = 100;
constexpr int kMaxValueLengthBytes = 4096;

int stop_after_enough_steps(void* calls) {
  return ++*static_cast<int*>(calls) > kMaxProgressCalls ? 1 : 0;
}

// One read-only visit to a store.
class StoreReader {
 public:
  explicit StoreReader(const std::string& path) : path_(path) {}

  std::optional<Credential> read(int user_id, std::string& error) {
    Credential credential;
    if (!open(error) || !check_version(error) || !read_row(user_id, credential, error)) {
      return std::nullopt;
    }
    return credential;
  }

 private:
  bool open(std::string& error) {
    struct stat status = {};
    if (stat(path_.c_str(), &status) != 0) {
      error = strerror(errno);
      return false;
    }
    // SQLite would wait for the writer of a FIFO.
    if (!S_ISREG(status.st_mode)) {
      error = "not a regular file";
      return false;
    }
    int code = SQLITE_OK;
    connection_ = open_database(path_.c_str(), SQLITE_OPEN_READONLY, code);
    if (!connection_) {
      error = sqlite3_errstr(code);
      return false;
    }
    distrust();
    return true;
  }

  void distrust() {
    sqlite3* const connection = connection_.get();
    sqlite3_busy_timeout(connection, kBusyTimeoutMilliseconds);
    sqlite3_limit(connection, SQLITE_LIMIT_LENGTH, kMaxValueLengthBytes);
    sqlite3_db_config(connection, SQLITE_DBCONFIG_TRUSTED_SCHEMA, 0, nullptr);
    sqlite3_db_config(connection, SQLITE_DBCONFIG_DEFENSIVE, 1, nullptr);
    sqlite3_progress_handler(connection, kProgressSteps, stop_after_enough_steps, &progress_calls_);
  }

  bool check_version(std::string& error) {
    int64_t application = 0;
    int64_t version = 0;
    if (!read_pragma("PRAGMA application_id", application, error) ||
        !read_pragma("PRAGMA user_version", version, error)) {
      return false;
    }
    if (application != kApplicationId || version != kSchemaVersion) {
      error = "not a store of version " + std::to_string(kSchemaVersion);
      return false;
    }
    return true;
  }

  bool read_pragma(const char* sql, int64_t& value, std::string& error) {
    int code = SQLITE_OK;
    const Statement statement = prepare(connection_.get(), sql, code);
    if (!statement || (code = sqlite3_step(statement.get())) != SQLITE_ROW) {
      error = sqlite3_errstr(code);
      return false;
    }
    value = sqlite3_column_int64(statement.get(), 0);
    return true;
  }

  bool read_row(int user_id, Credential& credential, std::string& error) {
    int code = SQLITE_OK;
    const Statement statement = prepare(
        connection_.get(),
        "SELECT status, log2_n, r, p, salt, digest FROM credential WHERE user_id = ?1", code);
    if (!statement || (code = sqlite3_bind_int(statement.get(), 1, user_id)) != SQLITE_OK) {
      error = sqlite3_errstr(code);
      return false;
    }
    code = sqlite3_step(statement.get());
    if (code != SQLITE_ROW) {
      error = code == SQLITE_DONE ? "no such user" : sqlite3_errstr(code);
      return false;
    }
    if (!take_columns(statement.get(), credential)) {
      error = "a value is out of bounds";
      return false;
    }
    return true;
  }

  static bool take_columns(sqlite3_stmt* row, Credential& credential) {
    int64_t status = 0;
    if (!take_integer(row, 0, status) || status < kNoCredential || status > kHighestStatus) {
      return false;
    }
    credential.status = static_cast<int>(status);
    return credential.status == kNoCredential ||
           (take_integer(row, 1, credential.cost.log2_n) &&
            take_integer(row, 2, credential.cost.r) && take_integer(row, 3, credential.cost.p) &&
            is_acceptable_cost(credential.cost) &&
            take_blob(row, 4, credential.salt.data(), credential.salt.size()) &&
            take_blob(row, 5, credential.digest.data(), credential.digest.size()));
  }

  static bool take_integer(sqlite3_stmt* row, int column, int64_t& value) {
    const bool is_integer = sqlite3_column_type(row, column) == SQLITE_INTEGER;
    value = sqlite3_column_int64(row, column);
    return is_integer;
  }

  static bool take_blob(sqlite3_stmt* row, int column, uint8_t* bytes, size_t size) {
    const bool is_blob = sqlite3_column_type(row, column) == SQLITE_BLOB;
    const void* const blob = sqlite3_column_blob(row, column);
    if (!is_blob || blob == nullptr ||
        sqlite3_column_bytes(row, column) != static_cast<int>(size)) {
      return false;
    }
    memcpy(bytes, blob, size);
    return true;
  }

  const std::string& path_;
  int progress_calls_ = 0;
  Connection connection_;
};

// A new store beside the one that it will replace; removed unless it did.
class NewStore {
 public:
  explicit NewStore(const std::string& path)
      : final_path_(path), path_(path + ".XXXXXX"), fd_(mkostemp(path_.data(), O_CLOEXEC)) {}
  ~NewStore() {
    if (fd_.ok() && !in_place_) {
      unlink(path_.c_str());
    }
  }
  NewStore(const NewStore&) = delete;
  NewStore& operator=(const NewStore&) = delete;

  bool fill(int user_id, const Credential& credential, std::string& error) {
    if (!fd_.ok()) {
      error = strerror(errno);
      return false;
    }
    int code = SQLITE_OK;
    const Connection connection = open_database(path_.c_str(), SQLITE_OPEN_READWRITE, code);
    // No journal: until the rename the whole file may be lost.
    const std::string schema =
        "PRAGMA journal_mode = OFF;"
        "PRAGMA application_id = " +
        std::to_string(kApplicationId) +
        ";PRAGMA user_version = " + std::to_string(kSchemaVersion) +
        ";CREATE TABLE credential(user_id INTEGER PRIMARY KEY, status INTEGER NOT NULL,"
        " log2_n INTEGER, r INTEGER, p INTEGER, salt BLOB, digest BLOB) STRICT;";
    if (connection) {
      code = sqlite3_exec(connection.get(), schema.c_str(), nullptr, nullptr, nullptr);
    }
    if (code == SQLITE_OK) {
      code = insert(connection.get(), user_id, credential);
    }
    if (code != SQLITE_OK) {
      error = sqlite3_errstr(code);
    }
    return code == SQLITE_OK;
  }

  bool put_in_place(std::string& error) {
    in_place_ = fsync(fd_.get()) == 0 && rename(path_.c_str(), final_path_.c_str()) == 0;
    if (!in_place_ || !sync_folder()) {
      error = strerror(errno);
      return false;
    }
    return true;
  }

 private:
  static int insert(sqlite3* connection, int user_id, const Credential& credential) {
    int code = SQLITE_OK;
    const Statement statement =
        prepare(connection, "INSERT INTO credential VALUES(?1, ?2, ?3, ?4, ?5, ?6, ?7)", code);
    sqlite3_stmt* const row = statement.get();
    if (row == nullptr || (code = sqlite3_bind_int(row, 1, user_id)) != SQLITE_OK ||
        (code = sqlite3_bind_int(row, 2, credential.status)) != SQLITE_OK ||
        (credential.status != kNoCredential &&
         (code = bind_secret(row, credential)) != SQLITE_OK)) {
      return code;
    }
    code = sqlite3_step(row);
    return code == SQLITE_DONE ? SQLITE_OK : code;
  }

  static int bind_secret(sqlite3_stmt* row, const Credential& credential) {
    const int codes[] = {
        sqlite3_bind_int64(row, 3, credential.cost.log2_n),
        sqlite3_bind_int64(row, 4, credential.cost.r),
        sqlite3_bind_int64(row, 5, credential.cost.p),
        sqlite3_bind_blob(row, 6, credential.salt.data(), kSaltBytes, SQLITE_STATIC),
        sqlite3_bind_blob(row, 7, credential.digest.data(), kDigestBytes, SQLITE_STATIC),
    };
    for (const int code : codes) {
      if (code != SQLITE_OK) {
        return code;
      }
    }
    return SQLITE_OK;
  }

  bool sync_folder() const {
    const std::string folder = android::base::Dirname(final_path_);
    const unique_fd fd(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    return fd.ok() && fsync(fd.get()) == 0;
  }

  const std::string& final_path_;
  std::string path_;
  unique_fd fd_;
  bool in_place_ = false;
};

}  // namespace

std::optional<Credential> read_credential(const std::string& path, int user_id,
                                          std::string& error) {
  return StoreReader(path).read(user_id, error);
}

bool replace_store(const std::string& path, int user_id, const Credential& credential,
                   std::string& error) {
  NewStore store(path);
  return store.fill(user_id, credential, error) && store.put_in_place(error);
}

}  // namespace sentrova
