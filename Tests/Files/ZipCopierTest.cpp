// SPDX-License-Identifier: Apache-2.0
//
// What the copier makes of the archives that people make.
#include <sys/time.h>

#include <cerrno>
#include <clocale>
#include <fstream>

#include "Tests/Files/ExtractionForTest.h"

namespace {

using files_test::RunTool;
using Paths = std::set<std::string>;

using ZipCopier = files_test::ExtractionForTest;

TEST_F(ZipCopier, ExtractsFilesFoldersAndLinksWithTheirPermissions) {
  EXPECT_EQ(extractZip("folder('sub', 0o750)\nfile('sub/a', b'text', 0o640)\n"
                       "file('run', b'#!', 0o755)\nlink('sub/l', '../run')\nfile('new/b')"),
            0);
  EXPECT_EQ(errors, Errors{});
  EXPECT_EQ(extracted(), (Paths{"sub", "sub/a", "sub/l", "run", "new", "new/b"}));
  EXPECT_EQ(folder.text("to/sub/a"), "text");
  EXPECT_EQ(folder.text("to/sub/l"), "#!");
  EXPECT_EQ(folder.permissions("to/sub"), 0750U);
  EXPECT_EQ(folder.permissions("to/sub/a"), 0640U);
  EXPECT_EQ(folder.permissions("to/run"), 0755U);
  EXPECT_EQ(folder.permissions("to/new"), 0755U);
  EXPECT_EQ(folder.permissions("to"), 0755U);
  EXPECT_EQ(folder.status("to/sub/a").st_uid, ::geteuid());
}

/// What the system's own archivers make of a folder comes back as it was.
class Archivers : public ZipCopier {
 protected:
  void SetUp() override {
    folder.folder("from");
    folder.folder("from/sub");
    folder.file("from/sub/a", "text");
    folder.file("from/large", std::string(3 << 20, 'x') + "end");
    folder.file("from/empty", "");
    folder.link("from/link", "sub/a");
    folder.file("from/na\xc3\xafve", "name");
    ::chmod(folder.at("from/sub/a").c_str(), 0604);
    const timeval file[2] = {{1'500'000'000, 0}, {1'600'000'001, 0}};
    ::utimes(folder.at("from/sub/a").c_str(), file);
    ::utimes(folder.at("from/sub").c_str(), file);
    ::chmod(folder.at("from/sub").c_str(), 0555);
  }
  void expectTheSame() {
    EXPECT_EQ(extract(folder.at("a.zip"), folder.at("to")), 0);
    EXPECT_EQ(errors, Errors{});
    EXPECT_EQ(extracted(), (Paths{"sub", "sub/a", "large", "empty", "link", "na\xc3\xafve"}));
    EXPECT_EQ(folder.text("to/sub/a"), "text");
    EXPECT_EQ(folder.text("to/large"), std::string(3 << 20, 'x') + "end");
    EXPECT_EQ(folder.text("to/empty"), "");
    EXPECT_EQ(folder.text("to/na\xc3\xafve"), "name");
    EXPECT_EQ(std::filesystem::read_symlink(folder.at("to/link")), "sub/a");
    EXPECT_EQ(folder.permissions("to/sub/a"), 0604U);
    EXPECT_EQ(folder.permissions("to/sub"), 0555U);
    EXPECT_EQ(folder.status("to/sub/a").st_mtim.tv_sec, 1'600'000'001);
    EXPECT_EQ(folder.status("to/sub").st_mtim.tv_sec, 1'600'000'001);
  }
};

TEST_F(Archivers, ZipIsReadBackWhole) {
  const std::string line = "cd " + folder.at("from") + " && zip -qry ../a.zip .";
  if (!RunTool({"sh", "-c", "command -v zip >/dev/null"})) GTEST_SKIP() << "zip is not installed";
  ASSERT_TRUE(RunTool({"sh", "-c", line}));
  expectTheSame();
}

TEST_F(Archivers, BsdtarIsReadBackWhole) {
  if (!RunTool({"sh", "-c", "command -v bsdtar >/dev/null"})) {
    GTEST_SKIP() << "bsdtar is not installed";
  }
  ASSERT_TRUE(RunTool({"sh", "-c",
                       "LC_ALL=C.UTF-8 bsdtar --format zip -C " + folder.at("from") + " -cf " +
                           folder.at("a.zip") + " ."}));
  expectTheSame();
}

TEST_F(ZipCopier, DecodesUtf8NamesInAnyLocaleOfTheProcess) {
  ASSERT_STREQ(std::setlocale(LC_CTYPE, nullptr), "C");
  EXPECT_EQ(extractZip("file('\\u00e9/\\u65e5\\u672c')\nlink('l', '\\u00e9')"), 0);
  EXPECT_EQ(errors, Errors{});
  EXPECT_EQ(extracted(), (Paths{"\xc3\xa9", "\xc3\xa9/\xe6\x97\xa5\xe6\x9c\xac", "l"}));
}

TEST_F(ZipCopier, KeepsTheBytesOfNamesThatAreNotUtf8) {
  EXPECT_EQ(extractZip("file('caf#')\npatches[b'caf#'] = b'caf\\xe9'"), 0);
  EXPECT_EQ(extracted(), Paths{"caf\xe9"});
}

TEST_F(ZipCopier, FindsAnArchiveBehindAProgram) {
  ASSERT_TRUE(files_test::MakeZip(folder.at("plain.zip"), "file('a')"));
  folder.file("a.zip", "#!/bin/sh\nexit\n" + folder.text("plain.zip"));
  EXPECT_EQ(extract(folder.at("a.zip"), folder.at("to")), 0);
  EXPECT_EQ(folder.text("to/a"), "text");
}

TEST_F(ZipCopier, ReadsStoredItemsAndLargeArchivesForm) {
  EXPECT_EQ(extractZip("i = zipfile.ZipInfo('stored'); z.writestr(i, b'bytes')\n"
                       "with z.open('large', 'w', force_zip64=True) as f: f.write(b'text')"),
            0);
  EXPECT_EQ(folder.text("to/stored"), "bytes");
  EXPECT_EQ(folder.text("to/large"), "text");
}

TEST_F(ZipCopier, MakesTheDestinationOfAnEmptyArchive) {
  EXPECT_EQ(extractZip("pass"), 0);
  EXPECT_EQ(folder.permissions("to"), 0755U);
  EXPECT_EQ(extracted(), Paths{});
}

TEST_F(ZipCopier, MakesADestinationWithTheFoldersAboveItAndFollowsLinksInItsPath) {
  folder.folder("real");
  folder.link("link", "real");
  ASSERT_TRUE(files_test::MakeZip(folder.at("a.zip"), "file('a')\nfile('sub/b')"));
  EXPECT_EQ(extract(folder.at("a.zip"), folder.at("link/x/y")), 0);
  EXPECT_EQ(extract(folder.at("a.zip"), folder.at("link")), 0);
  EXPECT_EQ(folder.text("real/x/y/sub/b"), "text");
  EXPECT_EQ(folder.text("real/a"), "text");
  EXPECT_EQ(folder.permissions("real/x"), 0755U);
}

TEST_F(ZipCopier, MergesIntoWhatIsThere) {
  folder.folder("to");
  folder.folder("to/sub");
  ::chmod(folder.at("to/sub").c_str(), 0711);
  folder.file("to/sub/old", "old");
  folder.file("to/sub/a", "old");
  folder.file("outside", "theirs");
  folder.link("to/b", folder.at("outside"));
  folder.folder("to/c");
  EXPECT_EQ(extractZip("folder('sub', 0o755)\nfile('sub/a', b'new')\nfile('b', b'new')\nfile('c')"),
            0);
  EXPECT_EQ(errors, (Errors{{"c", EISDIR}}));
  EXPECT_EQ(folder.text("to/sub/old"), "old");
  EXPECT_EQ(folder.text("to/sub/a"), "new");
  EXPECT_EQ(folder.text("to/b"), "new");
  EXPECT_EQ(folder.text("outside"), "theirs");
  EXPECT_EQ(folder.permissions("to/sub"), 0711U);
}

TEST_F(ZipCopier, LetsTheLastOfTwoItemsOfOneNameStand) {
  EXPECT_EQ(extractZip("file('a', b'first')\nfile('a', b'second')\nfile('./a', b'third')\n"
                       "file('b')\nfolder('b')\nfile('c/d')\nfile('c')"),
            0);
  EXPECT_EQ(folder.text("to/a"), "third");
  EXPECT_EQ(errors, (Errors{{"c", EISDIR}}));
  EXPECT_EQ(extracted(), (Paths{"a", "b", "c", "c/d"}));
  EXPECT_TRUE(S_ISDIR(folder.status("to/b").st_mode));
}

TEST_F(ZipCopier, GivesWhatTheArchiveHasNoPermissionsForTheUsualOnes) {
  EXPECT_EQ(extractZip("file('a', b'', 0o123)\nfolder('sub', 0o123)\n"
                       "patches[b'\\0\\0\\x53\\x80'] = b'\\0\\0\\0\\x80'\n"
                       "patches[b'\\0\\0\\x53\\x40'] = b'\\0\\0\\0\\x40'"),
            0);
  EXPECT_EQ(folder.permissions("to/a"), 0644U);
  EXPECT_EQ(folder.permissions("to/sub"), 0755U);
}

TEST_F(ZipCopier, ExtractsSixtyThousandItems) {
  EXPECT_EQ(extractZip("for i in range(60000): z.writestr(f'{i % 100}/{i}', b'')"), 0);
  EXPECT_EQ(errors, Errors{});
  EXPECT_EQ(extracted().size(), 60'100U);
}

}  // namespace
