// SPDX-License-Identifier: Apache-2.0
//
// Random values and random damage. Draws with the remainder rather than a distribution, which may
// differ from one standard library to the next.
#include "Tests/PropertyList/RandomPropertyList.h"

#include <algorithm>
#include <array>
#include <bit>
#include <cmath>
#include <string_view>

namespace property_list_test {

namespace {

using platform::PropertyList;

std::string RandomText(Random& random) {
  constexpr std::array<std::string_view, 12> kPieces{
      "a",  "Zarvo",     " ", "&", "<", ">", "\"", "\xC3\xA9", "\xE2\x82\xAC", "\xF0\x9F\x98\x80",
      "\n", "0123456789"};
  std::string text;
  for (std::uint64_t left = random() % 9; left > 0; --left) {
    text += kPieces[random() % kPieces.size()];
  }
  return text;
}

double RandomReal(Random& random) {
  if (random() % 2 == 0) return static_cast<double>(random() % 10'000) / 8;
  const double real = std::bit_cast<double>(random());
  return std::isnan(real) ? 0.5 : real;
}

}  // namespace

PropertyList RandomPropertyList(Random& random, int depth) {
  switch (random() % (depth > 0 ? 12 : 8)) {
    case 0:
      return random() % 2 == 0;
    case 1:
      return static_cast<std::int64_t>(random() >> (random() % 64));
    case 2:
      return static_cast<std::int64_t>(random());
    case 3:
      return random();
    case 4:
      return RandomReal(random);
    case 5: {
      PropertyList::Data data(random() % 40);
      std::generate(data.begin(), data.end(), [&] { return static_cast<std::byte>(random()); });
      return data;
    }
    case 6: {
      constexpr std::int64_t kFirst = -63'082'281'600;  // 0002-01-01
      return PropertyList::Date{
          static_cast<double>(kFirst + static_cast<std::int64_t>(random() % 315'000'000'000))};
    }
    case 7:
      return RandomText(random);
    case 8:
    case 9: {
      PropertyList::Array items;
      for (std::uint64_t left = random() % 6; left > 0; --left) {
        items.push_back(RandomPropertyList(random, depth - 1));
      }
      return items;
    }
    default: {
      PropertyList::Dictionary entries;
      for (std::uint64_t left = random() % 20; left > 0; --left) {
        entries.set(RandomText(random), RandomPropertyList(random, depth - 1));
      }
      return entries;
    }
  }
}

std::string Mutated(std::string text, Random& random) {
  for (std::uint64_t left = 1 + random() % 3; left > 0 && !text.empty(); --left) {
    const std::size_t at = random() % text.size();
    const std::size_t length = std::min<std::size_t>(1 + random() % 8, text.size() - at);
    switch (random() % 5) {
      case 0:
        text[at] = static_cast<char>(random());
        break;
      case 1:
        text[at] = static_cast<char>(text[at] ^ (1 << random() % 8));
        break;
      case 2:
        text.erase(at, length);
        break;
      case 3:
        text.insert(random() % text.size(), text.substr(at, length));
        break;
      default:
        std::swap(text[at], text[random() % text.size()]);
        break;
    }
  }
  return text;
}

}  // namespace property_list_test
