// SPDX-License-Identifier: Apache-2.0
//
// The vocabulary of a request row: field types, In<>, Out<> and Request<>, from which exact sizes,
// offsets and argument counts follow at compile time. Types only; no thread, no state.
#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>
#include <tuple>
#include <utility>

#include "Helper/Shared/Interface/Message.h"

namespace wire {

/// A zero-terminated UTF-8 text in a fixed slot of `Size` bytes. The zero may be missing on the
/// wire: read it with view().
template <std::size_t Size>
struct Text {
  static constexpr std::size_t kSize = Size;
  std::array<char, Size> bytes;

  /// The text up to its zero, or, where none stands, up to the last byte but one.
  [[nodiscard]] std::string_view view() const {
    return {bytes.data(), ::strnlen(bytes.data(), Size - 1)};
  }
};

/// A signed 32-bit integer.
struct Integer {
  std::int32_t value;
};
/// A 32-bit set of bits.
struct Mask {
  std::uint32_t value;
};
/// A 64-bit floating-point number; counts as two arguments.
struct Real {
  double value;
};
/// A 32-bit result whose lowest byte is a boolean.
struct Flag {
  std::uint32_t value;
};
/// Bytes outside the message: a descriptor before the NDR record, the byte count in its own slot.
struct OutOfLine {
  std::uint32_t byteCount;
};

/// A text that is a template argument.
template <std::size_t Size>
struct FixedString {
  std::array<char, Size> bytes{};
  consteval FixedString(const char (&text)[Size]) {  // NOLINT: implicit from a literal by design
    std::copy_n(text, Size, bytes.begin());
  }
  [[nodiscard]] constexpr std::string_view view() const { return {bytes.data(), Size - 1}; }
};

/// One field with the name that people see.
template <FixedString Name, class Field>
struct Arg {
  using Type = Field;
  static constexpr std::string_view kName = Name.view();
};

template <class... Args>
struct In {};
template <class... Args>
struct Out {};

template <class T>
inline constexpr bool kIsText = false;
template <std::size_t Size>
inline constexpr bool kIsText<Text<Size>> = true;

namespace detail {

template <class Field>
inline constexpr std::uint32_t kArgumentsOf =
    std::is_same_v<Field, Real> || std::is_same_v<Field, OutOfLine> ? 2 : 1;

/// Places fields one behind the other from `start` and gives each one's offset; the last element is
/// the end.
template <class... Fields>
constexpr std::array<std::size_t, sizeof...(Fields) + 1> Offsets(std::size_t start) {
  std::array<std::size_t, sizeof...(Fields) + 1> offsets{};
  std::size_t index = 0;
  ((offsets[index++] = start, start += sizeof(Fields)), ...);
  offsets[index] = start;
  return offsets;
}

/// Header, and where bytes travel outside the message the descriptor part, then the NDR record.
constexpr std::size_t FieldStart(bool complex) {
  return (complex ? kFirstDescriptorOffset + kOutOfLineDescriptorSize : sizeof(MessageHeader)) +
         kNdrSize;
}

}  // namespace detail

template <std::int32_t Id, FixedString Name, class Inputs, class Outputs>
struct Request;

/// One request: its id, its name, what goes in, what comes out. Everything else is derived.
template <std::int32_t Id, FixedString Name, class... InArgs, class... OutArgs>
struct Request<Id, Name, In<InArgs...>, Out<OutArgs...>> {
  static constexpr std::int32_t kId = Id;
  static constexpr std::string_view kName = Name.view();
  using InputFields = std::tuple<typename InArgs::Type...>;
  using OutputFields = std::tuple<typename OutArgs::Type...>;
  static constexpr std::array<std::string_view, sizeof...(InArgs)> kInputNames{InArgs::kName...};
  static constexpr std::array<std::string_view, sizeof...(OutArgs)> kOutputNames{OutArgs::kName...};

  static constexpr std::size_t kOutOfLineInputs =
      (std::size_t{0} + ... + std::size_t{std::is_same_v<typename InArgs::Type, OutOfLine>});
  static constexpr std::size_t kOutOfLineOutputs =
      (std::size_t{0} + ... + std::size_t{std::is_same_v<typename OutArgs::Type, OutOfLine>});
  static_assert(kOutOfLineInputs <= 1 && kOutOfLineOutputs <= 1);
  static constexpr bool kComplexRequest = kOutOfLineInputs == 1;
  static constexpr bool kComplexReply = kOutOfLineOutputs == 1;
  static_assert(!kComplexReply || sizeof...(OutArgs) == 1);

  /// Offsets of the inputs in the request; the element behind the last is the exact size.
  static constexpr auto kInputOffsets =
      detail::Offsets<typename InArgs::Type...>(detail::FieldStart(kComplexRequest));
  /// Offsets of the results in a successful reply; the element behind the last is its exact size.
  /// Results follow the return code, except that a complex reply carries no code.
  static constexpr auto kOutputOffsets = detail::Offsets<typename OutArgs::Type...>(
      kComplexReply ? detail::FieldStart(true) : kErrorReplySize);

  static constexpr std::uint32_t kRequestSize =
      sizeof...(InArgs) == 0 ? std::uint32_t{sizeof(MessageHeader)}
                             : static_cast<std::uint32_t>(kInputOffsets[sizeof...(InArgs)]);
  static constexpr std::uint32_t kReplySize =
      static_cast<std::uint32_t>(kOutputOffsets[sizeof...(OutArgs)]);
  static constexpr std::uint32_t kMaxReplySize = std::max(kReplySize, kErrorReplySize);
  /// The port, the inputs and the results, counted as the routine's descriptor counts them.
  static constexpr std::uint32_t kArgumentCount =
      (1 + ... + detail::kArgumentsOf<typename InArgs::Type>)+(
          0 + ... + detail::kArgumentsOf<typename OutArgs::Type>);
};

}  // namespace wire
