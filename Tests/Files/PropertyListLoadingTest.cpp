// SPDX-License-Identifier: Apache-2.0
//
// CopyPropertyListFile over real ports, on real files.
#include <fcntl.h>
#include <sys/stat.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>

#include "Helper/Platform/PropertyList.h"
#include "Tests/Fakes/FakeTaskMemory.h"
#include "Tests/Support/ServerFixture.h"

namespace {

using platform::LogPriority;
using platform::PropertyList;
using support::Bytes;
using support::Get;
using Lines = std::vector<fakes::FakeSystemLog::Line>;

constexpr std::int32_t kId = 8683571;
constexpr char kEmptyDictionary[] =
    "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n<dict/>\n</plist>\n";

class PropertyListLoading : public support::ServerFixture {
 protected:
  void SetUp() override {
    std::string pattern = "/tmp/plist-loading-XXXXXX";
    ASSERT_NE(::mkdtemp(pattern.data()), nullptr);
    folder = pattern;
    start();
    client = connect();
  }
  void TearDown() override { std::filesystem::remove_all(folder); }

  std::string write(const std::string& content, const std::string& name = "file.plist") {
    std::ofstream(folder + "/" + name, std::ios::binary) << content;
    return folder + "/" + name;
  }
  Bytes load(const std::string& path) {
    Bytes bytes = support::Message(kId, 288);
    support::PutText(bytes, 32, path);
    return request(*client, bytes).bytes;
  }
  /// Expects answer 9, in a short reply, after the two lines.
  void expectNoDictionary(const std::string& path) {
    const Bytes reply = load(path);
    EXPECT_EQ(reply.size(), 36U) << path;
    EXPECT_EQ(Get<std::uint32_t>(reply, 0), 0U) << "no descriptor";
    EXPECT_EQ(Get<std::int32_t>(reply, 32), 9) << path;
    EXPECT_EQ(log.takeLines(),
              (Lines{{LogPriority::kInfo, "Loading " + path + " as plist"},
                     {LogPriority::kError, "Could not create data representation of dictionary"}}));
    EXPECT_EQ(memory.regions(), 0);
  }
  static Bytes withContent(const std::string& content) {
    return support::OutOfLineReply(kId, content);
  }

  fakes::FakeTaskMemory memory;
  platform::ScopedReplacement<platform::TaskMemory> memoryReplacement{memory};
  std::string folder;
  std::unique_ptr<support::WireClient> client;
};

TEST_F(PropertyListLoading, AnswersAnEmptyDictionaryAsXml) {
  const std::string path = write("<plist version=\"1.0\"><dict></dict></plist>");
  EXPECT_EQ(load(path), withContent(kEmptyDictionary));
  EXPECT_EQ(log.takeLines(), (Lines{{LogPriority::kInfo, "Loading " + path + " as plist"}}));
  EXPECT_EQ(memory.regions(), 0) << "the region leaves with the reply";
}

TEST_F(PropertyListLoading, AnswersABinaryFileAsXml) {
  PropertyList::Dictionary dictionary;
  dictionary.set("Key", "value");
  const auto binary = platform::SerializeBinary(PropertyList(dictionary));
  ASSERT_TRUE(binary);
  const std::string path =
      write(std::string(reinterpret_cast<const char*>(binary->data()), binary->size()));
  EXPECT_EQ(load(path),
            withContent("<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n"
                        "<dict>\n\t<key>Key</key>\n\t<string>value</string>\n</dict>\n</plist>\n"));
}

TEST_F(PropertyListLoading, OfAMissingFileAnswers9AfterTheLoadingLine) {
  expectNoDictionary(folder + "/missing.plist");
  expectNoDictionary("");
}

TEST_F(PropertyListLoading, OfWhatIsNoDictionaryAnswers9) {
  for (const char* content :
       {"", "rubbish", "<plist version=\"1.0\"><array/></plist>",
        "<plist version=\"1.0\"><string>text</string></plist>", "<plist version=\"1.0\"><dict>"}) {
    expectNoDictionary(write(content));
  }
}

TEST_F(PropertyListLoading, OfADictionaryThatXmlCannotCarryAnswers9) {
  PropertyList::Dictionary dictionary;
  dictionary.set("Key", PropertyList::Uid{1});
  const auto binary = platform::SerializeBinary(PropertyList(dictionary));
  ASSERT_TRUE(binary);
  expectNoDictionary(
      write(std::string(reinterpret_cast<const char*>(binary->data()), binary->size())));
}

TEST_F(PropertyListLoading, OfAPathThatIsNotAsciiAnswers9ThoughTheFileIsThere) {
  expectNoDictionary(write("<plist version=\"1.0\"><dict/></plist>", "Grüße.plist"));
  expectNoDictionary(folder + "/\xff");
}

TEST_F(PropertyListLoading, OfAnotherTypeOfFileAnswers9AtOnce) {
  ASSERT_EQ(::mkfifo((folder + "/fifo").c_str(), 0600), 0);
  expectNoDictionary(folder + "/fifo");
  expectNoDictionary(folder);
  expectNoDictionary("/dev/zero");
}

TEST_F(PropertyListLoading, FollowsALink) {
  const std::string path = write(kEmptyDictionary);
  std::filesystem::create_symlink(path, folder + "/link");
  EXPECT_EQ(load(folder + "/link"), withContent(kEmptyDictionary));
}

TEST_F(PropertyListLoading, OfMoreThan16MiBAnswers9) {
  const std::string path = write(kEmptyDictionary);
  std::filesystem::resize_file(path, (std::size_t{16} << 20) + 1);
  expectNoDictionary(path);
}

TEST_F(PropertyListLoading, AnswersTheAllocationsCodeAndLogsTheCount) {
  const std::string path = write(kEmptyDictionary);
  memory.runOut();
  const Bytes reply = load(path);
  EXPECT_EQ(reply.size(), 36U);
  EXPECT_EQ(Get<std::int32_t>(reply, 32), KERN_NO_SPACE);
  EXPECT_EQ(log.takeLines(),
            (Lines{{LogPriority::kInfo, "Loading " + path + " as plist"},
                   {LogPriority::kError, "Could not allocate " +
                                             std::to_string(sizeof kEmptyDictionary - 1) +
                                             " bytes for payload"}}));
}

TEST_F(PropertyListLoading, ReadsAFieldWithoutItsZeroAs255Bytes) {
  std::string path = folder;
  while (path.size() + 2 <= 255) path += "/.";
  path.resize(253, '/');
  path += "/f";
  ASSERT_EQ(path.size(), 255U);
  write(kEmptyDictionary, "f");
  EXPECT_EQ(load(path + "x"), withContent(kEmptyDictionary));
  EXPECT_EQ(log.takeLines(), (Lines{{LogPriority::kInfo, "Loading " + path + " as plist"}}));
}

}  // namespace
