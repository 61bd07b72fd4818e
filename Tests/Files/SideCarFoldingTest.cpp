// SPDX-License-Identifier: Apache-2.0
//
// Side-cars that become extended attributes, and those that stay files.
#include <gtest/gtest.h>
#include <sys/xattr.h>

#include <optional>

#include "Helper/Platform/ArchiveCopier.h"
#include "Tests/Files/ArchiveForTest.h"
#include "Tests/Files/FolderForTest.h"

namespace {

using platform::ArchiveCopyOptions;

class SideCarFolding : public testing::Test {
 protected:
  void SetUp() override {
    folder.file("probe", "");
    if (::setxattr(folder.at("probe").c_str(), "user.probe", "x", 1, 0) != 0) {
      GTEST_SKIP() << "the file system of /tmp keeps no attributes of users";
    }
  }
  void extract(const std::string& script, bool attributes = true, bool resources = true) {
    ASSERT_TRUE(files_test::MakeZip(folder.at("a.zip"), script));
    const ArchiveCopyOptions options{{"extractPKZip", true},
                                     {"copyExtendedAttributes", attributes},
                                     {"copyResources", resources}};
    const auto copier = platform::DefaultProvider<platform::ArchiveCopierFactory>().create();
    copier->setFileErrorCallback([](const std::string& name, int error) {
      ADD_FAILURE() << name << ": " << error;
      return 2;
    });
    EXPECT_EQ(copier->copy(folder.at("a.zip"), folder.at("to"), options), 0);
  }
  std::optional<std::string> attribute(const std::string& path, const std::string& name) {
    std::string value(70'000, '\0');
    const ssize_t size =
        ::getxattr(folder.at("to/" + path).c_str(), name.c_str(), value.data(), value.size());
    if (size < 0) return std::nullopt;
    value.resize(static_cast<std::size_t>(size));
    return value;
  }
  std::set<std::string> extracted() {
    std::set<std::string> paths;
    for (const auto& entry : std::filesystem::recursive_directory_iterator(folder.at("to"))) {
      paths.insert(entry.path().lexically_relative(folder.at("to")));
    }
    return paths;
  }
  files_test::FolderForTest folder;
};

constexpr char kAll[] = "sidecar({'com.example.label': b'red'}, b'TYPECREA', b'fork')";
const std::string kInfo = "TYPECREA" + std::string(24, '\0');

TEST_F(SideCarFolding, KeepsEverythingOfASideCarBesideItsItem) {
  extract("file('sub/a')\nfile('sub/._a', " + std::string(kAll) + ")");
  EXPECT_EQ(attribute("sub/a", "user.com.example.label"), "red");
  EXPECT_EQ(attribute("sub/a", "user.finder-info"), kInfo);
  EXPECT_EQ(attribute("sub/a", "user.resource-data"), "fork");
  EXPECT_EQ(extracted(), (std::set<std::string>{"sub", "sub/a"}));
}

TEST_F(SideCarFolding, KeepsASideCarThatComesBeforeItsItem) {
  extract("file('._a', " + std::string(kAll) + ")\nfile('a')");
  EXPECT_EQ(attribute("a", "user.resource-data"), "fork");
  EXPECT_EQ(extracted(), std::set<std::string>{"a"});
}

TEST_F(SideCarFolding, KeepsASideCarInAParallelFolderOfAnyNameAndRemovesThatFolder) {
  extract("file('sub/a')\nfolder('extras')\nfile('extras/sub/._a', " + std::string(kAll) +
          ")\nfile('extras/._sub', " + std::string(kAll) + ")");
  EXPECT_EQ(attribute("sub/a", "user.com.example.label"), "red");
  EXPECT_EQ(attribute("sub", "user.com.example.label"), "red");
  EXPECT_EQ(extracted(), (std::set<std::string>{"sub", "sub/a"}));
}

TEST_F(SideCarFolding, PrefersTheItemBesideTheSideCar) {
  extract("file('a')\nfile('sub/a')\nfile('sub/._a', " + std::string(kAll) + ")");
  EXPECT_EQ(attribute("sub/a", "user.resource-data"), "fork");
  EXPECT_EQ(attribute("a", "user.resource-data"), std::nullopt);
}

TEST_F(SideCarFolding, LeavesTheTimesOfFilesAndFoldersAlone) {
  extract("folder('sub')\nfile('sub/a')\nfile('sub/._a', " + std::string(kAll) + ")");
  EXPECT_EQ(folder.status("to/sub/a").st_mtim.tv_sec, folder.status("to/sub").st_mtim.tv_sec);
}

TEST_F(SideCarFolding, LeavesOrphansAndWhatIsNoSideCarAsFiles) {
  extract("file('._orphan', " + std::string(kAll) +
          ")\nfile('a')\nfile('._a', b'no side-car')\n"
          "link('l', 'a')\nfile('._l', " +
          std::string(kAll) + ")\nfile('._')");
  EXPECT_EQ(extracted(), (std::set<std::string>{"._orphan", "a", "._a", "l", "._l", "._"}));
  EXPECT_EQ(folder.text("to/._a"), "no side-car");
  EXPECT_EQ(attribute("a", "user.resource-data"), std::nullopt) << "a link is not followed";
}

TEST_F(SideCarFolding, LeavesASideCarAsAFileWhereItsDataAreTooMuchForAnAttribute) {
  extract(
      "file('a')\nfile('._a', sidecar({}, b'', bytes(65537)))\n"
      "file('b')\nfile('._b', sidecar({}, b'', bytes(2 << 20)))");
  EXPECT_EQ(extracted(), (std::set<std::string>{"a", "._a", "b", "._b"}));
}

TEST_F(SideCarFolding, DropsWhatIsNotAskedFor) {
  extract("file('a')\nfile('._a', " + std::string(kAll) + ")", true, false);
  EXPECT_EQ(attribute("a", "user.com.example.label"), "red");
  EXPECT_EQ(attribute("a", "user.resource-data"), std::nullopt);
  extract("file('b')\nfile('._b', " + std::string(kAll) + ")", false, true);
  EXPECT_EQ(attribute("b", "user.com.example.label"), std::nullopt);
  EXPECT_EQ(attribute("b", "user.finder-info"), std::nullopt);
  EXPECT_EQ(attribute("b", "user.resource-data"), "fork");
}

TEST_F(SideCarFolding, LeavesSideCarsAsTheyAreWhereNothingOfThemIsAskedFor) {
  extract("file('a')\nfile('._a', " + std::string(kAll) + ")", false, false);
  EXPECT_EQ(extracted(), (std::set<std::string>{"a", "._a"}));
}

}  // namespace
