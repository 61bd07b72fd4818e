// SPDX-License-Identifier: Apache-2.0
//
// One open SQLite database and its prepared statements. An object belongs to one thread at a time.
#pragma once

#include <chrono>
#include <initializer_list>
#include <optional>
#include <string>
#include <string_view>

#include "Helper/Platform/Linux/SqliteLibrary.h"

namespace platform {

/// What a call came to: SQLITE_OK or an extended result code, and what SQLite says to it.
struct SqliteStatus {
  int code = SQLITE_OK;
  std::string text;

  [[nodiscard]] bool ok() const { return code == SQLITE_OK; }
  /// The file is no database, or a damaged one.
  [[nodiscard]] bool corrupt() const {
    const int primary = code & 0xff;
    return primary == SQLITE_CORRUPT || primary == SQLITE_NOTADB;
  }
};

/// Once damage was met, the file and its log stay as they are, also at the end.
class SqliteDatabase {
 public:
  /// Opens the existing database `name`, a path that leads over no symbolic link, or a file: URI.
  /// Each later call waits up to `patience` for a lock. Without ok(), only the status is usable.
  SqliteDatabase(const SqliteLibrary& sqlite, const std::string& name,
                 std::chrono::milliseconds patience, SqliteStatus& status);
  ~SqliteDatabase();
  SqliteDatabase(const SqliteDatabase&) = delete;
  SqliteDatabase& operator=(const SqliteDatabase&) = delete;

  /// Runs statements that answer nothing.
  [[nodiscard]] SqliteStatus execute(const char* statements);

 private:
  friend class SqliteStatement;
  [[nodiscard]] SqliteStatus status(int code);

  const SqliteLibrary& sqlite_;
  sqlite3* handle_ = nullptr;
};

/// A statement with text parameters, to run many times. Ends before its database.
class SqliteStatement {
 public:
  /// Prepares `statement`, where `status` is ok so far, and tells in it what came of it.
  SqliteStatement(SqliteDatabase& database, const char* statement, SqliteStatus& status);
  ~SqliteStatement();
  SqliteStatement(const SqliteStatement&) = delete;
  SqliteStatement& operator=(const SqliteStatement&) = delete;

  /// Runs it to its end with these parameters. The first column of its last row goes into `answer`;
  /// none without a row.
  [[nodiscard]] SqliteStatus run(std::initializer_list<std::string_view> parameters,
                                 std::optional<std::string>* answer = nullptr);

 private:
  SqliteDatabase& database_;
  sqlite3_stmt* handle_ = nullptr;
};

}  // namespace platform
