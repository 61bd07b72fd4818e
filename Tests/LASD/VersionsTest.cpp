// SPDX-License-Identifier: Apache-2.0
//
// The recorded versions, the manifest, and which databases differ.
#include <string>

#include "Tests/LASD/UpdaterFixture.h"

namespace {

using lasd_test::Dictionary;
using lasd_test::Entry;
using platform::PropertyList;
using enum LASDDatabaseType;

constexpr std::uint32_t kEveryType = 31;
const std::string kUrl = "https://host/file.gz";

/// The lines of a fetch that succeeds.
std::vector<std::string> Fetched(const std::string& url, std::size_t size) {
  return {"Fetching URL " + url,
          "URL retrieved " + url + ", size: " + std::to_string(size) + " \n"};
}

class Versions : public lasd_test::UpdaterFixture {
 protected:
  std::uint32_t loadLocal(std::uint32_t mask) {
    std::uint32_t result = 1;
    onQueue([&] { result = updater->loadVersions("com.zarvo.lasd", true, mask); });
    EXPECT_EQ(result, 0U);
    return result;
  }
  std::uint32_t loadRemote(std::uint32_t mask) {
    std::uint32_t result = 1;
    onQueue([&] { result = updater->loadVersions(kLASDManifestURL, false, mask); });
    return result;
  }
  /// What a whole check of `mask` finds out of date, the table as the preferences have it.
  std::uint32_t check(std::uint32_t mask) {
    loadLocal(mask);
    return loadRemote(mask);
  }
  /// The lines of the comparison alone.
  Lines comparison() {
    Lines all = lines();
    std::erase_if(all, [](const std::string& line) {
      return line.starts_with("Reading local") || line.starts_with("Fetching URL") ||
             line.starts_with("URL retrieved");
    });
    return all;
  }
};

TEST_F(Versions, OfTheMaskedTypesAreReadFromThePreferences) {
  record("gsm", Entry("1", "g"));
  record("umts", Entry("2", "u"));
  loadLocal(BitOf(kGsm));
  EXPECT_EQ(updater->versionTable(), (LASDUpdater::VersionTable{{kGsm, Entry("1", "g")}}));
  EXPECT_EQ(lines(), (Lines{"Reading local resource com.zarvo.lasd\n"}));
  loadLocal(BitOf(kUmts) | BitOf(kScdma));
  EXPECT_EQ(updater->versionTable(),
            (LASDUpdater::VersionTable{
                {kUmts, Entry("2", "u")}, {kGsm, Entry("1", "g")}, {kScdma, std::nullopt}}));
}

TEST_F(Versions, ThatAreNoDictionariesCountAsAbsent) {
  record("umts", "text");
  record("cdma", 7);
  record("lte", PropertyList::Array{Entry("1", "u")});
  record("gsm", true);
  loadLocal(kEveryType);
  ASSERT_EQ(updater->versionTable().size(), 5U);
  for (const auto& [type, entry] : updater->versionTable()) EXPECT_FALSE(entry) << typeName(type);
}

TEST_F(Versions, AreReadAnewByEveryCheck) {
  record("gsm", Entry("1", "g"));
  loadLocal(BitOf(kGsm));
  store.setValue("gsm", std::nullopt, domain);
  loadLocal(BitOf(kGsm));
  EXPECT_EQ(updater->versionTable(), (LASDUpdater::VersionTable{{kGsm, std::nullopt}}));
}

TEST_F(Versions, OfOtherScopesAndDomainsAreNotLookedAt) {
  store.setValue("gsm", Entry("1", "g"),
                 {.identifier = "com.zarvo.lasd", .user = platform::UserScope::kAnyUser});
  store.setValue("gsm", Entry("1", "g"),
                 {.identifier = "com.zarvo.lasd", .host = platform::HostScope::kCurrentHost});
  store.setValue("gsm", Entry("1", "g"), {.identifier = "com.zarvo.other"});
  loadLocal(BitOf(kGsm));
  EXPECT_FALSE(updater->versionTable().at(kGsm));
}

TEST_F(Versions, OfASourceThatIsNotUtf8AreNotRead) {
  std::uint32_t result = 1;
  onQueue([&] { result = updater->loadVersions("\xff", true, kEveryType); });
  EXPECT_EQ(result, 0U);
  EXPECT_TRUE(updater->versionTable().empty());
  EXPECT_EQ(lines(), (Lines{"Reading local resource \xff\n"}));
}

TEST_F(Versions, OfTheManifestAreFetchedOverWifiAlone) {
  putManifest(Dictionary({}));
  EXPECT_EQ(loadRemote(kEveryType), 0U);
  ASSERT_EQ(web.transfers().size(), 1U);
  EXPECT_EQ(web.transfers()[0].url, kLASDManifestURL);
  EXPECT_FALSE(web.transfers()[0].allowsCellular);
  EXPECT_TRUE(std::string(kLASDManifestURL).starts_with("https://"));
  EXPECT_TRUE(std::string(kLASDManifestURL).ends_with("/1/v3/lasd.plist"));
}

TEST_F(Versions, OfAManifestThatCannotBeFetchedAreAFailure) {
  const std::string url = kLASDManifestURL;
  loadLocal(kEveryType);
  (void)lines();
  for (const int status : {304, 404, 500}) {
    web.put(url, status, {'x'}, {});
    EXPECT_EQ(loadRemote(kEveryType), LASDUpdater::kFetchFailed) << status;
    const Lines found = lines();
    ASSERT_EQ(found.size(), 3U);
    EXPECT_EQ(found[2], "Could not fetch data from source " + url + "\n");
  }
  web.put(url, 200, {}, {});
  EXPECT_EQ(loadRemote(kEveryType), LASDUpdater::kFetchFailed) << "an empty body";
  web.loseWifi();
  EXPECT_EQ(loadRemote(kEveryType), 0xFFFFFFFFU) << "cellular alone";
}

TEST_F(Versions, OfAManifestThatIsNoDictionaryAreNothingToUpdate) {
  loadLocal(kEveryType);
  for (const std::string& body :
       {std::string("nonsense"), std::string("bplist00"), std::string(1, '\0'),
        std::string("<plist version=\"1.0\"><array/></plist>"),
        std::string("<plist version=\"1.0\"><string>gsm</string></plist>"),
        std::string("<plist version=\"1.0\"><dict><key>gsm</key></dict></plist>"),
        std::string("<plist version=\"1.0\"><dict><key>gsm</key><dict/></dict></plist>junk")}) {
    putManifestBytes(body);
    (void)lines();
    EXPECT_EQ(loadRemote(kEveryType), 0U) << body;
    Lines expected = Fetched(kLASDManifestURL, body.size());
    expected.push_back("Could not create version dictionary from downloaded plist!\n");
    EXPECT_EQ(lines(), expected);
  }
}

TEST_F(Versions, OfAManifestDeeperOrLargerThanAPropertyListMayBeAreNothingToUpdate) {
  loadLocal(kEveryType);
  std::string deep;
  for (int level = 0; level < 100'000; ++level) deep += "<array>";
  std::string large = "<plist version=\"1.0\"><dict><key>gsm</key><string>";
  large.resize(std::size_t{17} << 20, 'x');
  for (const std::string& body :
       {"<plist version=\"1.0\">" + deep, large + "</string></dict></plist>"}) {
    putManifestBytes(body);
    EXPECT_EQ(loadRemote(kEveryType), 0U);
    EXPECT_EQ(lines().back(), "Could not create version dictionary from downloaded plist!\n");
  }
}

TEST_F(Versions, OfABinaryManifestCountTheSame) {
  const auto bytes = platform::SerializeBinary(Dictionary({{"lte", Entry("2", kUrl)}})).value();
  putManifestBytes(std::string(reinterpret_cast<const char*>(bytes.data()), bytes.size()));
  EXPECT_EQ(check(kEveryType), BitOf(kLte));
  EXPECT_EQ(updater->versionTable().at(kLte), Entry("2", kUrl));
}

TEST_F(Versions, WithoutAnyTypeReadBeforeAreNothingToUpdate) {
  putManifest(Dictionary({{"gsm", Entry("2", kUrl)}}));
  EXPECT_EQ(loadRemote(kEveryType), 0U);
  EXPECT_EQ(comparison(), Lines{});
  EXPECT_TRUE(updater->versionTable().empty());
}

TEST_F(Versions, ThatAreEqualNeedNoUpdate) {
  record("gsm", Entry("1.0.A", "old"));
  putManifest(Dictionary({{"gsm", Entry("1.00.a", kUrl)}}));
  EXPECT_EQ(check(BitOf(kGsm)), 0U);
  EXPECT_EQ(comparison(), (Lines{"gsm version 1.00.a matches server version\n"}));
  EXPECT_EQ(updater->versionTable().at(kGsm), Entry("1.0.A", "old"));
}

TEST_F(Versions, ThatDifferNeedAnUpdateUpwardsAndDownwards) {
  record("gsm", Entry("2", "old"));
  putManifest(Dictionary({{"gsm", Entry("3", kUrl)}}));
  EXPECT_EQ(check(BitOf(kGsm)), BitOf(kGsm));
  EXPECT_EQ(comparison(), (Lines{"We have gsm version 2, server has 3, update required\n"}));
  EXPECT_EQ(updater->versionTable().at(kGsm), Entry("3", kUrl));
  record("gsm", Entry("3", "old"));
  putManifest(Dictionary({{"gsm", Entry("2", kUrl)}}));
  EXPECT_EQ(check(BitOf(kGsm)), BitOf(kGsm));
  EXPECT_EQ(comparison(), (Lines{"We have gsm version 3, server has 2, update required\n"}));
}

TEST_F(Versions, ThatWereNeverRecordedNeedAnUpdate) {
  record("umts", Dictionary({{"ContentURL", "u"}}));
  record("cdma", Dictionary({{"Version", 1}}));
  putManifest(Dictionary({{"gsm", Entry("3", kUrl)},
                          {"umts", Entry("4", kUrl)},
                          {"cdma", Dictionary({{"ContentURL", kUrl}})}}));
  EXPECT_EQ(check(kEveryType), BitOf(kGsm) | BitOf(kUmts) | BitOf(kCdma));
  EXPECT_EQ(comparison(), (Lines{"We have don't have a previously downloaded umts database, server "
                                 "has 4, update required\n",
                                 "We have don't have a previously downloaded cdma database, server "
                                 "has , update required\n",
                                 "lte db is not present locally, update required\n",
                                 "We have don't have a previously downloaded gsm database, server "
                                 "has 3, update required\n",
                                 "scdma db is not present locally, update required\n"}))
      << "in ascending order of the bits";
}

TEST_F(Versions, WithoutATextOnTheServerNeedAnUpdate) {
  record("gsm", Entry("2", "old"));
  for (const PropertyList& version :
       {PropertyList(2), PropertyList(2.0), PropertyList(true), PropertyList(PropertyList::Data{}),
        PropertyList(PropertyList::Array{"2"}), PropertyList(Dictionary({{"Version", "2"}}))}) {
    const PropertyList entry = Dictionary({{"Version", version}});
    putManifest(Dictionary({{"gsm", entry}}));
    EXPECT_EQ(check(BitOf(kGsm)), BitOf(kGsm));
    EXPECT_EQ(comparison(), (Lines{"We have gsm version 2, server has , update required\n"}));
    EXPECT_EQ(updater->versionTable().at(kGsm), entry);
  }
}

TEST_F(Versions, OfATypeThatTheManifestLacksNeedNoUpdateWhateverTheLineSays) {
  record("gsm", Entry("2", "old"));
  for (const PropertyList& value :
       {PropertyList("3"), PropertyList(3), PropertyList(PropertyList::Array{Entry("3", kUrl)})}) {
    putManifest(Dictionary({{"gsm", value}, {"GSM", Entry("3", kUrl)}}));
    EXPECT_EQ(check(BitOf(kGsm)), 0U);
    EXPECT_EQ(comparison(), (Lines{"gsm db is not present locally, update required\n"}));
    EXPECT_EQ(updater->versionTable().at(kGsm), Entry("2", "old"));
  }
}

TEST_F(Versions, OfTypesThatWereNotAskedForStayAsTheyAre) {
  putManifest(Dictionary({{"gsm", Entry("3", kUrl)}, {"lte", Entry("4", kUrl)}}));
  EXPECT_EQ(check(BitOf(kGsm) | BitOf(kLte)), BitOf(kGsm) | BitOf(kLte));
  putManifest(Dictionary({{"gsm", Entry("5", kUrl)}, {"lte", Entry("6", kUrl)}}));
  (void)lines();
  EXPECT_EQ(check(BitOf(kLte)), BitOf(kLte));
  EXPECT_EQ(updater->versionTable().at(kGsm), Entry("3", kUrl));
  EXPECT_EQ(comparison(), (Lines{"We have don't have a previously downloaded lte database, server "
                                 "has 6, update required\n"}));
}

TEST_F(Versions, AreNotUpToDateWithoutAManifest) {
  onQueue([&] { EXPECT_FALSE(updater->isUpToDate(nullptr, kGsm)); });
  EXPECT_TRUE(updater->versionTable().empty());
  EXPECT_EQ(lines(), Lines{});
}

TEST_F(Versions, ComparedForATypeThatWasNeverReadMakeItsEntry) {
  const PropertyList manifest = Dictionary({{"gsm", Entry("3", kUrl)}});
  onQueue([&] { EXPECT_FALSE(updater->isUpToDate(&manifest, kGsm)); });
  EXPECT_EQ(updater->versionTable(), (LASDUpdater::VersionTable{{kGsm, std::nullopt}}));
}

TEST_F(Versions, KeepWhateverElseTheManifestSays) {
  const PropertyList entry = Dictionary({{"Version", "2"},
                                         {"ContentURL", kUrl},
                                         {"Regions", PropertyList::Array{"a", 1, true}},
                                         {"Size", 12345}});
  putManifest(Dictionary({{"gsm", entry}, {"Comment", "none"}}));
  EXPECT_EQ(check(BitOf(kGsm)), BitOf(kGsm));
  EXPECT_EQ(updater->versionTable().at(kGsm), entry);
}

}  // namespace
