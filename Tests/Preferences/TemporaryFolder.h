// SPDX-License-Identifier: Apache-2.0
//
// A folder for one test, with the few file operations that the tests need. One thread.
#pragma once

#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <set>
#include <sstream>
#include <string>
#include <string_view>
#include <system_error>

#include "Helper/Platform/Linux/PreferenceFiles.h"

namespace preferences_test {

class TemporaryFolder {
 public:
  TemporaryFolder() {
    std::string name = (std::filesystem::temp_directory_path() / "preferences-XXXXXX").string();
    if (::mkdtemp(name.data()) != nullptr) path_ = name;
  }
  ~TemporaryFolder() {
    std::error_code ignored;
    if (!path_.empty()) std::filesystem::remove_all(path_, ignored);
  }
  TemporaryFolder(const TemporaryFolder&) = delete;
  TemporaryFolder& operator=(const TemporaryFolder&) = delete;

  [[nodiscard]] const std::filesystem::path& path() const { return path_; }

  /// Roots below this folder; neither of them exists yet.
  [[nodiscard]] platform::PreferenceRoots roots() const {
    return {path_ / "user/Library/Preferences", path_ / "Library/Preferences", "cafe0123"};
  }

 private:
  std::filesystem::path path_;
};

inline void WriteFile(const std::filesystem::path& path, std::string_view text) {
  std::filesystem::create_directories(path.parent_path());
  std::ofstream(path, std::ios::binary | std::ios::trunc) << text;
}

[[nodiscard]] inline std::string ReadFile(const std::filesystem::path& path) {
  std::ostringstream text;
  text << std::ifstream(path, std::ios::binary).rdbuf();
  return text.str();
}

/// Names of what stands in `folder`, the lock files left out.
[[nodiscard]] inline std::set<std::string> NamesIn(const std::filesystem::path& folder) {
  std::set<std::string> names;
  std::error_code ignored;
  for (const auto& entry : std::filesystem::directory_iterator(folder, ignored)) {
    const std::string name = entry.path().filename();
    if (!name.ends_with(".lock")) names.insert(name);
  }
  return names;
}

}  // namespace preferences_test
