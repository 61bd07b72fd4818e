// SPDX-License-Identifier: Apache-2.0
//
// The request routines whose subsystem is still to be built, by id.
#pragma once

#include <array>
#include <cstdint>

inline constexpr std::array<std::int32_t, 6> kUnbuiltRequestIds{8683549, 8683550, 8683551,
                                                                8683552, 8683553, 8683554};
