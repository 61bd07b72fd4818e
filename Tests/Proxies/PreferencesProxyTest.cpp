// SPDX-License-Identifier: Apache-2.0
//
// The preferences proxy over real ports, on a fake store.
#include "Tests/Fakes/FakePreferencesStore.h"
#include "Tests/Fakes/FakeTaskMemory.h"
#include "Tests/Support/ServerFixture.h"

namespace {

using platform::LogPriority;
using platform::PropertyList;
using support::Bytes;
using support::Get;
using Lines = std::vector<fakes::FakeSystemLog::Line>;

constexpr std::int32_t kCopy = 8683556;
constexpr std::int32_t kCopyApp = 8683557;
constexpr char kXml[] =
    "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n"
    "<string>value</string>\n</plist>\n";

class PreferencesProxy : public support::ServerFixture {
 protected:
  void SetUp() override {
    start();
    client = connect();
  }
  std::int32_t set(const std::string& value, const std::string& domain = "domain",
                   const std::string& key = "key") {
    return Get<std::int32_t>(
        request(*client, support::SetPreferenceRequest(domain, key, value)).bytes, 32);
  }
  Bytes copy(std::int32_t id, const std::string& domain = "domain",
             const std::string& key = "key") {
    Bytes bytes = support::Message(id, 544);
    support::PutText(bytes, 32, domain);
    support::PutText(bytes, 288, key);
    return request(*client, bytes).bytes;
  }
  std::optional<PropertyList> stored() { return store.copyValue("key", {.identifier = "domain"}); }

