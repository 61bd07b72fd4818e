// SPDX-License-Identifier: Apache-2.0
//
// Property-list codec against a bare expat pass over the same bytes, and the writers' throughput.
// The two sides of a comparison take turns; each figure is the median of many turns. One thread.
#include <expat.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <span>
#include <string>
#include <vector>

#include "Helper/Platform/PropertyList.h"

namespace {

using platform::PropertyList;
using Clock = std::chrono::steady_clock;

template <class Work>
double MillisecondsOf(const Work& work) {
  const Clock::time_point start = Clock::now();
  work();
  return std::chrono::duration<double, std::milli>(Clock::now() - start).count();
}

double Median(std::vector<double> values) {
  std::nth_element(values.begin(), values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2),
                   values.end());
  return values[values.size() / 2];
}

// What every reader on top of expat pays at least: the events, delivered and ignored.
void BareExpatPass(const std::string& text) {
  XML_Parser parser = XML_ParserCreate(nullptr);
  XML_SetElementHandler(
      parser, [](void*, const XML_Char*, const XML_Char**) {}, [](void*, const XML_Char*) {});
  XML_SetCharacterDataHandler(parser, [](void*, const XML_Char*, int) {});
  if (XML_Parse(parser, text.data(), static_cast<int>(text.size()), XML_TRUE) != XML_STATUS_OK) {
    std::puts("expat refused the sample");
  }
  XML_ParserFree(parser);
}

PropertyList Settings(int groups) {
  PropertyList::Dictionary root;
  for (int group = 0; group < groups; ++group) {
    PropertyList::Dictionary settings;
    settings.set("CarrierName", "Zarvo & Sons, group " + std::to_string(group));
    settings.set("Enabled", group % 2 == 0);
    settings.set("RetryCount", group);
    settings.set("RetryDelay", group * 0.37);
    settings.set("UpdatedAt", PropertyList::Date{600'000'000.0 + group});
    settings.set("Numbers", PropertyList::Array{"+15550100", "+15550101", 911, 112});
    settings.set("Token", PropertyList::Data(32, static_cast<std::byte>(group)));
    root.set("Group" + std::to_string(group), std::move(settings));
  }
  return root;
}

PropertyList Texts(int count) {
  PropertyList::Array texts;
  const std::string line(2000, 'x');
  for (int i = 0; i < count; ++i) texts.emplace_back(line + std::to_string(i));
  return texts;
}

PropertyList Integers(int count) {
  PropertyList::Array numbers;
  for (int i = 0; i < count; ++i) numbers.emplace_back(i * 7919L);
  return numbers;
}

PropertyList FlatKeys(int count) {
  PropertyList::Dictionary keys;
  for (int i = 0; i < count; ++i) keys.set("key-" + std::to_string((i * 7919L) % 1'000'003), true);
  return keys;
}

PropertyList Blob(std::size_t length) {
  PropertyList::Data data(length);
  for (std::size_t i = 0; i < length; ++i) data[i] = static_cast<std::byte>(i * 131);
  return data;
}

void Compare(const char* name, const PropertyList& value) {
  constexpr int kTurns = 15;
  const auto xml = platform::SerializeXml(value);
  const auto binary = platform::SerializeBinary(value);
  if (!xml || !binary) {
    std::printf("%-16s cannot be written\n", name);
    return;
  }
  const auto xmlBytes = std::as_bytes(std::span(*xml));
  std::vector<double> bare, parse, write, parseBinary, writeBinary;
  for (int turn = 0; turn < kTurns; ++turn) {
    bare.push_back(MillisecondsOf([&] { BareExpatPass(*xml); }));
    std::optional<PropertyList> kept;
    parse.push_back(MillisecondsOf([&] { kept = platform::ParsePropertyList(xmlBytes); }));
    if (!kept || *kept != value) std::puts("parsed value differs");
    std::optional<std::string> text;
    write.push_back(MillisecondsOf([&] { text = platform::SerializeXml(value); }));
    parseBinary.push_back(MillisecondsOf([&] { kept = platform::ParsePropertyList(*binary); }));
    std::optional<std::vector<std::byte>> bytes;
    writeBinary.push_back(MillisecondsOf([&] { bytes = platform::SerializeBinary(value); }));
  }
  const double megabytes = static_cast<double>(xml->size()) / 1e6;
  std::printf(
      "%-16s xml %6.2f MB, binary %6.2f MB | parse/expat %.2f (%.0f MB/s) | write xml %.0f MB/s | "
      "binary of the same: parse %.0f MB/s, write %.0f MB/s of XML\n",
      name, megabytes, static_cast<double>(binary->size()) / 1e6, Median(parse) / Median(bare),
      megabytes / Median(parse) * 1e3, megabytes / Median(write) * 1e3,
      megabytes / Median(parseBinary) * 1e3, megabytes / Median(writeBinary) * 1e3);
}

}  // namespace

int main() {
  std::puts("property lists (goals: parse/expat at most 1.50, write xml at least 300 MB/s)");
  Compare("settings small", Settings(2));
  Compare("settings", Settings(12'000));
  Compare("long texts", Texts(4000));
  Compare("integers", Integers(300'000));
  Compare("flat keys", FlatKeys(200'000));
  Compare("data", Blob(9'000'000));
  return 0;
}
