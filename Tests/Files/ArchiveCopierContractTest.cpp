// SPDX-License-Identifier: Apache-2.0
//
// What every archive copier keeps to, run on the one in memory and on the one for PKZip archives.
#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <sstream>

#include "Tests/Fakes/FakeArchiveCopier.h"
#include "Tests/Files/ArchiveForTest.h"
#include "Tests/Files/FolderForTest.h"

namespace {

using fakes::FakeArchive;
using platform::ArchiveCopier;
using platform::ArchiveCopierFactory;
using platform::ArchiveCopyOptions;

class MemoryArchives {
 public:
  ArchiveCopierFactory& factory() { return fake_; }
  std::string at(const std::string& name) { return "/top/" + name; }
  void archive(const FakeArchive& archive) { fake_.archives[at("archive")] = archive; }
  std::string text(const std::string& name) {
    const auto found = fake_.files.find(at(name));
    return found == fake_.files.end() ? "(absent)" : found->second;
  }

 private:
  fakes::FakeArchiveCopierFactory fake_;
};

class ZipArchives : public files_test::FolderForTest {
 public:
  ArchiveCopierFactory& factory() { return platform::DefaultProvider<ArchiveCopierFactory>(); }
  void archive(const FakeArchive& archive) {
    std::string script;
    for (const FakeArchive::Item& item : archive.items) {
      // No copier extracts a socket.
      script += "item('" + item.name + "', " + (item.error ? "0o140644" : "0o100644") + ", b'" +
                item.content + "')\n";
    }
    // The code of a block that no compressor writes, in a stream of known bytes.
    if (archive.damaged)
      script += "file('damaged', bytes(9999))\npatches[b'\\xed\\xc1'] = b'\\xff\\xff'\n";
    ASSERT_TRUE(files_test::MakeZip(at("archive"), script));
  }
};

template <class Archives>
class ArchiveCopierContract : public testing::Test {
 protected:
  int copy(const std::string& source, const ArchiveCopyOptions& options) {
    return copier->copy(archives.at(source), archives.at("to"), options);
  }
  void count() {
    copier->setFileErrorCallback([this](const std::string& name, int) {
      failed += name + ' ';
      return answer;
    });
    copier->setFatalErrorCallback([this] { ++fatal; });
  }
  Archives archives;
  std::unique_ptr<ArchiveCopier> copier = archives.factory().create();
  ArchiveCopyOptions options{{"extractPKZip", true}};
  std::string failed;
  int fatal = 0;
  int answer = 2;
};

class ArchivesNames {
 public:
  template <class Archives>
  static std::string GetName(int) {
    return std::is_same_v<Archives, MemoryArchives> ? "Memory" : "Zip";
  }
};
using Implementations = testing::Types<MemoryArchives, ZipArchives>;
TYPED_TEST_SUITE(ArchiveCopierContract, Implementations, ArchivesNames);

TYPED_TEST(ArchiveCopierContract, ExtractsEveryItemBelowTheDestination) {
  this->archives.archive({.items = {{"a", "one"}, {"sub/b", "two"}}});
  EXPECT_EQ(this->copy("archive", this->options), 0);
  EXPECT_EQ(this->archives.text("to/a"), "one");
  EXPECT_EQ(this->archives.text("to/sub/b"), "two");
}

TYPED_TEST(ArchiveCopierContract, LeavesAnItemOutWhenTheCallbackAnswersTwo) {
  this->archives.archive({.items = {{"a", "one"}, {"bad", "", 95}, {"b", "two"}}});
  this->count();
  EXPECT_EQ(this->copy("archive", this->options), 0);
  EXPECT_EQ(this->failed, "bad ");
  EXPECT_EQ(this->fatal, 0);
  EXPECT_EQ(this->archives.text("to/bad"), "(absent)");
  EXPECT_EQ(this->archives.text("to/b"), "two");
}

TYPED_TEST(ArchiveCopierContract, EndsWhenTheCallbackAnswersAnythingElse) {
  this->archives.archive({.items = {{"a", "one"}, {"bad", "", 95}, {"b", "two"}}});
  this->count();
  this->answer = 0;
  EXPECT_EQ(this->copy("archive", this->options), ECANCELED);
  EXPECT_EQ(this->fatal, 0);
  EXPECT_EQ(this->archives.text("to/a"), "one");
  EXPECT_EQ(this->archives.text("to/b"), "(absent)");
}

TYPED_TEST(ArchiveCopierContract, SignalsADamagedArchiveOnceAndKeepsWhatCameBefore) {
  this->archives.archive({.items = {{"a", "one"}}, .damaged = true});
  this->count();
  EXPECT_EQ(this->copy("archive", this->options), EBADMSG);
  EXPECT_EQ(this->fatal, 1);
  EXPECT_EQ(this->failed, "");
  EXPECT_EQ(this->archives.text("to/a"), "one");
}

TYPED_TEST(ArchiveCopierContract, AnswersForAMissingSourceWithoutACallback) {
  this->count();
  EXPECT_EQ(this->copy("none", this->options), ENOENT);
  EXPECT_EQ(this->failed, "");
  EXPECT_EQ(this->fatal, 0);
}

TYPED_TEST(ArchiveCopierContract, ExtractsNothingUnlessAPackageIsAskedFor) {
  this->archives.archive({.items = {{"a", "one"}}});
  EXPECT_EQ(this->copy("archive", {}), EINVAL);
  EXPECT_EQ(this->copy("archive", {{"extractPKZip", false}}), EINVAL);
  EXPECT_EQ(this->archives.text("to/a"), "(absent)");
}

TYPED_TEST(ArchiveCopierContract, NeedsNoCallbacks) {
  this->archives.archive({.items = {{"bad", "", 95}, {"b", "two"}}, .damaged = true});
  EXPECT_EQ(this->copy("archive", this->options), EBADMSG);
  EXPECT_EQ(this->archives.text("to/b"), "two");
}

}  // namespace