  std::shared_ptr<fakes::FakePreferencesStore::Storage> storage =
      std::make_shared<fakes::FakePreferencesStore::Storage>();
  fakes::FakePreferencesStore store{storage};
  platform::ScopedReplacement<platform::PreferencesStore> storeReplacement{store};
  fakes::FakeTaskMemory memory;
  platform::ScopedReplacement<platform::TaskMemory> memoryReplacement{memory};
  std::unique_ptr<support::WireClient> client;
};

TEST_F(PreferencesProxy, SetStoresTheValueForTheCurrentUserAndAnyHost) {
  EXPECT_EQ(set("<plist version=\"1.0\"><integer>7</integer></plist>"), 0);
  EXPECT_EQ(stored(), PropertyList(7));
  EXPECT_FALSE(
      store.copyValue("key", {.identifier = "domain", .user = platform::UserScope::kAnyUser}));
  EXPECT_TRUE(log.takeLines().empty());
}

TEST_F(PreferencesProxy, SetTakesTheBinaryForm) {
  const auto binary = platform::SerializeBinary(PropertyList("value"));
  ASSERT_TRUE(binary);
  EXPECT_EQ(set(std::string(reinterpret_cast<const char*>(binary->data()), binary->size())), 0);
  EXPECT_EQ(stored(), PropertyList("value"));
}

TEST_F(PreferencesProxy, SetOfOneByteRemovesTheKeyWhateverTheByte) {
  for (const char byte : {'\0', 'x', '<', '\xff'}) {
    ASSERT_EQ(set(kXml), 0);
    ASSERT_TRUE(stored());
    EXPECT_EQ(set(std::string(1, byte)), 0);
    EXPECT_FALSE(stored());
  }
}

TEST_F(PreferencesProxy, SetOfTwoBytesThatAreNoPropertyListAnswers5AndLeavesTheStoredValueAlone) {
  ASSERT_EQ(set(kXml), 0);
  EXPECT_EQ(set("xy"), 5);
  EXPECT_EQ(stored(), PropertyList("value"));
}

TEST_F(PreferencesProxy, SetOfNoBytesAnswers5) { EXPECT_EQ(set(""), 5); }

TEST_F(PreferencesProxy, SetWithADomainOrKeyThatIsNotUtf8Answers5) {
  EXPECT_EQ(set(kXml, "\xff"), 5);
  EXPECT_EQ(set(kXml, "domain", "\xc0\x80"), 5);
  EXPECT_EQ(set("x", "\xff"), 5) << "also when it means a removal";
}

TEST_F(PreferencesProxy, ReadsATextWithoutItsZeroUpToItsLastByteButOne) {
  EXPECT_EQ(set(kXml, std::string(256, 'd'), std::string(256, 'k')), 0);
  EXPECT_TRUE(store.copyValue(std::string(255, 'k'), {.identifier = std::string(255, 'd')}));
}

TEST_F(PreferencesProxy, CopyAnswersTheXmlFormAndLogsTheAllocation) {
  ASSERT_EQ(set(kXml), 0);
  EXPECT_EQ(copy(kCopy), support::OutOfLineReply(kCopy, kXml));
  EXPECT_EQ(log.takeLines(), (Lines{{LogPriority::kError, "VM_ALLOCATE 93l (mhs1)\n"}}));
  EXPECT_EQ(memory.regions(), 0) << "the region leaves with the reply";
}

TEST_F(PreferencesProxy, AppCopySearchesTheUsualScopesAndLogsItsOwnLine) {
  store.setValue("key", PropertyList("value"),
                 {.identifier = "domain", .user = platform::UserScope::kAnyUser});
  EXPECT_EQ(copy(kCopy), support::OutOfLineReply(kCopy, ""));
  EXPECT_EQ(copy(kCopyApp), support::OutOfLineReply(kCopyApp, kXml));
  EXPECT_EQ(log.takeLines(), (Lines{{LogPriority::kError, "VM_ALLOCATE 93l (mhs2)\n"}}));
  EXPECT_EQ(memory.regions(), 0);
}

TEST_F(PreferencesProxy, CopySynchronizesFirstAndSoShowsWhatAnotherProcessStored) {
  fakes::FakePreferencesStore other(storage);
  const auto storeElsewhere = [&](std::optional<PropertyList> value) {
    other.setValue("key", std::move(value), {.identifier = "domain"});
    ASSERT_TRUE(other.synchronize({.identifier = "domain"}));
  };
  for (const std::int32_t id : {kCopy, kCopyApp}) {
    ASSERT_EQ(copy(id), support::OutOfLineReply(id, ""));
    storeElsewhere("value");
    EXPECT_EQ(copy(id), support::OutOfLineReply(id, kXml));
    storeElsewhere(std::nullopt);
    EXPECT_EQ(copy(id), support::OutOfLineReply(id, ""));
  }
}

TEST_F(PreferencesProxy, SynchronizesTheDomainOnceInEachOfItsRequests) {
  using Domains = std::vector<fakes::FakePreferencesStore::Domain>;
  using enum platform::UserScope;
  using enum platform::HostScope;
  const Domains plain{{"domain", kCurrentUser, kAnyHost}};
  ASSERT_EQ(set(kXml), 0);
  EXPECT_EQ(store.takeSynchronized(), plain);
  (void)copy(kCopy);
  EXPECT_EQ(store.takeSynchronized(), plain);
  (void)copy(kCopyApp);
  EXPECT_EQ(store.takeSynchronized(), (Domains{{"domain", kCurrentUser, kCurrentHost},
                                               {"domain", kCurrentUser, kAnyHost},
                                               {"domain", kAnyUser, kCurrentHost},
                                               {"domain", kAnyUser, kAnyHost}}));
  (void)set("xy");
  EXPECT_TRUE(store.takeSynchronized().empty()) << "nothing was stored";
}

TEST_F(PreferencesProxy, SetAnswersZeroAlsoWhenTheStoreCannotWrite) {
  store.setWritable(false);
  EXPECT_EQ(set(kXml), 0);
}

TEST_F(PreferencesProxy, CopyOfAMissingKeyAnswersZeroWithAnEmptyDescriptor) {
  EXPECT_EQ(copy(kCopy), support::OutOfLineReply(kCopy, ""));
  EXPECT_EQ(copy(kCopyApp), support::OutOfLineReply(kCopyApp, ""));
  EXPECT_TRUE(log.takeLines().empty());
}

TEST_F(PreferencesProxy, CopyWithADomainOrKeyThatIsNotUtf8Answers5InAShortReply) {
  for (const std::int32_t id : {kCopy, kCopyApp}) {
    for (const Bytes& reply : {copy(id, "\xff"), copy(id, "domain", "\xff")}) {
      EXPECT_EQ(reply.size(), 36U);
      EXPECT_EQ(Get<std::uint32_t>(reply, 0), 0U) << "no descriptor";
      EXPECT_EQ(Get<std::int32_t>(reply, 32), 5);
    }
  }
}

TEST_F(PreferencesProxy, CopyOfAValueThatXmlCannotCarryAnswers5) {
  store.setValue("key", PropertyList("\x01"), {.identifier = "domain"});
  for (const std::int32_t id : {kCopy, kCopyApp}) {
    EXPECT_EQ(Get<std::int32_t>(copy(id), 32), 5);
  }
  EXPECT_TRUE(log.takeLines().empty());
}

TEST_F(PreferencesProxy, CopyAnswersTheAllocationsCodeAndLogsTheFailedAllocationToo) {
  ASSERT_EQ(set(kXml), 0);
  memory.runOut();
  for (const std::int32_t id : {kCopy, kCopyApp}) {
    const Bytes reply = copy(id);
    EXPECT_EQ(reply.size(), 36U);
    EXPECT_EQ(Get<std::int32_t>(reply, 32), KERN_NO_SPACE);
  }
  EXPECT_EQ(log.takeLines(), (Lines{{LogPriority::kError, "VM_ALLOCATE 93l (mhs1)\n"},
                                    {LogPriority::kError, "VM_ALLOCATE 93l (mhs2)\n"}}));
}

TEST_F(PreferencesProxy, CopyOfALargeValueArrivesInSealedMemory) {
  store.setValue("key", PropertyList(std::string(300'000, 'v')), {.identifier = "domain"});
  Bytes bytes = support::Message(kCopy, 544);
  support::PutText(bytes, 32, "domain");
  support::PutText(bytes, 288, "key");
  const support::Packet reply = request(*client, bytes);
  ASSERT_EQ(reply.descriptors.size(), 1U);
  EXPECT_EQ(reply.bytes.size(), 56U);
  std::string content(Get<std::uint32_t>(reply.bytes, 52), '\0');
  EXPECT_EQ(::pread(reply.descriptors[0].get(), content.data(), content.size(), 0),
            static_cast<ssize_t>(content.size()));
  EXPECT_NE(content.find("vvv</string>"), std::string::npos);
  EXPECT_EQ(memory.regions(), 0);
}

}  // namespace
