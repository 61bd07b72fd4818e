// SPDX-License-Identifier: Apache-2.0
//
// What directory entries promise, on the real provider and on the fake.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <string>

#include "Helper/Platform/DirectoryEntries.h"
#include "Helper/Platform/FileDescriptor.h"
#include "Tests/Fakes/FakeDirectoryEntries.h"

namespace {

using platform::DirectoryEntries;

struct Fake {
  Fake() { entries.put(folder, S_IFDIR | 0755); }
  void make(const std::string& path, mode_t type) { entries.put(path, type | 0644); }
  std::string linkAt(const std::string& path) { return entries.linkAt(path).value_or("(none)"); }
  DirectoryEntries& service() { return entries; }

  std::string folder = "/folder";
  fakes::FakeDirectoryEntries entries;
};

struct Real {
  Real() { EXPECT_NE(::mkdtemp(folder.data()), nullptr); }
  ~Real() { std::filesystem::remove_all(folder); }
  Real(const Real&) = delete;
  Real& operator=(const Real&) = delete;
  void make(const std::string& path, mode_t type) {
    if (type == S_IFDIR) {
      EXPECT_EQ(::mkdir(path.c_str(), 0755), 0);
    } else if (type == S_IFREG || type == S_IFIFO) {
      EXPECT_EQ(::mknod(path.c_str(), type | 0644, 0), 0);
    }
  }
  std::string linkAt(const std::string& path) {
    std::error_code error;
    const auto target = std::filesystem::read_symlink(path, error);
    return error ? "(none)" : target.string();
  }
  DirectoryEntries& service() { return platform::DefaultProvider<DirectoryEntries>(); }

  std::string folder = "/tmp/directory-entries-XXXXXX";
};

template <class Place>
class DirectoryEntriesContract : public ::testing::Test {
 protected:
  std::string at(const char* name) { return place.folder + "/" + name; }
  /// The type of the entry called `name`; 0 without one.
  mode_t typeAt(const char* name) {
    return place.service().mode(at(name).c_str()).value_or(0) & mode_t{S_IFMT};
  }
  bool link(const std::string& target, const char* name) {
    return place.service().makeLink(target.c_str(), at(name).c_str());
  }
  bool remove(const char* name) { return place.service().remove(at(name).c_str()); }
  Place place;
};

using Places = ::testing::Types<Fake, Real>;
TYPED_TEST_SUITE(DirectoryEntriesContract, Places);

TYPED_TEST(DirectoryEntriesContract, TellsTheTypeAndDoesNotFollowALink) {
  this->place.make(this->at("file"), S_IFREG);
  this->place.make(this->at("folder"), S_IFDIR);
  this->place.make(this->at("fifo"), S_IFIFO);
  ASSERT_TRUE(this->link(this->at("folder"), "link"));
  EXPECT_EQ(this->typeAt("file"), mode_t{S_IFREG});
  EXPECT_EQ(this->typeAt("folder"), mode_t{S_IFDIR});
  EXPECT_EQ(this->typeAt("fifo"), mode_t{S_IFIFO});
  EXPECT_EQ(this->typeAt("link"), mode_t{S_IFLNK});
  EXPECT_FALSE(this->place.service().mode(this->at("absent").c_str()));
}

TYPED_TEST(DirectoryEntriesContract, MakesALinkWhateverItsTarget) {
  EXPECT_TRUE(this->link("../absent target", "link"));
  EXPECT_EQ(this->place.linkAt(this->at("link")), "../absent target");
}

TYPED_TEST(DirectoryEntriesContract, MakesNoLinkOverWhatStandsThere) {
  this->place.make(this->at("file"), S_IFREG);
  EXPECT_FALSE(this->link("target", "file"));
  EXPECT_EQ(this->typeAt("file"), mode_t{S_IFREG});
  ASSERT_TRUE(this->link("first", "link"));
  EXPECT_FALSE(this->link("second", "link"));
  EXPECT_EQ(this->place.linkAt(this->at("link")), "first");
}

TYPED_TEST(DirectoryEntriesContract, MakesNoLinkInAMissingFolderNorToNothing) {
  EXPECT_FALSE(this->link("target", "absent/link"));
  EXPECT_FALSE(this->link("", "link"));
}

TYPED_TEST(DirectoryEntriesContract, RemovesAFileALinkAndAnEmptyDirectory) {
  this->place.make(this->at("file"), S_IFREG);
  this->place.make(this->at("folder"), S_IFDIR);
  ASSERT_TRUE(this->link(this->at("file"), "link"));
  EXPECT_TRUE(this->remove("link"));
  EXPECT_EQ(this->typeAt("file"), mode_t{S_IFREG}) << "not what the link led to";
  EXPECT_TRUE(this->remove("file"));
  EXPECT_TRUE(this->remove("folder"));
  for (const char* name : {"link", "file", "folder"}) EXPECT_EQ(this->typeAt(name), mode_t{0});
}

TYPED_TEST(DirectoryEntriesContract, RemovesNoTreeAndNothingThatIsNotThere) {
  this->place.make(this->at("folder"), S_IFDIR);
  this->place.make(this->at("folder/file"), S_IFREG);
  EXPECT_FALSE(this->remove("folder"));
  EXPECT_EQ(this->typeAt("folder/file"), mode_t{S_IFREG});
  EXPECT_FALSE(this->remove("absent"));
}

}  // namespace
