// SPDX-License-Identifier: Apache-2.0
//
// The codec against another implementation, Python's plistlib: each reads what the other wrote, and
// what we accept of damaged input means the same there. Needs python3; skipped without it.
#include <gtest/gtest.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cmath>
#include <filesystem>
#include <fstream>
#include <functional>
#include <iostream>
#include <sstream>

#include "Tests/PropertyList/PropertyListSupport.h"
#include "Tests/PropertyList/RandomPropertyList.h"

namespace {

using platform::PropertyList;
using property_list_test::Mutated;
using property_list_test::Parse;
using property_list_test::Random;
using property_list_test::RandomPropertyList;
using property_list_test::TextOf;
namespace fs = std::filesystem;

// Status of `python3 arguments...`; -1 when it cannot be run.
int RunPython(std::vector<std::string> arguments) {
  arguments.insert(arguments.begin(), "python3");
  std::vector<char*> pointers;
  pointers.reserve(arguments.size() + 1);
  for (std::string& argument : arguments) pointers.push_back(argument.data());
  pointers.push_back(nullptr);
  pid_t child = 0;
  int status = 0;
  if (::posix_spawnp(&child, "python3", nullptr, nullptr, pointers.data(), environ) != 0 ||
      ::waitpid(child, &status, 0) != child || !WIFEXITED(status) || WEXITSTATUS(status) == 127) {
    return -1;
  }
  return WEXITSTATUS(status);
}

class PropertyListOracle : public testing::Test {
 protected:
  void SetUp() override {
    if (RunPython({"-c", "import plistlib"}) != 0) {
      GTEST_SKIP() << "python3 with plistlib is not installed: nothing to compare with";
    }
    std::string name = (fs::temp_directory_path() / "property-lists-XXXXXX").string();
    ASSERT_NE(::mkdtemp(name.data()), nullptr);
    folder_ = name;
  }
  void TearDown() override {
    std::error_code ignored;
    if (!folder_.empty()) fs::remove_all(folder_, ignored);
  }

  [[nodiscard]] fs::path file(std::size_t number, const char* ending) const {
    return folder_ / (std::to_string(number) + ending);
  }
  void give(std::size_t number, std::string_view text) const {
    std::ofstream(file(number, ".in"), std::ios::binary) << text;
  }
  [[nodiscard]] std::optional<std::string> take(std::size_t number, const char* ending) const {
    std::ifstream stream(file(number, ending), std::ios::binary);
    if (!stream) return std::nullopt;
    std::ostringstream text;
    text << stream.rdbuf();
    return text.str();
  }
  [[nodiscard]] int ask() const { return RunPython({ORACLE_SCRIPT, folder_.string()}); }

  fs::path folder_;
};

TEST_F(PropertyListOracle, UnderstandsWhatWeWriteAndWeUnderstandItsAnswer) {
  Random random(20'010'101);
  std::vector<PropertyList> values;
  for (std::size_t i = 0; i < 400; ++i) {
    values.push_back(RandomPropertyList(random, 4));
    if (i % 2 == 0) {
      const auto xml = platform::SerializeXml(values[i]);
      ASSERT_TRUE(xml);
      give(i, *xml);
    } else {
      const auto binary = platform::SerializeBinary(values[i]);
      ASSERT_TRUE(binary);
      give(i, TextOf(*binary));
    }
  }
  ASSERT_EQ(ask(), 0);
  for (std::size_t i = 0; i < values.size(); ++i) {
    const auto binary = take(i, ".bin");
    ASSERT_TRUE(binary) << i << ": " << take(i, ".bad").value_or("no answer");
    EXPECT_EQ(Parse(*binary), values[i]) << i;
    const auto xml = take(i, ".xml");
    ASSERT_TRUE(xml) << i;
    EXPECT_EQ(Parse(*xml), values[i]) << i;
  }
}

// Whether the value has something that the other reader cannot represent or writes differently: a
// date outside the years 1 to 9999 or finer than a microsecond, a wide UID.
bool IsBeyondTheOracle(const PropertyList& value) {
  if (const auto date = value.date()) {
    return date->seconds != std::floor(date->seconds) || date->seconds < -63'113'904'000 ||
           date->seconds > 252'423'993'599;
  }
  if (const auto uid = value.uid()) return uid->number >> 63 != 0;
  if (const PropertyList::Array* items = value.array()) {
    return std::any_of(items->begin(), items->end(), IsBeyondTheOracle);
  }
  if (const PropertyList::Dictionary* entries = value.dictionary()) {
    return std::any_of(entries->begin(), entries->end(),
                       [](const auto& entry) { return IsBeyondTheOracle(entry.value); });
  }
  return false;
}

// The other reader goes by the first bytes, so that XML with any other start is foreign to it.
bool IsKnownByItsStart(std::string_view text) {
  return text.starts_with("<?xml") || text.starts_with("bplist00");
}

TEST_F(PropertyListOracle, AgreesWithWhatWeAcceptOfDamagedLists) {
  Random random(19'700'101);
  std::vector<PropertyList> accepted;
  std::size_t refused = 0;
  while (accepted.size() < 400) {
    const PropertyList value = RandomPropertyList(random, 3);
    const std::string whole = random() % 2 == 0 ? *platform::SerializeXml(value)
                                                : TextOf(*platform::SerializeBinary(value));
    const std::string damaged = Mutated(whole, random);
    std::optional<PropertyList> read = Parse(damaged);
    if (!read) {
      ++refused;
    } else if (!IsBeyondTheOracle(*read) && IsKnownByItsStart(damaged)) {
      give(accepted.size(), damaged);
      accepted.push_back(std::move(*read));
    }
  }
  ASSERT_EQ(ask(), 0);
  for (std::size_t i = 0; i < accepted.size(); ++i) {
    const auto binary = take(i, ".bin");
    ASSERT_TRUE(binary) << take(i, ".bad").value_or("no answer") << "\n" << *take(i, ".in");
    EXPECT_EQ(Parse(*binary), accepted[i]) << *take(i, ".in");
  }
  std::cout << "accepted " << accepted.size() << " damaged lists, refused " << refused << "\n";
}

}  // namespace
