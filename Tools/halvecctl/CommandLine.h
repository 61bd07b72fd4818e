// SPDX-License-Identifier: Apache-2.0
//
// The words of the command line: options that every command has, and what remains for a command.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "Client/HelperClient.h"

namespace halvecctl {

/// What holds for every command.
struct GlobalOptions {
  bool json = false;
  bool help = false;
  bool version = false;
  halvec::ClientOptions client;
};

/// The words that are not global options. A word that begins with "--" is an option unless it
/// stands behind "--".
class Words {
 public:
  void add(std::string text, bool isOption) { words_.push_back({std::move(text), isOption}); }

  /// Removes the option `name` and tells whether it was there. Throws when it is there twice.
  [[nodiscard]] bool takeOption(std::string_view name);
  /// Removes the option `name` and the word behind it, which it gives. Throws without such a word.
  [[nodiscard]] std::optional<std::string> takeOptionWithValue(std::string_view name);
  /// Removes and gives the first word; none without one. Throws when it is an option.
  [[nodiscard]] std::optional<std::string> takeFirst();
  /// Gives the words, which must be of number `count`; `usage` names them. Throws on an option that
  /// nobody took.
  [[nodiscard]] std::vector<std::string> takeAll(std::size_t count, std::string_view usage);

 private:
  struct Word {
    std::string text;
    bool isOption;
  };
  std::vector<Word> words_;
};

/// Splits the command line. Throws Failure for a global option with a wrong value.
[[nodiscard]] Words ParseCommandLine(int count, char** arguments, GlobalOptions& options);

}  // namespace halvecctl
