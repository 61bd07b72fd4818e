// SPDX-License-Identifier: Apache-2.0
//
// The command line of `handset run`. Pure parsing; one thread, no lock.
#include "Tools/handset/Options.h"

#include <charconv>
#include <cmath>

#include "Tools/handset/Failure.h"
#include "Tools/handset/Files.h"

namespace handset {
namespace {

/// Splits at the first colon; without one both sides are the same text.
std::pair<std::string, std::string> Pair(const std::string& text) {
  const std::size_t colon = text.find(':');
  if (colon == std::string::npos) return {text, text};
  return {text.substr(0, colon), text.substr(colon + 1)};
}

void CompleteWeb(RunOptions& options) {
  if (options.webDirectory.empty()) {
    if (!options.webHosts.empty()) RefuseUsage("--web-host needs --web");
    return;
  }
  if (!options.hasNetwork) RefuseUsage("--web needs the network");
  if (options.webHosts.empty()) options.webHosts.emplace_back(HALVEC_MANIFEST_HOST);
}

}  // namespace

void RefuseUsage(const std::string& text) {
  throw Failure(text + " (try: handset --help)", kStatusUsage);
}

unsigned WholeNumber(const std::string& text) {
  unsigned value = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
  if (error != std::errc{} || end != text.data() + text.size()) {
    RefuseUsage("not a whole number: " + text);
  }
  return value;
}

int Milliseconds(const std::string& text) {
  double seconds = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), seconds);
  constexpr double kMostSeconds = 1e6;
  if (error != std::errc{} || end != text.data() + text.size() || !(seconds >= 0) ||
      seconds > kMostSeconds) {
    RefuseUsage("not a number of seconds: " + text);
  }
  return static_cast<int>(std::ceil(seconds * 1000));
}

std::optional<std::string> OptionReader::nextOption() {
  refuseUnusedValue();
  if (next_ >= arguments_.size()) return std::nullopt;
  const std::string& argument = arguments_[next_];
  if (argument == "--") {
    ++next_;
    return std::nullopt;
  }
  if (!argument.starts_with("--")) return std::nullopt;
  ++next_;
  const std::size_t equals = argument.find('=');
  option_ = argument.substr(0, equals);
  if (equals != std::string::npos) attached_ = argument.substr(equals + 1);
  return option_;
}

std::string OptionReader::value() {
  if (attached_) {
    std::string value = *std::move(attached_);
    attached_.reset();
    return value;
  }
  if (next_ >= arguments_.size()) RefuseUsage(option_ + " needs a value");
  return arguments_[next_++];
}

std::vector<std::string> OptionReader::rest() {
  refuseUnusedValue();
  return {arguments_.begin() + static_cast<std::ptrdiff_t>(next_), arguments_.end()};
}

void OptionReader::refuseUnusedValue() const {
  if (attached_) RefuseUsage(option_ + " takes no value");
}

RunOptions ParseRunOptions(const std::vector<std::string>& arguments) {
  RunOptions options;
  OptionReader reader(arguments);
  while (const auto option = reader.nextOption()) {
    if (*option == "--helper") {
      options.helper = reader.value();
    } else if (*option == "--verbose") {
      options.verbose = true;
    } else if (*option == "--log") {
      options.logFile = reader.value();
    } else if (*option == "--events") {
      options.eventsFile = reader.value();
    } else if (*option == "--state") {
      options.stateDirectory = reader.value();
    } else if (*option == "--user") {
      options.user = reader.value();
    } else if (*option == "--env-as") {
      options.environmentUser = reader.value();
    } else if (*option == "--web") {
      options.webDirectory = reader.value();
    } else if (*option == "--web-host") {
      options.webHosts.push_back(reader.value());
    } else if (*option == "--no-network") {
      options.hasNetwork = false;
    } else if (*option == "--no-telephony") {
      options.hasTelephony = false;
    } else if (*option == "--queue") {
      options.queue = WholeNumber(reader.value());
    } else if (*option == "--bind") {
      options.binds.push_back(Pair(reader.value()));
      if (!options.binds.back().second.starts_with('/')) {
        RefuseUsage("--bind needs an absolute path inside the handset");
      }
    } else if (*option == "--install") {
      const std::string value = reader.value();
      options.installs.push_back(Pair(value));
      if (value.find(':') == std::string::npos) {
        options.installs.back().second = LastComponent(value);
      }
    } else {
      RefuseUsage("unknown option " + *option);
    }
  }
  CompleteWeb(options);
  options.command = reader.rest();
  if (options.command.empty()) RefuseUsage("run needs a command");
  return options;
}

}  // namespace handset
