// SPDX-License-Identifier: Apache-2.0
//
// Data beyond the packet's limit travels in a memfd, sealed so that neither side can change or cut
// it any more. No state; any thread.
#pragma once

#include <cstddef>
#include <span>

#include "Client/Data.h"
#include "Client/Result.h"
#include "Helper/Platform/FileDescriptor.h"

namespace halvec {

/// Most bytes that travel behind a message in its own packet.
inline constexpr std::size_t kMaxBytesInPacket = 131072;
/// Most bytes that a request or a reply carries at all.
inline constexpr std::size_t kMaxOutOfLineBytes = std::size_t{16} * 1024 * 1024;

/// Makes a memfd with the content `bytes`, sealed against shrink, grow and write.
Error SealBytes(std::span<const std::byte> bytes, platform::FileDescriptor& memory);

/// Reads all of `memory` into `data`. It must be a regular memfd of exactly `size` bytes with those
/// seals and within the limit; anything else is HVMH_PROTOCOL_VIOLATION. Never maps it, and leaves
/// its file offset alone: both would give the sender influence on this process.
Error ReadSealedBytes(int memory, std::size_t size, Data& data);

}  // namespace halvec
