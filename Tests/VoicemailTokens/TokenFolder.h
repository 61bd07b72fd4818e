// SPDX-License-Identifier: Apache-2.0
//
// A folder for one test with the place of a token store in it. One thread.
#pragma once

#include <unistd.h>

#include <filesystem>
#include <set>
#include <string>
#include <system_error>

namespace token_test {

class TokenFolder {
 public:
  TokenFolder() {
    std::string name = (std::filesystem::temp_directory_path() / "tokens-XXXXXX").string();
    if (::mkdtemp(name.data()) != nullptr) path_ = name;
  }
  ~TokenFolder() {
    std::error_code ignored;
    if (!path_.empty()) std::filesystem::remove_all(path_, ignored);
  }
  TokenFolder(const TokenFolder&) = delete;
  TokenFolder& operator=(const TokenFolder&) = delete;

  [[nodiscard]] const std::filesystem::path& path() const { return path_; }
  /// The store's own folder, and its file; neither exists yet.
  [[nodiscard]] std::filesystem::path folder() const { return path_ / "store"; }
  [[nodiscard]] std::string file() const { return folder() / "tokens.db"; }

  /// Names of what stands in the store's folder.
  [[nodiscard]] std::set<std::string> names() const {
    std::set<std::string> names;
    std::error_code ignored;
    for (const auto& entry : std::filesystem::directory_iterator(folder(), ignored)) {
      names.insert(entry.path().filename());
    }
    return names;
  }

 private:
  std::filesystem::path path_;
};

}  // namespace token_test
