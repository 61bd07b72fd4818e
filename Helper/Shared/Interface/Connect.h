// SPDX-License-Identifier: Apache-2.0
//
// The one message of the service port: connect. The request carries a send right to a port of the
// client's own and is answered with a send right to the client's private port.
#pragma once

#include <cstddef>
#include <cstdint>

namespace wire {

inline constexpr char kServiceName[] = "com.zarvo.halvec.mobile-helper";
inline constexpr char kRequiredEntitlement[] = "com.zarvo.Vintrel.HalvecHelper.allow";

inline constexpr std::int32_t kConnectId = 4792174;
inline constexpr std::uint32_t kConnectRequestSize = 40;
inline constexpr std::uint32_t kConnectReplySize = 40;
inline constexpr std::uint32_t kConnectArgumentCount = 11;  // two ports, result, 8 token words

/// Offsets of the connect request and, behind it, of its trailer.
inline constexpr std::size_t kConnectPortOffset = 28;
inline constexpr std::size_t kConnectDispositionOffset = 36;  // pad 2, disposition 1, type 1
inline constexpr std::size_t kConnectTrailerOffset = 40;
inline constexpr std::size_t kConnectTrailerSizeOffset = 44;
inline constexpr std::size_t kConnectAuditTokenOffset = 60;

}  // namespace wire
