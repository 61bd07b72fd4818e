// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/SqliteLibrary.h"

#include "Helper/Platform/SharedLibrary.h"

namespace platform {
namespace {

struct Loaded {
  SharedLibrary file{"libsqlite3.so.0"};
  SqliteLibrary functions;

  Loaded() {
    file.bind(functions.open, "sqlite3_open_v2");
    file.bind(functions.close, "sqlite3_close");
    file.bind(functions.configure, "sqlite3_db_config");
    file.bind(functions.errorMessage, "sqlite3_errmsg");
    file.bind(functions.setBusyTimeout, "sqlite3_busy_timeout");
    file.bind(functions.execute, "sqlite3_exec");
    file.bind(functions.prepare, "sqlite3_prepare_v2");
    file.bind(functions.finalize, "sqlite3_finalize");
    file.bind(functions.bindText, "sqlite3_bind_text");
    file.bind(functions.clearBindings, "sqlite3_clear_bindings");
    file.bind(functions.step, "sqlite3_step");
    file.bind(functions.reset, "sqlite3_reset");
    file.bind(functions.columnText, "sqlite3_column_text");
    file.bind(functions.columnBytes, "sqlite3_column_bytes");
  }
};

}  // namespace

const SqliteLibrary* SqliteLibrary::Load(std::string& failure) {
  static const Loaded& loaded = *new Loaded;
  if (loaded.file.complete()) return &loaded.functions;
  failure = loaded.file.failure();
  return nullptr;
}

}  // namespace platform
