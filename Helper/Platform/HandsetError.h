// SPDX-License-Identifier: Apache-2.0
//
// Error numbers of the handset's system, which are part of what the helper promises and so are the
// same whatever system it is built for. A provider translates its own system's numbers.
#pragma once

#include <cstdint>

namespace platform {

using HandsetError = std::int32_t;

namespace handset {

inline constexpr HandsetError kNoError = 0;
inline constexpr HandsetError kNotPermitted = 1;
inline constexpr HandsetError kInputOutput = 5;
inline constexpr HandsetError kBadDescriptor = 9;
inline constexpr HandsetError kInvalidArgument = 22;
inline constexpr HandsetError kWouldBlock = 35;
inline constexpr HandsetError kMessageTooLong = 40;
inline constexpr HandsetError kProtocolFamilyUnsupported = 46;
inline constexpr HandsetError kAddressFamilyUnsupported = 47;
inline constexpr HandsetError kNotConnected = 57;
inline constexpr HandsetError kTimedOut = 60;
inline constexpr HandsetError kHostUnreachable = 65;

}  // namespace handset

}  // namespace platform
