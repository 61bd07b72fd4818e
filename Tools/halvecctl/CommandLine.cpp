// SPDX-License-Identifier: Apache-2.0
//
// Global options may stand anywhere before "--".
#include "Tools/halvecctl/CommandLine.h"

#include <algorithm>
#include <charconv>
#include <chrono>
#include <cmath>

#include "Tools/halvecctl/Exit.h"

namespace halvecctl {
namespace {

std::chrono::milliseconds ParseLimit(const std::string& text) {
  double seconds = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), seconds);
  constexpr double kLongest = 4'000'000;  // beyond it milliseconds leave 32 bits
  if (error != std::errc{} || end != text.data() + text.size() || !(seconds >= 0) ||
      seconds > kLongest) {
    throw UsageFailure("'" + text + "' is not a number of seconds from 0 to 4000000");
  }
  // A limit that is shorter than the clock's step is still a limit; 0 would mean none.
  return std::chrono::milliseconds(static_cast<long long>(std::ceil(seconds * 1000)));
}

}  // namespace

bool Words::takeOption(std::string_view name) {
  const auto erased =
      std::erase_if(words_, [&](const Word& word) { return word.isOption && word.text == name; });
  if (erased > 1) throw UsageFailure("option " + std::string(name) + " is given twice");
  return erased == 1;
}

std::optional<std::string> Words::takeOptionWithValue(std::string_view name) {
  const auto option = std::find_if(words_.begin(), words_.end(), [&](const Word& word) {
    return word.isOption && word.text == name;
  });
  if (option == words_.end()) return std::nullopt;
  const auto value = option + 1;
  if (value == words_.end() || value->isOption) {
    throw UsageFailure("option " + std::string(name) + " needs a value");
  }
  std::string text = value->text;
  words_.erase(option, value + 1);
  return text;
}

std::optional<std::string> Words::takeFirst() {
  if (words_.empty()) return std::nullopt;
  if (words_.front().isOption) throw UsageFailure("unknown option " + words_.front().text);
  std::string text = words_.front().text;
  words_.erase(words_.begin());
  return text;
}

std::vector<std::string> Words::takeAll(std::size_t count, std::string_view usage) {
  std::vector<std::string> texts;
  while (std::optional<std::string> text = takeFirst()) texts.push_back(std::move(*text));
  if (texts.size() != count) {
    throw UsageFailure("expected " + (usage.empty() ? "no arguments" : std::string(usage)) +
                       ", got " + std::to_string(texts.size()) + " argument" +
                       (texts.size() == 1 ? "" : "s"));
  }
  return texts;
}

Words ParseCommandLine(int count, char** arguments, GlobalOptions& options) {
  Words words;
  bool literal = false;
  for (int index = 1; index < count; ++index) {
    std::string word = arguments[index];
    if (!literal && word == "--") {
      literal = true;
      continue;
    }
    words.add(std::move(word), !literal && std::string_view(arguments[index]).starts_with("--"));
  }
  options.json = words.takeOption("--json");
  options.help = words.takeOption("--help");
  options.version = words.takeOption("--version");
  if (const auto limit = words.takeOptionWithValue("--timeout")) {
    options.client.connectLimit = options.client.requestLimit = ParseLimit(*limit);
  }
  if (auto path = words.takeOptionWithValue("--service")) {
    options.client.servicePath = std::move(*path);
  }
  return words;
}

}  // namespace halvecctl
