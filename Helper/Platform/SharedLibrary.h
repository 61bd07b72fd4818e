// SPDX-License-Identifier: Apache-2.0
//
// A shared library that is opened by the first request that needs it: a helper that never needs it
// neither loads nor initialises it. Stays open for the life of the process. Any thread.
#pragma once

#include <string>

namespace platform {

class SharedLibrary {
 public:
  /// Opens `name`: a soname that the dynamic linker finds, or an absolute path. Lazy binding, names
  /// kept out of the global scope (dlopen(3)).
  explicit SharedLibrary(const char* name);

  /// Whether it could be opened and every look-up so far succeeded.
  [[nodiscard]] bool complete() const { return complete_; }
  /// What the first failure was, in the dynamic linker's words; empty while complete.
  [[nodiscard]] const std::string& failure() const { return failure_; }

  /// Binds `function` to the exported `symbol`; null, and no longer complete, when there is none.
  template <class Function>
  void bind(Function*& function, const char* symbol) {
    function = reinterpret_cast<Function*>(find(symbol));
  }

 private:
  [[nodiscard]] void* find(const char* symbol);

  void* handle_;
  bool complete_;
  std::string failure_;
};

}  // namespace platform
