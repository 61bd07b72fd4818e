// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/VoicemailTokenDatabase.h"

#include "Helper/Platform/SystemLog.h"

namespace platform {
namespace {

// The size that the log may grow to before it is emptied into the database: some 400 KiB.
constexpr const char* kSettings =
    "PRAGMA trusted_schema = OFF;"
    "PRAGMA cell_size_check = ON;"
    "PRAGMA secure_delete = ON;"
    "PRAGMA journal_mode = WAL;"
    "PRAGMA synchronous = FULL;"
    "PRAGMA wal_autocheckpoint = 100;";

// Records are the voicemail service's own; the helper only removes them.
constexpr const char* kTables =
    "BEGIN;"
    "CREATE TABLE IF NOT EXISTS current_token"
    " (id INTEGER PRIMARY KEY CHECK (id = 0), token TEXT NOT NULL) STRICT;"
    "CREATE TABLE IF NOT EXISTS token"
    " (key TEXT PRIMARY KEY, token TEXT NOT NULL) STRICT, WITHOUT ROWID;"
    "CREATE TABLE IF NOT EXISTS record"
    " (id INTEGER PRIMARY KEY, content BLOB) STRICT;"
    "COMMIT;";

/// What has been deleted is not to go on in the log. Should that fail, it goes with the log's next
/// emptying.
void EmptyLog(SqliteDatabase& database) {
  (void)database.execute("PRAGMA wal_checkpoint(TRUNCATE);");
}

/// Has SQLite read the whole file once, so that damage is found before it is believed.
SqliteStatus Examine(SqliteDatabase& database) {
  SqliteStatus status;
  std::optional<std::string> verdict;
  SqliteStatement check(database, "PRAGMA quick_check(1);", status);
  if (status.ok()) status = check.run({}, &verdict);
  if (status.ok() && verdict != "ok") {
    return {SQLITE_CORRUPT, verdict.value_or("the check said nothing")};
  }
  return status;
}

}  // namespace

/// The open database with its statements.
struct VoicemailTokenDatabase::Connection {
  SqliteStatus status;  // of the making; the rest is usable when it is ok
  SqliteDatabase database;
  SqliteStatement setCurrent;
  SqliteStatement clearCurrent;
  SqliteStatement copyCurrent;
  SqliteStatement set;
  SqliteStatement copy;
  SqliteStatement removeRecords;

  Connection(const SqliteLibrary& sqlite, const std::string& name,
             std::chrono::milliseconds patience)
      : database(sqlite, name, patience, status),
        setCurrent(prepared(), "INSERT OR REPLACE INTO current_token VALUES (0, ?1);", status),
        clearCurrent(database, "DELETE FROM current_token;", status),
        copyCurrent(database, "SELECT token FROM current_token;", status),
        set(database, "INSERT OR REPLACE INTO token VALUES (?1, ?2);", status),
        copy(database, "SELECT token FROM token WHERE key = ?1;", status),
        removeRecords(database, "DELETE FROM record;", status) {}

 private:
  /// The database, ready for its statements.
  SqliteDatabase& prepared() {
    if (status.ok()) status = database.execute(kSettings);
    if (status.ok()) status = Examine(database);
    if (status.ok()) status = database.execute(kTables);
    return database;
  }
};

VoicemailTokenDatabase::VoicemailTokenDatabase(std::string path, std::chrono::milliseconds patience)
    : patience_(patience), file_(std::move(path)) {}

VoicemailTokenDatabase::~VoicemailTokenDatabase() = default;

SqliteStatus VoicemailTokenDatabase::connect() {
  std::string reason;
  const SqliteLibrary* sqlite = SqliteLibrary::Load(reason);
  if (!sqlite || !file_.prepare(reason)) return {SQLITE_CANTOPEN, reason};
  auto connection = std::make_unique<Connection>(*sqlite, file_.databaseName(), patience_);
  const SqliteStatus status = connection->status;
  if (status.ok()) connection_ = std::move(connection);
  return status;
}

bool VoicemailTokenDatabase::startAnew(const std::string& damage) {
  std::string reason;
  const std::string aside = file_.setAside(reason);
  if (aside.empty()) {
    Log(LogPriority::kError, "Voicemail token store %s is damaged (%s) and stays so: %s",
        file_.path().c_str(), damage.c_str(), reason.c_str());
    return false;
  }
  Log(LogPriority::kError, "Voicemail token store %s is damaged (%s): kept as %s, begun anew",
      file_.path().c_str(), damage.c_str(), aside.c_str());
  return true;
}

void VoicemailTokenDatabase::perform(const char* what, const Operation& operation) {
  const std::lock_guard guard(mutex_);
  bool anew = false;
  for (;;) {
    SqliteStatus status = connection_ ? SqliteStatus{} : connect();
    if (status.ok()) status = operation(*connection_);
    if (status.ok()) return;
    connection_.reset();
    if (status.corrupt() && !anew && startAnew(status.text)) {
      anew = true;
      continue;
    }
    Log(LogPriority::kError, "Voicemail token store %s: cannot %s: %s", file_.path().c_str(), what,
        status.text.c_str());
    return;
  }
}

void VoicemailTokenDatabase::setCurrentToken(const std::optional<std::string>& token) {
  if (token) {
    return perform("set the current token",
                   [&](Connection& connection) { return connection.setCurrent.run({*token}); });
  }
  perform("clear the current token", [](Connection& connection) {
    const SqliteStatus status = connection.clearCurrent.run({});
    if (status.ok()) EmptyLog(connection.database);
    return status;
  });
}

void VoicemailTokenDatabase::setToken(const std::string& key, const std::string& token) {
  perform("set a token", [&](Connection& connection) { return connection.set.run({key, token}); });
}

std::optional<std::string> VoicemailTokenDatabase::copyCurrentToken() {
  std::optional<std::string> token;
  perform("copy the current token",
          [&](Connection& connection) { return connection.copyCurrent.run({}, &token); });
  return token;
}

std::optional<std::string> VoicemailTokenDatabase::copyToken(const std::string& key) {
  std::optional<std::string> token;
  perform("copy a token",
          [&](Connection& connection) { return connection.copy.run({key}, &token); });
  return token;
}

void VoicemailTokenDatabase::removeAllRecords() {
  perform("remove the records", [](Connection& connection) {
    const SqliteStatus status = connection.removeRecords.run({});
    if (status.ok()) EmptyLog(connection.database);
    return status;
  });
}

template <>
VoicemailTokenStore& DefaultProvider<VoicemailTokenStore>() {
  static VoicemailTokenStore& store = *new VoicemailTokenDatabase(HALVEC_TOKEN_STORE);
  return store;
}

}  // namespace platform
