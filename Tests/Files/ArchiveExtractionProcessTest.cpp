// SPDX-License-Identifier: Apache-2.0
//
// The real helper as root in the handset, with the library that reads archives: whose the items
// are, on which file systems, what is logged.
#include "Tests/Files/ArchiveForTest.h"
#include "Tests/Process/ProcessSuite.h"

namespace process_tests {
namespace {

class ExtractArchive : public ProcessSuite {
 protected:
  /// Makes an archive that the handset sees as /mnt/a.zip.
  void archive(const std::string& script) {
    ASSERT_TRUE(files_test::MakeZip(folder.path() + "/a.zip", script));
  }
  Outcome extract(const std::string& script, std::vector<std::string> options = {}) {
    options.insert(options.end(), {"--bind", folder.path() + ":/mnt"});
    return run(script, options);
  }
  handset_tests::TemporaryFolder folder;
};

constexpr char kPackage[] =
    "folder('x.bundle', 0o750)\nfile('x.bundle/carrier.plist', b'text', 0o4640)\n"
    "link('x.bundle/link', 'carrier.plist')\nfile('x.bundle/\\u00e9')\n"
    "file('extras/x.bundle/._carrier.plist', sidecar({'label': b'red'}, b'', b'fork'))\n"
    "file('../up')\n";
constexpr char kList[] =
    "find . -mindepth 1 -printf '%P %y %m %u:%g\\n' | LC_ALL=C sort\n"
    "python3 -c \"import os; f = 'x.bundle/carrier.plist'; "
    "print([(n, os.getxattr(f, n)) for n in sorted(os.listxattr(f))])\"\n";
constexpr char kExpected[] =
    "x.bundle d 750 root:root\nx.bundle/carrier.plist f 640 root:root\n"
    "x.bundle/link l 777 root:root\nx.bundle/\xc3\xa9 f 644 root:root\n"
    "[('user.label', b'red'), ('user.resource-data', b'fork')]\n";
constexpr char kLog[] = "handset log --json | grep -o '\"priority\":[0-9].*\"pid\"'\n";

TEST_F(ExtractArchive, IntoMemoryGivesEverythingToRootAndLogsNothing) {
  archive(kPackage);
  const Outcome outcome =
      extract("halvecctl bundle extract /mnt/a.zip /tmp/new/to; echo $?; cd /tmp/new/to\n" +
              std::string(kList) + kLog);
  EXPECT_EQ(outcome.output, std::string("0\n") + kExpected) << outcome.errors;
}

TEST_F(ExtractArchive, OntoTheDiskOfTheHostAndBehindALinkIsTheSame) {
  archive(kPackage);
  const handset_tests::TemporaryFolder state;
  const Outcome outcome = extract(
      "halvecctl bundle extract /mnt/a.zip /private/var/mobile/to; echo $?; cd /var/mobile/to\n" +
          std::string(kList),
      {"--state", state.path()});
  EXPECT_EQ(outcome.output, std::string("0\n") + kExpected) << outcome.errors;
}

TEST_F(ExtractArchive, ThatIsDamagedLogsOneErrorAndAnswersFalse) {
  archive("file('a')\nfile('bad', bytes(9999))\npatches[b'\\xed\\xc1'] = b'\\xff\\xff'");
  const Outcome outcome =
      extract("halvecctl call ExtractArchive /mnt/a.zip /tmp/to | grep success; ls /tmp/to\n" +
              std::string(kLog));
  EXPECT_EQ(outcome.output,
            "success: false\na\n\"priority\":3,\"identifier\":\"HalvecMobileHelper\","
            "\"text\":\"ArchiveCopier signaled fatal file error\",\"pid\"\n")
      << outcome.errors;
}

TEST_F(ExtractArchive, LeavesOutWhatLiesBelowTooManyFoldersAndMakesNone) {
  archive("file('d/' * 4000 + 'x')\nfile('good')");
  const Outcome outcome =
      extract("halvecctl bundle extract /mnt/a.zip /tmp/to; echo $?; ls -R /tmp/to");
  EXPECT_EQ(outcome.output, "0\n/tmp/to:\ngood\n") << outcome.errors;
}

TEST_F(ExtractArchive, ThatCannotBeReadAnswersFalseWithoutALogLineAndTheHelperServesOn) {
  const Outcome outcome = extract(
      "mkfifo /tmp/fifo\n"
      "for source in /tmp/fifo /none /tmp /dev/zero; do\n"
      "  halvecctl call ExtractArchive $source /tmp/to | grep success; done\n"
      "ls -d /tmp/to 2>/dev/null; client connect\n" +
      std::string(kLog));
  EXPECT_EQ(outcome.output, "success: false\nsuccess: false\nsuccess: false\nsuccess: false\n0\n")
      << outcome.errors;
}

TEST_F(ExtractArchive, OpensTheLibraryOnlyWhenItIsNeeded) {
  archive("file('a')");
  const Outcome outcome = extract(
      "client connect; pid=$(handset wait-start)\n"
      "grep -c libarchive /proc/$pid/maps\n"
      "halvecctl bundle extract /mnt/a.zip /tmp/to; grep -q libarchive /proc/$pid/maps; echo $?\n"
      "ls -l /proc/$pid/fd | grep -cE 'a.zip|/tmp'");
  EXPECT_EQ(outcome.output, "0\n0\n0\n0\n") << outcome.errors;
}

}  // namespace
}  // namespace process_tests
