#pragma once

#include <sqlite3.h>

#include <memory>

namespace sentrova {

// Owners of SQLite's two kinds of object. A statement goes before its connection.
struct ConnectionCloser {
  void operator()(sqlite3* connection) const { sqlite3_close(connection); }
};
struct StatementFinalizer {
  void operator()(sqlite3_stmt* statement) const { sqlite3_finalize(statement); }
};
using Connection = std::unique_ptr<sqlite3, ConnectionCloser>;
using Statement = std::unique_ptr<sqlite3_stmt, StatementFinalizer>;

// Opens the database at `path` with these SQLITE_OPEN_ flags. Returns a null owner on failure and
// SQLite's code in `code`.
inline Connection open_database(const char* path, int flags, int& code) {
  sqlite3* raw = nullptr;
  code = sqlite3_open_v2(path, &raw, flags, nullptr);
  // On failure, too, there is mostly a connection to close.
  Connection connection(raw);
  if (code != SQLITE_OK) {
    connection.reset();
  }
  return connection;
}

// Compiles one statement. Returns a null owner on failure and SQLite's code in `code`.
inline Statement prepare(sqlite3* connection, const char* sql, int& code) {
  sqlite3_stmt* raw = nullptr;
  code = sqlite3_prepare_v2(connection, sql, -1, &raw, nullptr);
  return Statement(raw);
}

}  // namespace sentrova
