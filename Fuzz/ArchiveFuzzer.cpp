// SPDX-License-Identifier: Apache-2.0
//
// Fuzz target of archive extraction: whatever the archive says, it ends, stays within its limits
// and touches nothing but its destination, which lies in a folder made for the run. One thread.
#include <sys/mman.h>
#include <unistd.h>

#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <string>

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/Linux/ZipCopier.h"

namespace {

namespace fs = std::filesystem;

void Require(bool holds) {
  if (!holds) std::abort();
}

constexpr platform::ArchiveLimits kLimits{.items = 64, .bytes = 1 << 20, .ratio = 250};

/// Holds `destination`, where items may appear, and a file beside it, which must stay as it is.
struct Surroundings {
  fs::path folder;
  fs::path destination;

  Surroundings() {
    std::string name = (fs::temp_directory_path() / "archive-fuzzer-XXXXXX").string();
    Require(::mkdtemp(name.data()) != nullptr);
    folder = name;
    destination = folder / "destination";
    fs::create_symlink("..", folder / "beside");
  }
  Surroundings(const Surroundings&) = delete;
  Surroundings& operator=(const Surroundings&) = delete;
  ~Surroundings() { fs::remove_all(folder); }
};

void RequireWithinLimits(const fs::path& destination) {
  std::uintmax_t items = 0;
  std::uintmax_t bytes = 0;
  if (!fs::exists(destination)) return;
  for (const auto& item : fs::recursive_directory_iterator(destination)) {
    ++items;
    const auto type = item.symlink_status().type();
    Require(type == fs::file_type::regular || type == fs::file_type::directory ||
            type == fs::file_type::symlink);
    if (type == fs::file_type::regular) bytes += item.file_size();
  }
  Require(items <= kLimits.items);
  Require(bytes <= static_cast<std::uintmax_t>(kLimits.bytes));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const platform::FileDescriptor archive(::memfd_create("archive", MFD_CLOEXEC));
  Require(archive && ::write(archive.get(), data, size) == static_cast<ssize_t>(size));

  const Surroundings surroundings;
  const auto copier = platform::MakeZipCopier(kLimits);
  Require(copier != nullptr);
  int failures = 0;
  copier->setFileErrorCallback([&failures](const std::string& /*name*/, int error) {
    Require(error != 0);
    ++failures;
    return platform::kLeaveItemOut;
  });
  int fatal = 0;
  copier->setFatalErrorCallback([&fatal] { ++fatal; });
  const int code = copier->copy("/proc/self/fd/" + std::to_string(archive.get()),
                                surroundings.destination.string(),
                                {{platform::kExtractPKZip, true},
                                 {platform::kCopyExtendedAttributes, true},
                                 {platform::kCopyResources, true}});
  Require(fatal <= 1);
  Require(code != 0 || fatal == 0);
  RequireWithinLimits(surroundings.destination);
  for (const auto& item : fs::directory_iterator(surroundings.folder)) {
    Require(item.path().filename() == "destination" || item.is_symlink());
  }
  return 0;
}
