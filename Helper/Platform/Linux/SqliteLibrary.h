// SPDX-License-Identifier: Apache-2.0
//
// The functions of SQLite that are used here, found in the library when the first one needs them.
// Any thread; nothing of it changes once it is loaded.
#pragma once

#include <sqlite3.h>

#include <string>

namespace platform {

struct SqliteLibrary {
  decltype(&::sqlite3_open_v2) open = nullptr;
  decltype(&::sqlite3_close) close = nullptr;
  decltype(&::sqlite3_db_config) configure = nullptr;
  decltype(&::sqlite3_errmsg) errorMessage = nullptr;
  decltype(&::sqlite3_busy_timeout) setBusyTimeout = nullptr;
  decltype(&::sqlite3_exec) execute = nullptr;
  decltype(&::sqlite3_prepare_v2) prepare = nullptr;
  decltype(&::sqlite3_finalize) finalize = nullptr;
  decltype(&::sqlite3_bind_text) bindText = nullptr;
  decltype(&::sqlite3_clear_bindings) clearBindings = nullptr;
  decltype(&::sqlite3_step) step = nullptr;
  decltype(&::sqlite3_reset) reset = nullptr;
  decltype(&::sqlite3_column_text) columnText = nullptr;
  decltype(&::sqlite3_column_bytes) columnBytes = nullptr;

  /// The library, loaded by the first call in the process; null when it cannot be had, with the
  /// reason in `failure`.
  [[nodiscard]] static const SqliteLibrary* Load(std::string& failure);
};

}  // namespace platform
