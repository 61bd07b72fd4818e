// SPDX-License-Identifier: Apache-2.0
//
// The user database through getpwnam_r(3), whatever sources the system configures behind it. Any
// thread; no state.
#include <pwd.h>

#include <cerrno>
#include <string>
#include <vector>

#include "Helper/Platform/UserDatabase.h"

namespace platform {
namespace {

/// Runs `use` on the record of `name`, if there is one.
template <class Use>
void WithRecord(const char* name, const Use& use) {
  constexpr std::size_t kLargestRecord = std::size_t{1} << 20;
  std::vector<char> storage(1024);
  for (;;) {
    passwd record{};
    passwd* found = nullptr;
    const int error = ::getpwnam_r(name, &record, storage.data(), storage.size(), &found);
    if (error == 0 && found) use(*found);
    if (error == EINTR) continue;
    if (error != ERANGE || storage.size() >= kLargestRecord) return;
    storage.resize(storage.size() * 2);
  }
}

class PasswdDatabase final : public UserDatabase {
 public:
  std::optional<String> homeDirectory(const String& user) override {
    std::optional<String> home;
    WithRecord(std::string(user.utf8()).c_str(), [&home](const passwd& record) {
      if (!record.pw_dir || *record.pw_dir == '\0') return;
      home = String::Decode(record.pw_dir, StringEncoding::kUtf8);
    });
    return home;
  }

  std::optional<UserIds> ids(const char* userName) override {
    std::optional<UserIds> ids;
    WithRecord(userName, [&ids](const passwd& record) {
      ids = UserIds{.user = record.pw_uid, .group = record.pw_gid};
    });
    return ids;
  }
};

}  // namespace

template <>
UserDatabase& DefaultProvider<UserDatabase>() {
  static PasswdDatabase database;
  return database;
}

}  // namespace platform
