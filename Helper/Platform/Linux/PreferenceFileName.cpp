// SPDX-License-Identifier: Apache-2.0
//
// File names of preference domains: escaping, and a digest where the escaped form is too long.
#include "Helper/Platform/Linux/PreferenceFileName.h"

#include <algorithm>
#include <array>
#include <bit>
#include <cstddef>
#include <cstdint>

namespace platform {

namespace {

constexpr std::size_t kLongestName = 160;
constexpr std::size_t kKeptOfLongName = 80;
constexpr std::string_view kHexDigits = "0123456789ABCDEF";

// The leading bits of the fractional parts of the square roots of the first 8 primes, and of the
// cube roots of the first 64 (FIPS 180-4, sections 5.3.3 and 4.2.2).
constexpr std::array<std::uint32_t, 8> kFirstState{0x6a09e667, 0xbb67ae85, 0x3c6ef372, 0xa54ff53a,
                                                   0x510e527f, 0x9b05688c, 0x1f83d9ab, 0x5be0cd19};
constexpr std::array<std::uint32_t, 64> kRoundConstants{
    0x428a2f98, 0x71374491, 0xb5c0fbcf, 0xe9b5dba5, 0x3956c25b, 0x59f111f1, 0x923f82a4, 0xab1c5ed5,
    0xd807aa98, 0x12835b01, 0x243185be, 0x550c7dc3, 0x72be5d74, 0x80deb1fe, 0x9bdc06a7, 0xc19bf174,
    0xe49b69c1, 0xefbe4786, 0x0fc19dc6, 0x240ca1cc, 0x2de92c6f, 0x4a7484aa, 0x5cb0a9dc, 0x76f988da,
    0x983e5152, 0xa831c66d, 0xb00327c8, 0xbf597fc7, 0xc6e00bf3, 0xd5a79147, 0x06ca6351, 0x14292967,
    0x27b70a85, 0x2e1b2138, 0x4d2c6dfc, 0x53380d13, 0x650a7354, 0x766a0abb, 0x81c2c92e, 0x92722c85,
    0xa2bfe8a1, 0xa81a664b, 0xc24b8b70, 0xc76c51a3, 0xd192e819, 0xd6990624, 0xf40e3585, 0x106aa070,
    0x19a4c116, 0x1e376c08, 0x2748774c, 0x34b0bcb5, 0x391c0cb3, 0x4ed8aa4a, 0x5b9cca4f, 0x682e6ff3,
    0x748f82ee, 0x78a5636f, 0x84c87814, 0x8cc70208, 0x90befffa, 0xa4506ceb, 0xbef9a3f7, 0xc67178f2};

using State = std::array<std::uint32_t, 8>;
constexpr std::size_t kBlockLength = 64;

void Compress(State& state, std::string_view block) {
  std::array<std::uint32_t, 64> words{};
  for (std::size_t i = 0; i < kBlockLength; ++i) {
    words[i / 4] = words[i / 4] << 8 | static_cast<unsigned char>(block[i]);
  }
  for (std::size_t i = 16; i < words.size(); ++i) {
    const std::uint32_t early = words[i - 15];
    const std::uint32_t late = words[i - 2];
    words[i] = words[i - 16] + words[i - 7] +
               (std::rotr(early, 7) ^ std::rotr(early, 18) ^ (early >> 3)) +
               (std::rotr(late, 17) ^ std::rotr(late, 19) ^ (late >> 10));
  }
  auto [a, b, c, d, e, f, g, h] = state;
  for (std::size_t i = 0; i < words.size(); ++i) {
    const std::uint32_t first = h + (std::rotr(e, 6) ^ std::rotr(e, 11) ^ std::rotr(e, 25)) +
                                ((e & f) ^ (~e & g)) + kRoundConstants[i] + words[i];
    const std::uint32_t second =
        (std::rotr(a, 2) ^ std::rotr(a, 13) ^ std::rotr(a, 22)) + ((a & b) ^ (a & c) ^ (b & c));
    h = g;
    g = f;
    f = e;
    e = d + first;
    d = c;
    c = b;
    b = a;
    a = first + second;
  }
  const State after{a, b, c, d, e, f, g, h};
  for (std::size_t i = 0; i < state.size(); ++i) state[i] += after[i];
}

bool StandsForItself(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '-' ||
         c == '_' || c == '.';
}

}  // namespace

std::string Sha256Digits(std::string_view text) {
  std::string padded(text);
  padded.push_back('\x80');
  while (padded.size() % kBlockLength != kBlockLength - 8) padded.push_back('\0');
  for (int shift = 56; shift >= 0; shift -= 8) {
    padded.push_back(static_cast<char>(std::uint64_t{text.size()} * 8 >> shift));
  }
  State state = kFirstState;
  for (std::size_t at = 0; at < padded.size(); at += kBlockLength) {
    Compress(state, std::string_view(padded).substr(at, kBlockLength));
  }
  std::string digits;
  for (const std::uint32_t word : state) {
    for (int shift = 28; shift >= 0; shift -= 4) digits.push_back(kHexDigits[word >> shift & 0xF]);
  }
  return digits;
}

std::string PreferenceFileName(std::string_view domain) {
  if (domain.empty()) return "%";
  std::string name;
  for (const char c : domain) {
    if (StandsForItself(c) && !(c == '.' && name.empty())) {
      name.push_back(c);
    } else {
      const auto byte = static_cast<unsigned char>(c);
      name += {'%', kHexDigits[byte >> 4], kHexDigits[byte & 0xF]};
    }
  }
  if (name.size() <= kLongestName) return name;
  return name.substr(0, kKeptOfLongName) + "%~" + Sha256Digits(domain);
}

}  // namespace platform
