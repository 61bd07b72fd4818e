// SPDX-License-Identifier: Apache-2.0
//
// Derives the stub of a request from its row: check the shape, call the routine with the fields,
// complete the prepared reply. Stateless; main thread.
#pragma once

#include <tuple>
#include <utility>

#include "Helper/Platform/MigSource.h"
#include "Helper/Shared/Interface/Request.h"
#include "Helper/Shared/Server/RequestRoutines.h"

/// Kept on one row: success writes the return code only and relies on the NDR record that the
/// dispatcher prepared.
struct RelyOnPreparedNdr {};

namespace stub_detail {

/// Where the parts of an out-of-line reply and of an out-of-line request stand.
inline constexpr std::size_t kDescriptor = wire::kFirstDescriptorOffset;
inline constexpr std::size_t kDescriptorFlags = kDescriptor + 8;
inline constexpr std::size_t kDescriptorType = kDescriptor + wire::kDescriptorTypeOffset;
inline constexpr std::size_t kDescriptorSize = kDescriptor + wire::kOutOfLineCountOffset;
inline constexpr std::size_t kComplexNdr = kDescriptor + wire::kOutOfLineDescriptorSize;

/// The result that travels outside the reply.
struct OutOfLineResult {
  wire::Address address = 0;
  std::uint32_t byteCount = 0;
};

/// One input as the routine takes it: a tuple, since out-of-line bytes are two arguments.
template <class Field>
auto Input(std::byte* request, std::size_t offset) {
  if constexpr (wire::kIsText<Field>) {
    return std::tuple<Field&>(*reinterpret_cast<Field*>(request + offset));
  } else if constexpr (std::is_same_v<Field, wire::OutOfLine>) {
    return std::tuple(
        reinterpret_cast<const std::byte*>(wire::Load<wire::Address>(request + kDescriptor)),
        wire::Load<std::uint32_t>(request + offset));
  } else {
    return std::tuple(wire::Load<Field>(request + offset).value);
  }
}

template <class Field>
auto Output(std::byte* reply, std::size_t offset, OutOfLineResult& result) {
  if constexpr (std::is_same_v<Field, wire::OutOfLine>) {
    return std::tuple(&result.address, &result.byteCount);
  } else {
    return std::tuple<Field&>(*reinterpret_cast<Field*>(reply + offset));
  }
}

template <class Row>
KernReturn CheckRequest(const std::byte* request) {
  const auto header = wire::Load<wire::MessageHeader>(request);
  const bool complex = (header.bits & wire::kComplexBit) != 0;
  if (complex != Row::kComplexRequest || header.size != Row::kRequestSize) {
    return MIG_BAD_ARGUMENTS;
  }
  if constexpr (Row::kComplexRequest) {
    constexpr std::size_t kByteCount = Row::kRequestSize - sizeof(std::uint32_t);
    if (wire::Load<std::uint32_t>(request + wire::kDescriptorCountOffset) != 1) {
      return MIG_BAD_ARGUMENTS;
    }
    if (wire::Load<std::uint8_t>(request + kDescriptorType) != wire::kOutOfLineDescriptorType ||
        wire::Load<std::uint32_t>(request + kDescriptorSize) !=
            wire::Load<std::uint32_t>(request + kByteCount)) {
      return MIG_TYPE_ERROR;
    }
  }
  return KERN_SUCCESS;
}

template <class Row, auto Routine>
KernReturn Call(std::byte* request, std::byte* reply, OutOfLineResult& result) {
  const auto port = wire::Load<wire::MessageHeader>(request).localPort;
  const auto inputs = [&]<std::size_t... Index>(std::index_sequence<Index...>) {
    return std::tuple_cat(Input<std::tuple_element_t<Index, typename Row::InputFields>>(
        request, Row::kInputOffsets[Index])...);
  }
  (std::make_index_sequence<std::tuple_size_v<typename Row::InputFields>>{});
  const auto outputs = [&]<std::size_t... Index>(std::index_sequence<Index...>) {
    return std::tuple_cat(Output<std::tuple_element_t<Index, typename Row::OutputFields>>(
        reply, Row::kOutputOffsets[Index], result)...);
  }
  (std::make_index_sequence<std::tuple_size_v<typename Row::OutputFields>>{});
  return std::apply(Routine, std::tuple_cat(std::tuple(port), inputs, outputs));
}

/// Turns the prepared reply into the complex form that carries `result`.
inline void CompleteOutOfLineReply(std::byte* reply, const OutOfLineResult& result) {
  wire::Store(reply + wire::kDescriptorCountOffset, std::uint32_t{1});
  wire::Store(reply + kDescriptor, result.address);
  wire::Store(reply + kDescriptorSize, result.byteCount);
  wire::Store(reply + kComplexNdr, wire::kNdrRecord);
  wire::Store(reply + kComplexNdr + wire::kNdrSize, result.byteCount);
}

}  // namespace stub_detail

/// The stub of `Row`, which calls `Routine`.
template <class Row, auto Routine, class... Traits>
struct Serve {
  static void Stub(std::byte* request, std::byte* reply) {
    using namespace stub_detail;
    if (const KernReturn code = CheckRequest<Row>(request); code != KERN_SUCCESS) {
      return wire::StoreReturnCode(reply, code);
    }
    if constexpr (Row::kComplexReply) {
      // Kept: these stand before the routine has answered, and also when it fails.
      constexpr std::array<std::uint8_t, 4> kFlags{1, 1, 0, wire::kOutOfLineDescriptorType};
      wire::Store(reply + kDescriptorFlags, kFlags);
    }
    OutOfLineResult result;
    const KernReturn code = Call<Row, Routine>(request, reply, result);
    if (code != KERN_SUCCESS) return wire::StoreReturnCode(reply, code);

    auto header = wire::Load<wire::MessageHeader>(reply);
    header.size = Row::kReplySize;
    if constexpr (Row::kComplexReply) {
      header.bits |= wire::kComplexBit;
      CompleteOutOfLineReply(reply, result);
    } else if constexpr ((std::is_same_v<Traits, RelyOnPreparedNdr> || ...)) {
      wire::Store(reply + wire::kReplyCodeOffset, code);
    } else {
      wire::StoreReturnCode(reply, code);
    }
    wire::Store(reply, header);
  }

  static constexpr std::int32_t kId = Row::kId;
  static constexpr platform::MigRoutineDescriptor kDescriptor{
      .stub = Stub, .argumentCount = Row::kArgumentCount, .maxReplySize = Row::kMaxReplySize};
};
