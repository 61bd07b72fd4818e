// SPDX-License-Identifier: Apache-2.0
//
// A file manager on a tree in memory, in which single operations can be made to fail. Paths are
// absolute, without "." and "..". One thread.
#pragma once

#include <cerrno>
#include <map>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "Helper/Platform/FileManager.h"

namespace fakes {

class FakeFileManager final : public platform::FileManager {
 public:
  struct Node {
    std::uint32_t mode = 0;  // type bits included
    std::uint32_t uid = 0;
    std::uint32_t gid = 0;
    std::string content;  // of a file; where a link points
  };
  using FilePlace = platform::FilePlace;
  using FileError = platform::FileError;
  using FileKind = platform::FileKind;
  using FileAttributes = platform::FileAttributes;

  FakeFileManager() { nodes["/"] = {.mode = 0040755, .content = {}}; }

  void addFile(const std::string& path, std::string content, std::uint32_t permissions = 0644) {
    nodes[path] = {.mode = 0100000 | permissions, .content = std::move(content)};
  }
  void addDirectory(const std::string& path, std::uint32_t permissions = 0755) {
    nodes[path] = {.mode = 0040000 | permissions, .content = {}};
  }
  void addLink(const std::string& path, std::string target) {
    nodes[path] = {.mode = 0120777, .content = std::move(target)};
  }
  void addSpecial(const std::string& path, std::uint32_t type) {
    nodes[path] = {.mode = type | 0644, .content = {}};
  }
  /// Makes every copy, move, creation or change of attributes that ends at `path` fail: with
  /// `error`, or without an error object when there is none.
  void failAt(const std::string& path, FileError error) { faults[path] = error; }

  [[nodiscard]] std::string contentOf(const std::string& path) const {
    const auto found = nodes.find(path);
    return found == nodes.end() ? "(absent)" : found->second.content;
  }

  FileKind kind(const FilePlace& place) override {
    const Node* node = follow(join(place));
    if (!node) return FileKind::kAbsent;
    return isDirectory(*node) ? FileKind::kDirectory : FileKind::kOther;
  }
  std::optional<std::uint32_t> mode(const std::string& path) override {
    const Node* node = follow(path);
    return node ? std::optional(node->mode) : std::nullopt;
  }
  std::vector<std::string> subpaths(const std::string& path) override {
    std::vector<std::string> names;
    if (path.empty()) return names;
    const std::string prefix = trim(path) + '/';
    for (const auto& [name, node] : nodes) {
      if (name.starts_with(prefix)) names.push_back(name.substr(prefix.size()));
    }
    return names;
  }
  bool createDirectory(const FilePlace& place, bool intermediates, const FileAttributes& attributes,
                       FileError* error) override {
    const std::string path = join(place);
    if (path.empty()) return false;
    if (const auto fault = faults.find(path); fault != faults.end()) return fail(fault, error);
    if (!attributes.ownerName.empty() && !users.contains(attributes.ownerName)) {
      return fail(EINVAL, error);
    }
    if (!attributes.groupName.empty() && !users.contains(attributes.groupName)) {
      return fail(EINVAL, error);
    }
    if (const Node* node = follow(path)) {
      return intermediates && isDirectory(*node) ? true : fail(EEXIST, error);
    }
    const std::string parent = parentOf(path);
    if (!intermediates && !nodes.contains(parent)) return fail(ENOENT, error);
    if (intermediates && !createDirectory(parent, true, attributes, error)) return false;
    addDirectory(path);
    apply(attributes, nodes[path]);
    return true;
  }
  bool copyItem(const FilePlace& source, const FilePlace& destination, FileError* error) override {
    return transfer(join(source), join(destination), /*copy=*/true, error);
  }
  bool moveItem(const FilePlace& source, const FilePlace& destination, FileError* error) override {
    return transfer(join(source), join(destination), /*copy=*/false, error);
  }
  bool removeItem(const FilePlace& place, FileError* error) override {
    const std::string path = join(place);
    if (path.empty()) return false;
    if (!nodes.contains(path)) return fail(ENOENT, error);
    for (const std::string& below : subpaths(path)) nodes.erase(path + '/' + below);
    nodes.erase(path);
    return true;
  }
  bool removeEmptyDirectory(const std::string& path) override {
    const auto found = nodes.find(trim(path));
    if (found == nodes.end() || !isDirectory(found->second) || !subpaths(path).empty()) {
      return false;
    }
    nodes.erase(found);
    return true;
  }
  bool setAttributes(const FileAttributes& attributes, const FilePlace& place,
                     FileError* error) override {
    const std::string path = join(place);
    if (path.empty()) return false;
    if (const auto fault = faults.find(path); fault != faults.end()) return fail(fault, error);
    const auto found = nodes.find(path);
    if (found == nodes.end()) return fail(ENOENT, error);
    apply(attributes, found->second);
    return true;
  }
  bool changeOwner(const std::string& path, std::uint32_t uid, std::uint32_t gid) override {
    Node* node = follow(path);
    if (!node || faults.contains(path)) return false;
    node->uid = uid;
    node->gid = gid;
    return true;
  }

