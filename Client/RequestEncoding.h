// SPDX-License-Identifier: Apache-2.0
//
// Turns the arguments of a call into the bytes of its request and the bytes of a reply into its
// result, for any row of the request catalogue. Types decide everything; no state, any thread.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <span>
#include <string>
#include <string_view>
#include <tuple>
#include <type_traits>
#include <utility>

#include "Client/Data.h"
#include "Client/Result.h"
#include "Helper/Shared/Interface/Requests.h"

namespace halvec {

namespace detail {

template <class Field>
struct ArgumentOf;
template <std::size_t Size>
struct ArgumentOf<wire::Text<Size>> {
  using Type = std::string_view;
};
template <>
struct ArgumentOf<wire::Integer> {
  using Type = std::int32_t;
};
template <>
struct ArgumentOf<wire::Mask> {
  using Type = std::uint32_t;
};
template <>
struct ArgumentOf<wire::Real> {
  using Type = double;
};
template <>
struct ArgumentOf<wire::OutOfLine> {
  using Type = std::span<const std::byte>;
};

template <class Field>
struct ResultOf;
template <std::size_t Size>
struct ResultOf<wire::Text<Size>> {
  using Type = std::string;
};
template <>
struct ResultOf<wire::Flag> {
  using Type = bool;
};
template <>
struct ResultOf<wire::OutOfLine> {
  using Type = Data;
};

template <class Fields>
struct ArgumentsOf;
template <class... Fields>
struct ArgumentsOf<std::tuple<Fields...>> {
  using Type = std::tuple<typename ArgumentOf<Fields>::Type...>;
};

template <class Fields>
struct ResultsOf;
template <>
struct ResultsOf<std::tuple<>> {
  using Type = void;
};
template <class Field>
struct ResultsOf<std::tuple<Field>> {
  using Type = typename ResultOf<Field>::Type;
};

}  // namespace detail

/// What a call of `Row` takes, in the row's order: std::string_view for a text, std::int32_t,
/// std::uint32_t for a set of bits, double, std::span<const std::byte> for out-of-line data.
template <class Row>
using Arguments = typename detail::ArgumentsOf<typename Row::InputFields>::Type;

/// What a call of `Row` gives: void, std::string for a text, bool for a flag, Data for data.
template <class Row>
using ResultValue = typename detail::ResultsOf<typename Row::OutputFields>::Type;

namespace detail {

/// Writes a text and zeros up to the end of its slot, so that nothing else of this process leaves
/// with it. A text that the slot cannot hold whole, with its zero, is an error: nothing is cut.
template <std::size_t Size>
[[nodiscard]] Error EncodeField(std::byte* slot, std::string_view text, const wire::Text<Size>*) {
  if (text.size() >= Size) return {HVMH_TOO_LARGE};
  if (text.find('\0') != std::string_view::npos) return {HVMH_INVALID_ARGUMENT};
  if (!text.empty()) std::memcpy(slot, text.data(), text.size());
  std::memset(slot + text.size(), 0, Size - text.size());
  return {};
}

/// The byte count stands in the field; the data itself travels behind the message or beside it.
[[nodiscard]] inline Error EncodeField(std::byte* slot, std::span<const std::byte> data,
                                       const wire::OutOfLine*) {
  wire::Store(slot, static_cast<std::uint32_t>(data.size()));
  return {};
}

template <class Field, class Value>
requires std::is_arithmetic_v<Value>
[[nodiscard]] Error EncodeField(std::byte* slot, Value value, const Field*) {
  static_assert(sizeof(Field) == sizeof(Value));
  wire::Store(slot, value);
  return {};
}

template <class Argument>
void KeepOutOfLine(std::span<const std::byte>& data, const Argument& argument) {
  if constexpr (std::is_same_v<Argument, std::span<const std::byte>>) data = argument;
}

}  // namespace detail

/// The bytes of a request, without header bits that depend on how the data travels.
template <class Row>
struct EncodedRequest {
  std::array<std::byte, Row::kRequestSize> message;
  std::span<const std::byte> outOfLine;

  /// Fills in everything. HVMH_TOO_LARGE or HVMH_INVALID_ARGUMENT for a text that cannot travel.
  [[nodiscard]] Error encode(const Arguments<Row>& arguments) {
    wire::MessageHeader header;
    header.bits = Row::kComplexRequest ? wire::kComplexBit : 0;
    header.size = Row::kRequestSize;
    header.id = Row::kId;
    wire::Store(message.data(), header);
    if constexpr (std::tuple_size_v<Arguments<Row>> != 0) {
      constexpr std::size_t kNdrOffset =
          wire::detail::FieldStart(Row::kComplexRequest) - wire::kNdrSize;
      wire::Store(message.data() + kNdrOffset, wire::kNdrRecord);
    }
    Error error =
        encodeFields(arguments, std::make_index_sequence<std::tuple_size_v<Arguments<Row>>>{});
    if (Row::kComplexRequest && !error.failed()) encodeDescriptor();
    return error;
  }

 private:
  template <std::size_t... Index>
  Error encodeFields(const Arguments<Row>& arguments, std::index_sequence<Index...>) {
    Error error;
    // Stops at the first field that fails.
    (void)(... && !(error = detail::EncodeField(
                        message.data() + Row::kInputOffsets[Index], std::get<Index>(arguments),
                        static_cast<const std::tuple_element_t<Index, typename Row::InputFields>*>(
                            nullptr)))
                       .failed());
    (detail::KeepOutOfLine(outOfLine, std::get<Index>(arguments)), ...);
    return error;
  }

  /// One out-of-line descriptor; the address is written when it is known how the data travels.
  void encodeDescriptor() {
    wire::Store(message.data() + wire::kDescriptorCountOffset, std::uint32_t{1});
    std::byte* descriptor = message.data() + wire::kFirstDescriptorOffset;
    std::memset(descriptor, 0, wire::kOutOfLineDescriptorSize);
    constexpr std::size_t kCopyOffset = 9;
    wire::Store(descriptor + kCopyOffset, std::uint8_t{1});
    wire::Store(descriptor + wire::kDescriptorTypeOffset, wire::kOutOfLineDescriptorType);
    wire::Store(descriptor + wire::kOutOfLineCountOffset,
                static_cast<std::uint32_t>(outOfLine.size()));
  }
};

/// The result in a reply that was found well-formed. `data` is what travelled out of line.
template <class Row>
[[nodiscard]] ResultValue<Row> DecodeResult(const std::byte* reply, Data& data) {
  if constexpr (std::is_same_v<ResultValue<Row>, Data>) {
    return std::move(data);
  } else if constexpr (std::is_same_v<ResultValue<Row>, bool>) {
    // Only the lowest byte is the boolean; the others are unspecified.
    return (wire::Load<std::uint32_t>(reply + Row::kOutputOffsets[0]) & 0xff) != 0;
  } else {
    using Field = std::tuple_element_t<0, typename Row::OutputFields>;
    // A result that fills its slot has no zero, and its last byte counts.
    const auto field = wire::Load<Field>(reply + Row::kOutputOffsets[0]);
    return std::string(field.bytes.data(), ::strnlen(field.bytes.data(), Field::kSize));
  }
}

}  // namespace halvec
