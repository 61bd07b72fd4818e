// SPDX-License-Identifier: Apache-2.0
//
// What is accepted as an atlas, and what every other file is refused with.
#include "Helper/Platform/Linux/AtlasFile.h"

#include <functional>

#include "Helper/Platform/MapAttributions.h"
#include "Tests/Atlas/AtlasFixture.h"
#include "Tests/Atlas/TinyAtlas.h"

namespace atlas_test {
namespace {

class AtlasFileTest : public AtlasFixture {
 protected:
  /// Why the file is refused, without its path; "accepted" when it is not.
  [[nodiscard]] std::string refusal() const {
    const auto file = platform::AtlasFile::open(path_);
    const auto* reason = std::get_if<std::string>(&file);
    if (reason == nullptr) return "accepted";
    EXPECT_EQ(reason->substr(0, path_.size() + 2), path_ + ": ");
    return reason->substr(path_.size() + 2);
  }

  const std::string whole_ = TinyAtlas().bytes();
};

TEST_F(AtlasFileTest, HandsOutItsSections) {
  write(whole_);
  const auto file = platform::AtlasFile::open(path_);
  ASSERT_TRUE(std::holds_alternative<platform::AtlasFile>(file));
  const auto codes =
      std::get<platform::AtlasFile>(file).section(platform::AtlasSection::kCountryCodes);
  ASSERT_EQ(codes.size(), 6U);
  EXPECT_EQ(static_cast<char>(codes[4]), 'B');
}

TEST_F(AtlasFileTest, TellsWhoseDataItHas) {
  write(whole_);
  EXPECT_EQ(std::get<std::string>(platform::ReadMapAttributions(path_)), "made for a test");
}

TEST_F(AtlasFileTest, TellsWhyThereAreNoAttributions) {
  const auto answer = platform::ReadMapAttributions(path_);
  EXPECT_EQ(std::get<platform::GeocodeError>(answer).description,
            path_ + ": No such file or directory");
}

TEST_F(AtlasFileTest, IsRefusedWhenMissing) { EXPECT_EQ(refusal(), "No such file or directory"); }

TEST_F(AtlasFileTest, IsRefusedWhenItIsAFolder) {
  folder_.folder("atlas.bin");
  EXPECT_EQ(refusal(), "not a regular file");
}

TEST_F(AtlasFileTest, IsRefusedWithoutWaitingWhenItIsAFifo) {
  folder_.fifo("atlas.bin");
  EXPECT_EQ(refusal(), "not a regular file");
}

TEST_F(AtlasFileTest, IsRefusedWhenEmptyOrShorterThanItsHeader) {
  for (const std::size_t length : {std::size_t{0}, std::size_t{1}, kTableEnd - 1}) {
    write(whole_.substr(0, length));
    EXPECT_EQ(refusal(), "not an atlas");
  }
}

TEST_F(AtlasFileTest, IsRefusedWhenCutOffOrGrown) {
  for (const std::string& other :
       {whole_.substr(0, kTableEnd), whole_.substr(0, whole_.size() - 1), whole_ + "x"}) {
    write(other);
    EXPECT_EQ(refusal(), "not an atlas of this version, or damaged");
  }
}

TEST_F(AtlasFileTest, IsRefusedForAnyChangedByteOfHeaderAndTable) {
  for (std::size_t offset = 0; offset < kTableEnd; ++offset) {
    std::string damaged = whole_;
    damaged[offset] = static_cast<char>(damaged[offset] ^ 0x40);
    write(damaged);
    EXPECT_EQ(refusal(), "not an atlas of this version, or damaged") << "offset " << offset;
  }
}

TEST_F(AtlasFileTest, IsRefusedInAnotherVersionOrWithOtherSections) {
  for (const std::size_t offset : {kVersionOffset, kVersionOffset + 4}) {
    write(WithNumber(whole_, offset, 2));
    EXPECT_EQ(refusal(), "not an atlas of this version, or damaged");
  }
}

TEST_F(AtlasFileTest, IsRefusedWhenASectionIsNotInsideTheFile) {
  for (std::size_t entry = kTableOffset; entry < kTableEnd; entry += 16) {
    for (const std::uint32_t offset : {0U, 199U, 0x7FFFFFF0U, 0xFFFFFFF0U}) {
      write(WithNumber(whole_, entry + 4, offset));
      EXPECT_EQ(refusal(), "damaged table of sections") << "entry at " << entry;
    }
    write(WithNumber(whole_, entry + 8, 0xFFFFFFF0U));
    EXPECT_EQ(refusal(), "damaged table of sections") << "entry at " << entry;
  }
}

TEST_F(AtlasFileTest, IsRefusedWhenASectionHasAnImpossibleSizeOrPlace) {
  const std::vector<std::function<void(TinyAtlas&)>> damages{
      [](TinyAtlas& atlas) { atlas.codes = ""; },
      [](TinyAtlas& atlas) { atlas.codes += "C"; },
      [](TinyAtlas& atlas) { atlas.countryNodes = ""; },
      [](TinyAtlas& atlas) { atlas.countryNodes += U32({0}); },
      [](TinyAtlas& atlas) { atlas.countryLeaves = "x"; },
      [](TinyAtlas& atlas) { atlas.states = ""; },
      [](TinyAtlas& atlas) { atlas.states += "x"; },
      [](TinyAtlas& atlas) { atlas.stateNodes.pop_back(); },
      [](TinyAtlas& atlas) { atlas.stateLeaves = U16({1}); },
      [](TinyAtlas& atlas) { atlas.places.emplace_back(0, "x"); },
      [](TinyAtlas& atlas) { atlas.names = ""; },
  };
  for (std::size_t index = 0; index < damages.size(); ++index) {
    TinyAtlas atlas;
    damages[index](atlas);
    write(atlas.bytes());
    EXPECT_EQ(refusal(), "damaged table of sections") << "damage " << index;
  }
  std::string swapped = whole_;
  swapped.replace(kTableOffset, 4, "CNOD");
  write(WithChecksum(swapped));
  EXPECT_EQ(refusal(), "damaged table of sections");
}

}  // namespace
}  // namespace atlas_test