  std::map<std::string, Node> nodes;
  std::map<std::string, FileError> faults;
  std::map<std::string, std::uint32_t> users{{"root", 0}, {"daemon", 1}};

 private:
  static bool isDirectory(const Node& node) { return (node.mode & 0170000) == 0040000; }
  static std::string trim(std::string path) {
    while (path.size() > 1 && path.ends_with('/')) path.pop_back();
    for (std::size_t at; (at = path.find("//")) != std::string::npos;) path.erase(at, 1);
    return path;
  }
  static std::string join(const FilePlace& place) {
    return trim(place.subpath.empty() ? place.path : place.path + '/' + place.subpath);
  }
  static std::string parentOf(const std::string& path) {
    const std::size_t slash = path.rfind('/');
    return slash == 0 ? "/" : path.substr(0, slash);
  }
  static bool fail(std::int32_t code, FileError* error) {
    if (error) *error = code;
    return false;
  }
  static bool fail(std::map<std::string, FileError>::const_iterator fault, FileError* error) {
    if (error && fault->second) *error = fault->second;
    return false;
  }
  Node* follow(std::string path) {
    path = trim(std::move(path));
    for (int links = 0; links < 40; ++links) {
      const auto found = nodes.find(path);
      if (found == nodes.end()) return nullptr;
      if ((found->second.mode & 0170000) != 0120000) return &found->second;
      path = found->second.content;
    }
    return nullptr;
  }
  void apply(const FileAttributes& attributes, Node& node) const {
    if (attributes.permissions)
      node.mode = (node.mode & 0170000) | (*attributes.permissions & 07777);
    if (attributes.ownerId) node.uid = *attributes.ownerId;
    if (attributes.groupId) node.gid = *attributes.groupId;
    if (!attributes.ownerName.empty()) node.uid = users.at(attributes.ownerName);
    if (!attributes.groupName.empty()) node.gid = users.at(attributes.groupName);
  }
  bool transfer(const std::string& from, const std::string& to, bool copy, FileError* error) {
    if (from.empty() || to.empty()) return false;
    if (const auto fault = faults.find(to); fault != faults.end()) return fail(fault, error);
    const auto source = nodes.find(from);
    if (source == nodes.end()) return fail(ENOENT, error);
    if (nodes.contains(to)) return fail(EEXIST, error);
    const Node* parent = follow(parentOf(to));
    if (!parent) return fail(ENOENT, error);
    if (!isDirectory(*parent)) return fail(ENOTDIR, error);
    if (to.starts_with(from + '/')) return fail(EINVAL, error);
    FileError first;
    for (const std::string& below : subpaths(from)) {
      transferNode(from + '/' + below, to + '/' + below, copy, first);
    }
    transferNode(from, to, copy, first);
    return first ? fail(*first, error) : true;
  }
  void transferNode(const std::string& from, const std::string& to, bool copy, FileError& first) {
    Node node = nodes.at(from);
    if (copy) {
      const std::uint32_t type = node.mode & 0170000;
      if (type != 0100000 && type != 0040000 && type != 0120000) {
        if (!first) first = EOPNOTSUPP;
        return;
      }
      node.mode &= type == 0040000 ? ~06000U : ~07000U;
    } else {
      nodes.erase(from);
    }
    nodes[to] = node;
  }
};

}  // namespace fakes
