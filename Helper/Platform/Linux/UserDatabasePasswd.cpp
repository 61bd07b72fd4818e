// SPDX-License-Identifier: Apache-2.0
//
// The user database: /etc/passwd itself, then getpwnam_r(3) and its like with whatever sources the
// system configures behind it. Any thread; no state.
#include <pwd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "Helper/Platform/UserDatabase.h"

namespace platform {
namespace {

struct FileCloser {
  void operator()(std::FILE* file) const { (void)std::fclose(file); }  // only read
};

bool Matches(const passwd& record, const char* name) {
  return std::strcmp(record.pw_name, name) == 0;
}
bool Matches(const passwd& record, uid_t user) { return record.pw_uid == user; }

int LookUp(const char* name, passwd& record, std::vector<char>& storage, passwd*& found) {
  return ::getpwnam_r(name, &record, storage.data(), storage.size(), &found);
}
int LookUp(uid_t user, passwd& record, std::vector<char>& storage, passwd*& found) {
  return ::getpwuid_r(user, &record, storage.data(), storage.size(), &found);
}

/// Finds a user in /etc/passwd, where system accounts are: the database's other sources are modules
/// whose loading would cost every start of the helper more than all the rest of it.
template <class Key>
bool FindInFile(Key key, passwd& record, std::vector<char>& storage) {
  const std::unique_ptr<std::FILE, FileCloser> file(std::fopen("/etc/passwd", "re"));
  passwd* found = nullptr;
  while (file && ::fgetpwent_r(file.get(), &record, storage.data(), storage.size(), &found) == 0) {
    if (Matches(*found, key)) return true;
  }
  return false;
}

template <class Key>
bool FindAnywhere(Key key, passwd& record, std::vector<char>& storage) {
  constexpr std::size_t kLargestRecord = std::size_t{1} << 20;
  for (;;) {
    passwd* found = nullptr;
    const int error = LookUp(key, record, storage, found);
    if (error == 0) return found != nullptr;
    if (error == EINTR) continue;
    if (error != ERANGE || storage.size() >= kLargestRecord) return false;
    storage.resize(storage.size() * 2);
  }
}

/// Runs `use` on the record of the user with this name or number, if there is one.
template <class Key, class Use>
void WithRecord(Key key, const Use& use) {
  std::vector<char> storage(4096);
  passwd record{};
  if (FindInFile(key, record, storage) || FindAnywhere(key, record, storage)) use(record);
}

template <class Key>
std::optional<String> HomeOf(Key key) {
  std::optional<String> home;
  WithRecord(key, [&home](const passwd& record) {
    if (!record.pw_dir || *record.pw_dir == '\0') return;
    home = String::Decode(record.pw_dir, StringEncoding::kUtf8);
  });
  return home;
}

class PasswdDatabase final : public UserDatabase {
 public:
  std::optional<String> homeDirectory(const String& user) override {
    return HomeOf(std::string(user.utf8()).c_str());
  }
  std::optional<String> homeDirectory(uid_t user) override { return HomeOf(user); }

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
  static auto& database = *new PasswdDatabase;
  return database;
}

}  // namespace platform
