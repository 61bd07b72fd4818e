// SPDX-License-Identifier: Apache-2.0
//
// Directory entries in memory. Holds exactly what a test puts there; a path is a name, nothing is
// resolved. One thread at a time.
#pragma once

#include <sys/stat.h>

#include <functional>
#include <map>
#include <optional>
#include <string>

#include "Helper/Platform/DirectoryEntries.h"

namespace fakes {

class FakeDirectoryEntries final : public platform::DirectoryEntries {
 public:
  struct Entry {
    mode_t mode = 0;
    std::string target;  // of a link
  };

  void put(const std::string& path, mode_t mode) { entries_[path] = {mode, {}}; }
  /// The text of the link at `path`; none when no link stands there.
  [[nodiscard]] std::optional<std::string> linkAt(const std::string& path) const {
    const auto found = entries_.find(path);
    if (found == entries_.end() || !S_ISLNK(found->second.mode)) return std::nullopt;
    return found->second.target;
  }
  [[nodiscard]] bool contains(const std::string& path) const { return entries_.contains(path); }
  /// How often a link was made or an entry taken away, or tried to be.
  [[nodiscard]] int changes() const { return changes_; }
  /// Makes every link fail.
  void refuseLinks() { refusesLinks_ = true; }
  /// Runs before every removal.
  std::function<void()> beforeRemoval = [] {};

  std::optional<mode_t> mode(const char* path) override {
    const auto found = entries_.find(path);
    if (found == entries_.end()) return std::nullopt;
    return found->second.mode;
  }

  bool makeLink(const char* target, const char* path) override {
    ++changes_;
    if (refusesLinks_ || *target == '\0' || entries_.contains(path)) return false;
    const auto folder = entries_.find(FolderOf(path));
    if (folder == entries_.end() || !S_ISDIR(folder->second.mode)) return false;
    entries_[path] = {S_IFLNK | 0777, target};
    return true;
  }

  bool remove(const char* path) override {
    beforeRemoval();
    ++changes_;
    const auto inside = entries_.lower_bound(std::string(path) + "/");
    if (inside != entries_.end() && inside->first.starts_with(std::string(path) + "/")) {
      return false;
    }
    return entries_.erase(path) == 1;
  }

 private:
  static std::string FolderOf(const std::string& path) { return path.substr(0, path.rfind('/')); }

  std::map<std::string, Entry, std::less<>> entries_;
  bool refusesLinks_ = false;
  int changes_ = 0;
};

}  // namespace fakes
