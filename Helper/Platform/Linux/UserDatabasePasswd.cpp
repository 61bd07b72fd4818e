// SPDX-License-Identifier: Apache-2.0
//
// The user database: /etc/passwd itself, then getpwnam_r(3) with whatever sources the system
// configures behind it. Any thread; no state.
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

/// Finds `name` in /etc/passwd, where system accounts are: the database's other sources are modules
/// whose loading would cost every start of the helper more than all the rest of it.
bool FindInFile(const char* name, passwd& record, std::vector<char>& storage) {
  const std::unique_ptr<std::FILE, FileCloser> file(std::fopen("/etc/passwd", "re"));
  passwd* found = nullptr;
  while (file && ::fgetpwent_r(file.get(), &record, storage.data(), storage.size(), &found) == 0) {
    if (std::strcmp(found->pw_name, name) == 0) return true;
  }
  return false;
}

bool FindAnywhere(const char* name, passwd& record, std::vector<char>& storage) {
  constexpr std::size_t kLargestRecord = std::size_t{1} << 20;
  for (;;) {
    passwd* found = nullptr;
    const int error = ::getpwnam_r(name, &record, storage.data(), storage.size(), &found);
    if (error == 0) return found != nullptr;
    if (error == EINTR) continue;
    if (error != ERANGE || storage.size() >= kLargestRecord) return false;
    storage.resize(storage.size() * 2);
  }
}

/// Runs `use` on the record of `name`, if there is one.
template <class Use>
void WithRecord(const char* name, const Use& use) {
  std::vector<char> storage(4096);
  passwd record{};
  if (FindInFile(name, record, storage) || FindAnywhere(name, record, storage)) use(record);
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
