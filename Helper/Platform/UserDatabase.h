// SPDX-License-Identifier: Apache-2.0
//
// The accounts of the system: where a user lives, and under which numbers. Any thread.
#pragma once

#include <sys/types.h>

#include <optional>

#include "Helper/Platform/SharedService.h"
#include "Helper/Platform/String.h"

namespace platform {

struct UserIds {
  uid_t user = 0;
  gid_t group = 0;
};

class UserDatabase {
 public:
  virtual ~UserDatabase() = default;
  /// The POSIX path of the user's home directory, exactly as the database spells it; none when the
  /// user is unknown, has no home there, or its spelling is not UTF-8.
  [[nodiscard]] virtual std::optional<String> homeDirectory(const String& user) = 0;
  /// The same for the user with this number.
  [[nodiscard]] virtual std::optional<String> homeDirectory(uid_t user) = 0;
  /// The numbers of the account with this name; none when there is no such account.
  [[nodiscard]] virtual std::optional<UserIds> ids(const char* userName) = 0;
};

template <>
UserDatabase& DefaultProvider<UserDatabase>();

}  // namespace platform
