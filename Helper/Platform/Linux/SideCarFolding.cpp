// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/SideCarFolding.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <cstddef>
#include <optional>
#include <span>
#include <vector>

#include "Helper/Platform/Linux/FileLocation.h"
#include "Helper/Platform/SideCar.h"

namespace platform {
namespace {

constexpr std::string_view kPrefix = "._";
/// No file system keeps more than a part of this in attributes.
constexpr off_t kLargestSideCar = 1 << 20;

std::size_t NameStart(std::string_view path) {
  const std::size_t slash = path.rfind('/');
  return slash == std::string_view::npos ? 0 : slash + 1;
}

std::optional<std::vector<std::byte>> Read(int root, const std::string& path) {
  const FileDescriptor file = OpenBeneath(root, path, O_RDONLY | O_NONBLOCK);
  struct stat status {};
  if (!file || ::fstat(file.get(), &status) != 0 || !S_ISREG(status.st_mode) ||
      status.st_size > kLargestSideCar) {
    return std::nullopt;
  }
  std::vector<std::byte> bytes(static_cast<std::size_t>(status.st_size));
  // One that becomes shorter meanwhile is not whole.
  if (::pread(file.get(), bytes.data(), bytes.size(), 0) != status.st_size) return std::nullopt;
  return bytes;
}

/// Opens a regular file or a directory: nothing else can have attributes of users.
FileDescriptor OpenItem(int root, const std::string& path) {
  FileDescriptor item = OpenBeneath(root, path, O_PATH);
  struct stat status {};
  if (!item || ::fstat(item.get(), &status) != 0 ||
      !(S_ISREG(status.st_mode) || S_ISDIR(status.st_mode))) {
    return {};
  }
  return OpenBeneath(root, path, O_RDONLY | O_NONBLOCK);
}

FileDescriptor OpenItemOf(int root, const std::string& sideCarPath) {
  std::string path = sideCarPath;
  path.erase(NameStart(path), kPrefix.size());
  FileDescriptor item = OpenItem(root, path);
  const std::size_t slash = path.find('/');
  if (!item && slash != std::string::npos) item = OpenItem(root, path.substr(slash + 1));
  return item;
}

bool Keep(const FileDescriptor& item, const std::string& name, std::span<const std::byte> value) {
  return ::fsetxattr(item.get(), ("user." + name).c_str(), value.data(), value.size(), 0) == 0;
}

}  // namespace

bool IsSideCarPath(std::string_view path) {
  const std::string_view name = path.substr(NameStart(path));
  if (!name.starts_with(kPrefix)) return false;
  const std::string_view item = name.substr(kPrefix.size());
  return !item.empty() && item != "." && item != "..";
}

bool FoldSideCar(int root, const std::string& path, SideCarWish wish) {
  const auto bytes = Read(root, path);
  const auto sideCar = bytes ? ParseSideCar(*bytes) : std::nullopt;
  const FileDescriptor item = sideCar ? OpenItemOf(root, path) : FileDescriptor();
  if (!item) return false;
  if (wish.attributes) {
    for (const SideCarAttribute& attribute : sideCar->attributes) {
      if (!Keep(item, attribute.name, attribute.value)) return false;
    }
    const auto info = sideCar->finderInfo;
    if (!info.empty() && !Keep(item, "finder-info", info)) return false;
  }
  const auto resource = sideCar->resourceData;
  return !wish.resourceData || resource.empty() || Keep(item, "resource-data", resource);
}

}  // namespace platform
