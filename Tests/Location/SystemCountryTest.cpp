// SPDX-License-Identifier: Apache-2.0
//
// The configured country out of preferences, time zone, locale and regulatory domain, in that
// order; and the table of former zone names against this system's zone.tab.
#include "Helper/Platform/Linux/SystemCountry.h"

#include <gtest/gtest.h>

#include <string>

#include "Helper/Platform/Linux/ZoneAliases.h"
#include "Tests/Fakes/FakePreferencesStore.h"
#include "Tests/Files/FolderForTest.h"

namespace {

class SystemCountry : public ::testing::Test {
 protected:
  std::optional<std::string> code() {
    return platform::SystemCountry({.localTime = folder.at("localtime"),
                                    .zoneTable = zoneTable,
                                    .locales = {folder.at("locale.conf"), folder.at("locale")},
                                    .regulatoryDomain = folder.at("regdom")})
        .countryCode();
  }
  void setZone(const std::string& target) {
    std::filesystem::remove(folder.at("localtime"));
    folder.link("localtime", target);
  }
  void choose(std::optional<platform::PropertyList> value) {
    const platform::PreferenceDomain domain{.identifier = "com.zarvo.halvec.mobile-helper"};
    preferences.setValue("CountryCode", std::move(value), domain);
    EXPECT_TRUE(preferences.synchronize(domain));
  }
  files_test::FolderForTest folder;
  std::string zoneTable = "/usr/share/zoneinfo/zone.tab";
  fakes::FakePreferencesStore preferences;
  platform::ScopedReplacement<platform::PreferencesStore> replacement{preferences};
};

TEST_F(SystemCountry, IsAbsentWhereNothingIsConfigured) { EXPECT_EQ(code(), std::nullopt); }

TEST_F(SystemCountry, IsWhatWasChosenAsItWasWritten) {
  setZone("/usr/share/zoneinfo/Europe/Berlin");
  for (const std::string& text : {std::string("ch"), std::string(200, 'x'), std::string("Züri")}) {
    choose(text);
    EXPECT_EQ(code(), text);
  }
}

TEST_F(SystemCountry, PassesOverAChoiceThatIsEmptyOrNoText) {
  setZone("/usr/share/zoneinfo/Europe/Berlin");
  choose("");
  EXPECT_EQ(code(), "DE");
  choose(42);
  EXPECT_EQ(code(), "DE");
  choose(std::nullopt);
  EXPECT_EQ(code(), "DE");
}

TEST_F(SystemCountry, SeesAChoiceOfEveryScopeThatAnotherProcessMade) {
  const auto storage = std::make_shared<fakes::FakePreferencesStore::Storage>();
  fakes::FakePreferencesStore own(storage);
  const platform::ScopedReplacement<platform::PreferencesStore> ownReplacement(own);
  EXPECT_EQ(code(), std::nullopt);
  (*storage)[{"com.zarvo.halvec.mobile-helper", platform::UserScope::kAnyUser,
              platform::HostScope::kAnyHost}]
      .insert_or_assign("CountryCode", "IS");
  EXPECT_EQ(code(), "IS");
  EXPECT_EQ(own.takeSynchronized().size(), 8U);
}

TEST_F(SystemCountry, IsThatOfTheTimeZone) {
  setZone("/usr/share/zoneinfo/America/Argentina/Ushuaia");
  EXPECT_EQ(code(), "AR");
  setZone("../usr/share/zoneinfo/Asia/Hong_Kong");
  EXPECT_EQ(code(), "HK");
  setZone("/usr/share/zoneinfo/Asia/Macau");
  EXPECT_EQ(code(), "MO");
  setZone("/usr/share/zoneinfo/America/Puerto_Rico");
  EXPECT_EQ(code(), "PR");
  setZone("/usr/share/zoneinfo/posix/Europe/Oslo");
  EXPECT_EQ(code(), "NO");
  setZone("/usr/share/zoneinfo/right/Europe/Oslo");
  EXPECT_EQ(code(), "NO");
}

TEST_F(SystemCountry, KnowsTheCountryOfAFormerZoneNameAndNotThatOfItsLink) {
  const std::vector<std::pair<const char*, const char*>> rows{
      {"Pacific/Ponape", "FM"},        {"Iceland", "IS"},    {"America/Virgin", "VI"},
      {"Atlantic/Jan_Mayen", "SJ"},    {"US/Eastern", "US"}, {"Africa/Timbuktu", "ML"},
      {"America/Coral_Harbour", "CA"}, {"W-SU", "RU"},       {"Antarctica/South_Pole", "AQ"}};
  for (const auto& [zone, country] : rows) {
    setZone(std::string("/usr/share/zoneinfo/") + zone);
    EXPECT_EQ(code(), country) << zone;
  }
}

TEST_F(SystemCountry, IsNotThatOfAZoneWithoutOne) {
  for (const char* zone :
       {"Etc/UTC", "UTC", "EST5EDT", "Factory", "Europe", "", "Europe/Atlantis"}) {
    setZone(std::string("/usr/share/zoneinfo/") + zone);
    EXPECT_EQ(code(), std::nullopt) << zone;
  }
  setZone("/elsewhere/Europe/Berlin");
  EXPECT_EQ(code(), std::nullopt);
}

TEST_F(SystemCountry, IsThatOfTheLocaleWhereTheZoneHasNone) {
  setZone("/usr/share/zoneinfo/Etc/UTC");
  for (const char* text : {"LANG=de_AT.UTF-8\n", "# x\nLC_TIME=C\nLANG=\"de_AT.UTF-8\"\n",
                           "LANG='de_AT'", "LANG=fr_FR\nLANG=de_AT@euro\n"}) {
    folder.file("locale", text);
    EXPECT_EQ(code(), "AT") << text;
  }
  folder.file("locale.conf", "LANG=pt_BR.UTF-8\n");
  EXPECT_EQ(code(), "BR");
}

TEST_F(SystemCountry, PassesOverALocaleWithoutACountryThatExists) {
  folder.file("locale", "LANG=de_AT.UTF-8\n");
  for (const char* text :
       {"LANG=C.UTF-8\n", "LANG=POSIX\n", "LANG=\n", "LANG=eo\n", "LANG=es_419\n", "LANG=en_XX\n",
        "LANG=de_\n", "LANG=\"", "LANGUAGE=de_DE\n", "LANG=fr_FR\nLANG=\n", ""}) {
    folder.file("locale.conf", text);
    EXPECT_EQ(code(), "AT") << text;
  }
}

TEST_F(SystemCountry, IsTheRegulatoryDomainWhereThatIsACountry) {
  folder.file("regdom", "NZ\n");
  EXPECT_EQ(code(), "NZ");
  for (const char* text : {"00\n", "98\n", "XX\n", "EU\n", "\n", "", "NZL\n", "nz\n"}) {
    folder.file("regdom", text);
    EXPECT_EQ(code(), std::nullopt) << text;
  }
}

TEST_F(SystemCountry, IsOnlyWhatWasChosenWhereTheZoneTableIsMissing) {
  zoneTable = folder.at("absent");
  setZone("/usr/share/zoneinfo/Europe/Berlin");
  folder.file("locale", "LANG=de_AT.UTF-8\n");
  folder.file("regdom", "NZ\n");
  EXPECT_EQ(code(), std::nullopt);
  choose("DE");
  EXPECT_EQ(code(), "DE");
}

TEST_F(SystemCountry, SurvivesATableThatIsNone) {
  zoneTable = folder.at("table");
  setZone("/usr/share/zoneinfo/Europe/Berlin");
  for (const std::string& text :
       {std::string("\t\t\t\n\n\t"), std::string("DE\t\t\n"), std::string("DE\n"),
        std::string(5000, '\t'), std::string("\0\xff", 2)}) {
    folder.file("table", text);
    EXPECT_EQ(code(), std::nullopt);
  }
  folder.file("table", "DE\t+0+0\tEurope/Berlin");
  EXPECT_EQ(code(), "DE");
}

TEST(CanonicalZone, LeavesAPresentNameAlone) {
  EXPECT_EQ(platform::CanonicalZone("Europe/Berlin"), "Europe/Berlin");
  EXPECT_EQ(platform::CanonicalZone(""), "");
  EXPECT_EQ(platform::CanonicalZone("Zzz"), "Zzz");
}

/// Every name of the zone database that begins a row "L TARGET NAME" and that zone.tab lacks.
TEST(CanonicalZone, LeadsFromEveryFormerNameOfACountrysZoneIntoZoneTab) {
  std::set<std::string> present;
  std::ifstream table("/usr/share/zoneinfo/zone.tab");
  for (std::string line; std::getline(table, line);) {
    if (line.empty() || line.front() == '#') continue;
    const std::string zone = line.substr(line.find('\t', line.find('\t') + 1) + 1);
    present.insert(zone.substr(0, zone.find('\t')));
  }
  ASSERT_GT(present.size(), 400U);
  std::ifstream database("/usr/share/zoneinfo/tzdata.zi");
  std::size_t former = 0;
  std::string kind;
  for (std::string line; std::getline(database, line);) {
    std::istringstream words(line);
    std::string target;
    std::string name;
    if (!(words >> kind >> target >> name) || kind != "L" || present.contains(name)) continue;
    if (target.starts_with("Etc/")) continue;
    ++former;
    EXPECT_TRUE(present.contains(std::string(platform::CanonicalZone(name)))) << name;
  }
  EXPECT_GT(former, 100U);
}

}  // namespace
