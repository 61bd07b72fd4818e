// SPDX-License-Identifier: Apache-2.0
//
// A folder on disk for one test, with the few operations that the tests need. One thread.
#pragma once

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <set>
#include <string>
#include <system_error>

namespace files_test {

class FolderForTest {
 public:
  explicit FolderForTest(const std::string& parent = "/tmp") {
    std::string name = parent + "/files-XXXXXX";
    if (::mkdtemp(name.data()) != nullptr) path_ = name;
  }
  ~FolderForTest() {
    std::error_code ignored;
    if (!path_.empty()) std::filesystem::remove_all(path_, ignored);
  }
  FolderForTest(const FolderForTest&) = delete;
  FolderForTest& operator=(const FolderForTest&) = delete;

  [[nodiscard]] std::string at(const std::string& name) const { return path_ + '/' + name; }
  void file(const std::string& name, const std::string& text) const {
    std::ofstream(at(name), std::ios::binary | std::ios::trunc) << text;
    ::chmod(at(name).c_str(), 0644);
  }
  void folder(const std::string& name) const {
    ::mkdir(at(name).c_str(), 0755);
    ::chmod(at(name).c_str(), 0755);
  }
  void link(const std::string& name, const std::string& target) const {
    std::filesystem::create_symlink(target, at(name));
  }
  void fifo(const std::string& name) const { ::mkfifo(at(name).c_str(), 0644); }
  [[nodiscard]] std::string text(const std::string& name) const {
    std::ifstream stream(at(name), std::ios::binary);
    if (!stream) return "(absent)";
    return {std::istreambuf_iterator<char>(stream), {}};
  }
  /// The item itself, a link not followed; all zero when it is absent.
  [[nodiscard]] struct stat status(const std::string& name) const {
    struct stat status {};
    if (::lstat(at(name).c_str(), &status) != 0) status = {};
    return status;
  }
  [[nodiscard]] std::uint32_t permissions(const std::string& name) const {
    return status(name).st_mode & 07777;
  }
  [[nodiscard]] std::set<std::string> names() const {
    std::set<std::string> found;
    for (const auto& entry : std::filesystem::directory_iterator(path_)) {
      found.insert(entry.path().filename());
    }
    return found;
  }

 private:
  std::string path_;
};

}  // namespace files_test
