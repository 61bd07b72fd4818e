// SPDX-License-Identifier: Apache-2.0
//
// halvecctl location about on the built atlas.
#include <gtest/gtest.h>

#include "Tests/Halvecctl/Program.h"

namespace {

using program::Outcome;
using program::RunProgram;

TEST(LocationAbout, NamesTheOwnersOfTheData) {
  const Outcome outcome = RunProgram({"location", "about", "--atlas", HALVEC_BUILT_ATLAS});
  EXPECT_EQ(outcome.exitCode, 0) << outcome.errors;
  EXPECT_EQ(outcome.output.find("Atlas of 20"), 0U);
  for (const char* owner : {"OpenStreetMap contributors", "Open Database License 1.0",
                            "Natural Earth", "GeoNames", "Creative Commons Attribution 4.0"}) {
    EXPECT_NE(outcome.output.find(owner), std::string::npos) << owner;
  }
}

TEST(LocationAbout, PrintsOneObjectWithJson) {
  const Outcome outcome =
      RunProgram({"--json", "location", "about", "--atlas", HALVEC_BUILT_ATLAS});
  EXPECT_EQ(outcome.output.find("{\"atlas\":\"" HALVEC_BUILT_ATLAS "\",\"attributions\":\"Atlas"),
            0U);
  EXPECT_EQ(outcome.output.find('\n'), outcome.output.size() - 1);
}

TEST(LocationAbout, SaysWhyThereIsNoAtlas) {
  const Outcome outcome = RunProgram({"location", "about", "--atlas", "/nowhere"});
  EXPECT_EQ(outcome.exitCode, 7);
  EXPECT_EQ(outcome.output, "");
  EXPECT_EQ(outcome.errors, "halvecctl: /nowhere: No such file or directory\n");
}

}  // namespace
