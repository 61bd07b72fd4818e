// SPDX-License-Identifier: Apache-2.0
//
// One folder, the archives made in it, and what the real copier makes of them. One thread.
#pragma once

#include <gtest/gtest.h>

#include <map>
#include <memory>

#include "Helper/Platform/Linux/ZipCopier.h"
#include "Tests/Files/ArchiveForTest.h"
#include "Tests/Files/FolderForTest.h"
#include "Tests/Support/WireClient.h"

namespace files_test {

class ExtractionForTest : public testing::Test {
 protected:
  using Errors = std::map<std::string, int>;

  /// Extracts "a.zip", made by `script`, into "to".
  int extractZip(const std::string& script) {
    EXPECT_TRUE(MakeZip(folder.at("a.zip"), script));
    return extract(folder.at("a.zip"), folder.at("to"));
  }
  /// Extracts, and finds every descriptor closed again.
  int extract(const std::string& source, const std::string& destination) {
    errors.clear();
    fatal = 0;
    // What the process opens once is open before the first count.
    (void)platform::MakeZipCopier(limits);
    const std::size_t before = support::OpenDescriptors();
    int code = 0;
    {
      const std::unique_ptr<platform::ArchiveCopier> copier = platform::MakeZipCopier(limits);
      copier->setFileErrorCallback([this](const std::string& name, int error) {
        errors[name] = error;
        return platform::kLeaveItemOut;
      });
      copier->setFatalErrorCallback([this] { ++fatal; });
      code = copier->copy(
          source, destination,
          {{"extractPKZip", true}, {"copyExtendedAttributes", true}, {"copyResources", true}});
    }
    EXPECT_EQ(support::OpenDescriptors(), before);
    return code;
  }
  /// Everything below "to".
  [[nodiscard]] std::set<std::string> extracted() const {
    std::set<std::string> paths;
    std::error_code absent;
    const std::filesystem::path top = folder.at("to");
    for (const auto& entry : std::filesystem::recursive_directory_iterator(top, absent)) {
      paths.insert(entry.path().lexically_relative(top));
    }
    return paths;
  }

  FolderForTest folder;
  platform::ArchiveLimits limits;
  Errors errors;  // of items, by name
  int fatal = 0;
};

}  // namespace files_test
