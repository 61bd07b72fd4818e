// SPDX-License-Identifier: Apache-2.0
//
// The voicemail token store in an SQLite database: write-ahead log, each change on the disk before
// it returns, deleted content overwritten. Any thread; one mutex guards everything and is held for
// the length of an operation.
#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>

#include "Helper/Platform/Linux/SqliteDatabase.h"
#include "Helper/Platform/Linux/VoicemailTokenFile.h"
#include "Helper/Platform/VoicemailTokenStore.h"

namespace platform {

/// Nothing is opened before the first operation. A damaged database is set aside, a line at error
/// priority says where, and the operation goes on with a new one. After any other failure the
/// database is opened anew by the next operation.
class VoicemailTokenDatabase final : public VoicemailTokenStore {
 public:
  /// `path`: the file, absolute. `patience` bounds the wait for another process that writes.
  explicit VoicemailTokenDatabase(
      std::string path, std::chrono::milliseconds patience = std::chrono::milliseconds(500));
  ~VoicemailTokenDatabase() override;

  void setCurrentToken(const std::optional<std::string>& token) override;
  void setToken(const std::string& key, const std::string& token) override;
  std::optional<std::string> copyCurrentToken() override;
  std::optional<std::string> copyToken(const std::string& key) override;
  void removeAllRecords() override;

 private:
  struct Connection;
  using Operation = std::function<SqliteStatus(Connection&)>;

  /// Runs `operation` on the open database; `what` it does, for the log.
  void perform(const char* what, const Operation& operation);
  [[nodiscard]] SqliteStatus connect();
  [[nodiscard]] bool startAnew(const std::string& damage);

  const std::chrono::milliseconds patience_;
  std::mutex mutex_;
  // Under mutex_:
  VoicemailTokenFile file_;
  std::unique_ptr<Connection> connection_;
};

}  // namespace platform
