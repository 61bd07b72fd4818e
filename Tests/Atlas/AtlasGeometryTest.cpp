// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/AtlasGeometry.h"

#include <gtest/gtest.h>

#include <cmath>
#include <numbers>

namespace {

TEST(AtlasGeometry, AgreesWithTheMathematicsLibraryOnCosines) {
  for (double degrees = -90; degrees <= 90; degrees += 0.125) {
    EXPECT_NEAR(platform::CosineOfDegrees(degrees), std::cos(degrees * std::numbers::pi / 180),
                1e-12)
        << degrees;
  }
}

TEST(AtlasGeometry, HasNoNegativeCosineAtThePoles) {
  EXPECT_GE(platform::CosineOfDegrees(90), 0);
  EXPECT_GE(platform::CosineOfDegrees(-90), 0);
  EXPECT_EQ(platform::CosineOfDegrees(0), 1);
}

TEST(AtlasGeometry, RoundsTowardsMinusInfinity) {
  for (const double value : {-720.5, -1.0, -0.25, 0.0, 0.25, 1.0, 719.999}) {
    EXPECT_EQ(static_cast<double>(platform::Floor(value)), std::floor(value)) << value;
  }
}

}  // namespace
