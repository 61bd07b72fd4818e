// SPDX-License-Identifier: Apache-2.0
//
// Archives that are damaged, too large, or made to do harm, and sources that are no archives.
#include <cerrno>
#include <cstring>

#include "Tests/Files/ExtractionForTest.h"
#include "Tests/Files/SmallFileSystem.h"

namespace {

using Paths = std::set<std::string>;

using HostileZip = files_test::ExtractionForTest;

TEST_F(HostileZip, LeavesOutWhatWouldLeadOutOfTheDestination) {
  EXPECT_EQ(extractZip("file('../up')\nfile('a/../../up')\nfile('" + folder.at("up") +
                       "')\nfile('//up')\nfile('..')\nfile('good')"),
            0);
  EXPECT_EQ(errors, (Errors{{"../up", EINVAL},
                            {"a/../../up", EINVAL},
                            {folder.at("up"), EINVAL},
                            {"//up", EINVAL},
                            {"..", EINVAL}}));
  EXPECT_EQ(extracted(), Paths{"good"});
  EXPECT_EQ(folder.names(), (Paths{"a.zip", "to"}));
}

TEST_F(HostileZip, LeavesOutNamesThatLeadOutByBackslashes) {
  // Of an archive that says it comes from a system where backslashes separate.
  EXPECT_EQ(extractZip("i = zipfile.ZipInfo('..#up'); i.create_system = 0; z.writestr(i, b'x')\n"
                       "patches[b'..#up'] = b'..\\\\up'"),
            0);
  EXPECT_EQ(errors, (Errors{{"../up", EINVAL}}));
  EXPECT_EQ(extracted(), Paths{});
}

TEST_F(HostileZip, FollowsNoLinkThatItBroughtItself) {
  folder.folder("outside");
  EXPECT_EQ(extractZip("link('out', '../outside')\nfile('out/a')\n"
                       "link('here', '.')\nfile('here/b')\nlink('here/c', 'd')\n"
                       "link('one', 'two')\nlink('two', '../outside')\nfile('one/e')\n"
                       "folder('out/f')\nlink('loop', 'loop')\nfile('loop/g')"),
            0);
  EXPECT_EQ(errors, (Errors{{"out/a", ELOOP},
                            {"here/b", ELOOP},
                            {"here/c", ELOOP},
                            {"one/e", ELOOP},
                            {"out/f/", ELOOP},
                            {"loop/g", ELOOP}}));
  EXPECT_EQ(extracted(), (Paths{"out", "here", "one", "two", "loop"}));
  EXPECT_TRUE(std::filesystem::is_empty(folder.at("outside")));
}

TEST_F(HostileZip, ReplacesALinkThatItBroughtByAFileOfItsName) {
  folder.file("outside", "theirs");
  EXPECT_EQ(extractZip("link('a', '../outside')\nfile('a', b'ours')"), 0);
  EXPECT_EQ(folder.text("to/a"), "ours");
  EXPECT_EQ(folder.text("outside"), "theirs");
}

TEST_F(HostileZip, FollowsNoLinkThatWasThereBelowTheDestination) {
  folder.folder("outside");
  folder.folder("to");
  folder.link("to/sub", folder.at("outside"));
  EXPECT_EQ(extractZip("file('sub/a')\nfile('b')"), 0);
  EXPECT_EQ(errors, (Errors{{"sub/a", ELOOP}}));
  EXPECT_TRUE(std::filesystem::is_empty(folder.at("outside")));
  EXPECT_EQ(folder.text("to/b"), "text");
}

TEST_F(HostileZip, GivesNobodyAnotherUsersRights) {
  EXPECT_EQ(extractZip("file('a', b'', 0o6755)\nfolder('sub', 0o7777)"), 0);
  EXPECT_EQ(folder.permissions("to/a"), 0755U);
  EXPECT_EQ(folder.permissions("to/sub"), 0777U);
}

TEST_F(HostileZip, MakesNoDevicesFifosAndSockets) {
  EXPECT_EQ(extractZip("item('char', 0o020666)\nitem('block', 0o060666)\n"
                       "item('fifo', 0o010666, b'text')\nitem('socket', 0o140666)\nfile('good')"),
            0);
  EXPECT_EQ(errors, (Errors{{"char", EOPNOTSUPP}, {"block", EOPNOTSUPP}, {"socket", EOPNOTSUPP}}));
  EXPECT_EQ(extracted(), (Paths{"fifo", "good"}));
  EXPECT_TRUE(S_ISREG(folder.status("to/fifo").st_mode)) << "its bytes, which the library reads";
}

TEST_F(HostileZip, LeavesOutANameThatIsTooLong) {
  EXPECT_EQ(
      extractZip("file('n' * 300)\nfile('d/' * 3000 + 'x')\nfile('e/' * 200 + 'x')\n"
                 "folder('f/' * 200 + 'x')\nfile(('m' * 100 + '/') * 41 + 'x')\nfile('good')"),
      0);
  EXPECT_EQ(errors.size(), 5U);
  for (const auto& [name, error] : errors) EXPECT_EQ(error, ENAMETOOLONG) << name;
  EXPECT_EQ(extracted(), Paths{"good"});
}

TEST_F(HostileZip, LeavesOutAFileWhoseChecksumIsWrong) {
  EXPECT_EQ(extractZip("z.writestr('bad', b'original'); file('good')\n"
                       "patches[b'original'] = b'changed!'"),
            0);
  EXPECT_EQ(errors, (Errors{{"bad", EBADMSG}}));
  EXPECT_EQ(extracted(), Paths{"good"});
  EXPECT_EQ(fatal, 0);
}

TEST_F(HostileZip, LeavesTheOldFileWhereTheNewOneIsDamaged) {
  folder.folder("to");
  folder.file("to/bad", "old");
  EXPECT_EQ(extractZip("z.writestr('bad', b'original')\npatches[b'original'] = b'changed!'"), 0);
  EXPECT_EQ(folder.text("to/bad"), "old");
}

TEST_F(HostileZip, LeavesOutWhatIsEncrypted) {
  if (!files_test::RunTool({"sh", "-c", "command -v zip >/dev/null"})) {
    GTEST_SKIP() << "zip is not installed";
  }
  folder.file("secret", "secret");
  folder.file("plain", "plain");
  ASSERT_TRUE(files_test::RunTool({"sh", "-c",
                                   "cd " + folder.at("") +
                                       " && zip -qP word a.zip secret && "
                                       "zip -q a.zip plain"}));
  EXPECT_EQ(extract(folder.at("a.zip"), folder.at("to")), 0);
  EXPECT_EQ(errors, (Errors{{"secret", EBADMSG}}));
  EXPECT_EQ(extracted(), Paths{"plain"});
}

TEST_F(HostileZip, LeavesOutWhatIsCompressedInAnUnknownWay) {
  EXPECT_EQ(extractZip("file('a')\npatches[b'\\x14\\0\\0\\0\\x08\\0'] = b'\\x14\\0\\0\\0\\x63\\0'"),
            0);
  EXPECT_EQ(errors, (Errors{{"a", EBADMSG}}));
  EXPECT_EQ(extracted(), Paths{});
}

TEST_F(HostileZip, EndsWithADamagedStreamAndKeepsWhatCameBefore) {
  EXPECT_EQ(extractZip("file('a')\nfile('bad', bytes(9999))\nfile('b')\n"
                       "patches[b'\\xed\\xc1'] = b'\\xff\\xff'"),
            EBADMSG);
  EXPECT_EQ(fatal, 1);
  EXPECT_EQ(extracted(), Paths{"a"});
}

TEST_F(HostileZip, ExtractsNothingOfAnArchiveThatWasCutOff) {
  ASSERT_TRUE(files_test::MakeZip(folder.at("a.zip"), "file('a')\nfile('b')"));
  const auto size = std::filesystem::file_size(folder.at("a.zip"));
  for (const std::uintmax_t length : {size - 1, size / 2, std::uintmax_t{40}, std::uintmax_t{0}}) {
    std::filesystem::resize_file(folder.at("a.zip"), length);
    EXPECT_EQ(extract(folder.at("a.zip"), folder.at("to")), EBADMSG) << length;
    EXPECT_EQ(fatal, 1) << length;
  }
  EXPECT_EQ(folder.names(), Paths{"a.zip"}) << "not even the destination";
}

TEST_F(HostileZip, IsNoMatterOfItsName) {
  folder.file("a.zip", "This is no archive, whatever its name says.\n");
  EXPECT_EQ(extract(folder.at("a.zip"), folder.at("to")), EBADMSG);
  EXPECT_EQ(fatal, 1);
  EXPECT_EQ(folder.names(), Paths{"a.zip"});
}

TEST_F(HostileZip, IsReadAsNoOtherFormat) {
  folder.file("a", "text");
  ASSERT_TRUE(files_test::RunTool(
      {"sh", "-c", "cd " + folder.at("") + " && tar -cf a.tar a && gzip -k a.tar"}));
  for (const char* name : {"a.tar", "a.tar.gz"}) {
    EXPECT_EQ(extract(folder.at(name), folder.at("to")), EBADMSG) << name;
  }
  EXPECT_EQ(extracted(), Paths{});
}

TEST_F(HostileZip, CannotBeAnythingButAFile) {
  folder.fifo("fifo");
  EXPECT_EQ(extract(folder.at("fifo"), folder.at("to")), EOPNOTSUPP);
  EXPECT_EQ(extract("/dev/zero", folder.at("to")), EOPNOTSUPP);
  EXPECT_EQ(extract(folder.at(""), folder.at("to")), EOPNOTSUPP);
  EXPECT_EQ(extract(folder.at("none"), folder.at("to")), ENOENT);
  EXPECT_EQ(extract("", folder.at("to")), ENOENT);
  EXPECT_EQ(fatal, 0);
  EXPECT_EQ(folder.names(), Paths{"fifo"});
}

TEST_F(HostileZip, HasNowhereToGoWhereTheDestinationIsNoFolder) {
  ASSERT_TRUE(files_test::MakeZip(folder.at("a.zip"), "file('a')"));
  folder.file("file", "text");
  EXPECT_EQ(extract(folder.at("a.zip"), folder.at("file")), EEXIST);
  EXPECT_EQ(extract(folder.at("a.zip"), folder.at("file/sub")), EEXIST);
  EXPECT_EQ(extract(folder.at("a.zip"), ""), ENOENT);
  EXPECT_EQ(fatal, 0);
  EXPECT_EQ(folder.text("file"), "text");
}

TEST_F(HostileZip, EndsWhereItsContentIsTooLarge) {
  limits.bytes = 1'000'000;
  EXPECT_EQ(extractZip("file('a', bytes(600000))\nfile('b', bytes(600000))\nfile('c')"), EFBIG);
  EXPECT_EQ(fatal, 1);
  EXPECT_EQ(extracted(), Paths{"a"});
}

TEST_F(HostileZip, EndsWhereItIsSmallBesideItsContent) {
  // 8 MiB of zeros are 8 KiB of archive.
  limits.bytesOfAnyRatio = 1 << 20;
  EXPECT_EQ(extractZip("file('bomb', bytes(8 << 20))"), EFBIG);
  EXPECT_EQ(fatal, 1);
  EXPECT_EQ(extracted(), Paths{});
  limits.bytesOfAnyRatio = 16 << 20;
  EXPECT_EQ(extractZip("file('bomb', bytes(8 << 20))"), 0);
}

TEST_F(HostileZip, EndsAtTheDefaultRatioOfOneGigabyteInOneMegabyte) {
  ASSERT_TRUE(files_test::MakeZip(folder.at("a.zip"),
                                  "with z.open(zipfile.ZipInfo('bomb'), 'w') as f: pass\n"
                                  "i = zipfile.ZipInfo('big'); i.compress_type = 8\n"
                                  "with z.open(i, 'w') as f:\n"
                                  "  for _ in range(1024): f.write(bytes(1 << 20))"));
  EXPECT_EQ(extract(folder.at("a.zip"), folder.at("to")), EFBIG);
  EXPECT_EQ(extracted(), Paths{"bomb"});
}

TEST_F(HostileZip, EndsWhereItHasTooManyItems) {
  limits.items = 3;
  EXPECT_EQ(extractZip("for name in 'abcd': file(name)"), EFBIG);
  EXPECT_EQ(fatal, 1);
  EXPECT_EQ(extracted(), (Paths{"a", "b", "c"}));
}

TEST_F(HostileZip, EndsWhereItMakesTooManyFoldersWithoutNamingThem) {
  limits.items = 100;
  EXPECT_EQ(extractZip("for i in range(9): file(f'{i}/' + 'd/' * 90 + 'f')"), EFBIG);
  EXPECT_EQ(fatal, 1);
  EXPECT_LT(extracted().size(), 200U);
}

TEST_F(HostileZip, EndsWhereItsDirectoryIsTooLong) {
  limits.directoryBytes = 1 << 20;
  EXPECT_EQ(extractZip("for i in range(20000): z.writestr(f'item number {i}', b'')"), EBADMSG);
  EXPECT_EQ(fatal, 1);
  EXPECT_EQ(extracted(), Paths{});
}

TEST_F(HostileZip, LeavesNoHalfFileOnAFullDisk) {
  folder.folder("to");
  const files_test::SmallFileSystem small(folder.at("to"));
  if (!small) GTEST_SKIP() << "no file system can be mounted here: " << std::strerror(errno);
  EXPECT_EQ(extractZip("file('a')\nfile('large', bytes(1 << 20))\nfile('b')"), ENOSPC);
  EXPECT_EQ(fatal, 1);
  EXPECT_EQ(extracted(), Paths{"a"});
}

TEST_F(HostileZip, LosesNothingByAZeroInAName) {
  EXPECT_EQ(extractZip("file('good#name')\npatches[b'good#name'] = b'good\\0name'"), 0);
  EXPECT_EQ(extracted(), Paths{"good"}) << "the name ends there";
}

}  // namespace
