// SPDX-License-Identifier: Apache-2.0
//
// The command line of `handset run`. Pure parsing; one thread, no lock.
#pragma once

#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace handset {

struct RunOptions {
  std::string helper;                 ///< Host path of the helper; empty: none given.
  bool verbose = false;               ///< Show log lines and helper starts on standard error.
  std::string logFile;                ///< Host path, appended to; empty: none.
  std::string eventsFile;             ///< Host path, appended to; empty: none.
  std::string stateDirectory;         ///< Host folder that keeps the handset's data; empty: none.
  std::string user = "root";          ///< Whom the command runs as.
  std::string environmentUser;        ///< Whose clean environment it gets; empty: the caller's.
  std::optional<unsigned> queue;      ///< Datagrams that a named port queues; none: kernel's own.
  std::string webDirectory;           ///< Host folder that the web serves; empty: no web.
  std::vector<std::string> webHosts;  ///< The web's names; empty: no web.
  bool hasNetwork = true;             ///< The links to the world are there from the start.
  bool hasTelephony = true;           ///< The stand-in telephony daemon runs from the start.
  std::vector<std::pair<std::string, std::string>> binds;     ///< Host path, path inside.
  std::vector<std::pair<std::string, std::string>> installs;  ///< Host path, name inside.
  std::vector<std::string> command;                           ///< Never empty.
};

/// What follows `handset run`. Throws Failure with kStatusUsage where it does not parse.
[[nodiscard]] RunOptions ParseRunOptions(const std::vector<std::string>& arguments);

/// Takes the options off `arguments`, one at a time. An option's value is the next argument or
/// follows a '=' in the same one.
class OptionReader {
 public:
  explicit OptionReader(std::vector<std::string> arguments) : arguments_(std::move(arguments)) {}

  /// The next option ("--name"), or nothing at the first argument that is none, or after "--".
  [[nodiscard]] std::optional<std::string> nextOption();
  /// The value of the option just read; throws Failure where there is none.
  [[nodiscard]] std::string value();
  /// Everything that is left; throws Failure where the option just read had a value it takes not.
  [[nodiscard]] std::vector<std::string> rest();

 private:
  void refuseUnusedValue() const;

  std::vector<std::string> arguments_;
  std::size_t next_ = 0;
  std::string option_;
  std::optional<std::string> attached_;
};

/// `text` as a number of seconds, fractions allowed, as milliseconds; throws Failure.
[[nodiscard]] int Milliseconds(const std::string& text);

/// `text` as a whole number; throws Failure.
[[nodiscard]] unsigned WholeNumber(const std::string& text);

/// Throws Failure with kStatusUsage.
[[noreturn]] void RefuseUsage(const std::string& text);

}  // namespace handset
