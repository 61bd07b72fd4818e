// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/SqliteDatabase.h"

#include <utility>

namespace platform {

SqliteDatabase::SqliteDatabase(const SqliteLibrary& sqlite, const std::string& name,
                               std::chrono::milliseconds patience, SqliteStatus& status)
    : sqlite_(sqlite) {
  constexpr int kFlags = SQLITE_OPEN_READWRITE | SQLITE_OPEN_NOFOLLOW | SQLITE_OPEN_NOMUTEX |
                         SQLITE_OPEN_EXRESCODE | SQLITE_OPEN_URI;
  status = this->status(sqlite_.open(name.c_str(), &handle_, kFlags, nullptr));
  if (status.ok()) {
    status = this->status(sqlite_.setBusyTimeout(handle_, static_cast<int>(patience.count())));
  }
}

SqliteDatabase::~SqliteDatabase() { (void)sqlite_.close(handle_); }

SqliteStatus SqliteDatabase::execute(const char* statements) {
  return status(sqlite_.execute(handle_, statements, nullptr, nullptr, nullptr));
}

SqliteStatus SqliteDatabase::status(int code) {
  if (code == SQLITE_OK) return {};
  SqliteStatus status{code, sqlite_.errorMessage(handle_)};
  if (status.corrupt()) {
    (void)sqlite_.configure(handle_, SQLITE_DBCONFIG_NO_CKPT_ON_CLOSE, 1, nullptr);
  }
  return status;
}

SqliteStatement::SqliteStatement(SqliteDatabase& database, const char* statement,
                                 SqliteStatus& status)
    : database_(database) {
  if (!status.ok()) return;
  status = database_.status(
      database_.sqlite_.prepare(database_.handle_, statement, -1, &handle_, nullptr));
}

SqliteStatement::~SqliteStatement() { (void)database_.sqlite_.finalize(handle_); }

SqliteStatus SqliteStatement::run(std::initializer_list<std::string_view> parameters,
                                  std::optional<std::string>* answer) {
  const SqliteLibrary& sqlite = database_.sqlite_;
  int index = 0;
  for (const std::string_view text : parameters) {
    // The texts outlive the run, and are forgotten behind it.
    const int code = sqlite.bindText(handle_, ++index, text.data(), static_cast<int>(text.size()),
                                     SQLITE_STATIC);
    if (code != SQLITE_OK) return database_.status(code);
  }
  std::optional<std::string> found;
  int code = SQLITE_OK;
  while ((code = sqlite.step(handle_)) == SQLITE_ROW) {
    const auto* text = reinterpret_cast<const char*>(sqlite.columnText(handle_, 0));
    const int length = sqlite.columnBytes(handle_, 0);
    if (text) found.emplace(text, static_cast<std::size_t>(length));
  }
  const SqliteStatus status = code == SQLITE_DONE ? SqliteStatus{} : database_.status(code);
  if (answer && status.ok()) *answer = std::move(found);
  (void)sqlite.reset(handle_);  // repeats the code of the run
  (void)sqlite.clearBindings(handle_);
  return status;
}

}  // namespace platform
