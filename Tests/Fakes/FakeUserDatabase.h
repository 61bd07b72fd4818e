// SPDX-License-Identifier: Apache-2.0
//
// A user database of what a test put into it. Any thread may ask; a test fills it before.
#pragma once

#include <atomic>
#include <map>
#include <optional>
#include <string>

#include "Helper/Platform/UserDatabase.h"

namespace fakes {

class FakeUserDatabase final : public platform::UserDatabase {
 public:
  void setHome(const std::string& user, const std::string& home) { homes_[user] = home; }
  void setIds(const std::string& user, platform::UserIds ids) { ids_[user] = ids; }
  /// Questions for a home, and for ids.
  [[nodiscard]] int homeQuestions() const { return homeQuestions_; }
  [[nodiscard]] int idQuestions() const { return idQuestions_; }

  std::optional<platform::String> homeDirectory(const platform::String& user) override {
    ++homeQuestions_;
    const auto found = homes_.find(std::string(user.utf8()));
    if (found == homes_.end()) return std::nullopt;
    return platform::String::Decode(found->second, platform::StringEncoding::kUtf8);
  }

  std::optional<platform::String> homeDirectory(uid_t user) override {
    for (const auto& [name, ids] : ids_) {
      if (ids.user == user)
        return homeDirectory(
            *platform::String::Decode(name.c_str(), platform::StringEncoding::kUtf8));
    }
    return std::nullopt;
  }

  std::optional<platform::UserIds> ids(const char* userName) override {
    ++idQuestions_;
    const auto found = ids_.find(userName);
    if (found == ids_.end()) return std::nullopt;
    return found->second;
  }

 private:
  std::map<std::string, std::string> homes_;
  std::map<std::string, platform::UserIds> ids_;
  std::atomic<int> homeQuestions_{0};
  std::atomic<int> idQuestions_{0};
};

}  // namespace fakes
