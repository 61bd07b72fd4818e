// SPDX-License-Identifier: Apache-2.0
//
// halvecctl lasd: start a check for LASD databases, watch its outcome, show what is installed.
#include <chrono>
#include <cstdio>
#include <filesystem>
#include <map>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "Helper/Platform/PropertyList.h"
#include "Helper/Shared/Interface/LASD.h"
#include "Helper/Shared/Interface/OneWayMessage.h"
#include "Helper/Shared/Interface/Requests.h"
#include "Tools/halvecctl/Command.h"
#include "Tools/halvecctl/Input.h"
#include "Tools/halvecctl/Json.h"
#include "Tools/halvecctl/PublishedPort.h"

namespace halvecctl {
namespace {

using platform::PropertyList;
using Clock = std::chrono::steady_clock;

constexpr double kPatienceSeconds = 600;
constexpr double kLongestPatienceSeconds = 4'000'000;

enum class Outcome { kInstalled, kCurrent, kFailed };

const char* Word(Outcome outcome) {
  switch (outcome) {
    case Outcome::kInstalled:
      return "installed";
    case Outcome::kCurrent:
      return "up to date";
    case Outcome::kFailed:
      break;
  }
  return "failed";
}

std::vector<LASDDatabaseType> ParseTypes(const std::optional<std::string>& list) {
  if (!list) return {kLASDTypesInOrder.begin(), kLASDTypesInOrder.end()};
  std::vector<std::string> names{""};
  for (const char c : *list) {
    if (c == ',') {
      names.emplace_back();
    } else {
      names.back() += c;
    }
  }
  std::vector<LASDDatabaseType> types;
  for (const LASDDatabaseType type : kLASDTypesInOrder) {
    if (std::erase(names, typeName(type)) > 0) types.push_back(type);
  }
  if (!names.empty()) {
    throw UsageFailure("'" + names.front() + "' is none of gsm, umts, cdma, lte and scdma");
  }
  return types;
}

void Trigger(halvec::HelperClient& client, std::uint32_t mask) {
  const halvec::Error error = client.call<requests::TriggerDatabaseUpdate>(mask).error();
  if (error.failed()) throw RequestFailure(error);
}

/// What one notification says about `type`; none when it is about something else.
std::optional<Outcome> OutcomeIn(const std::vector<std::byte>& datagram, LASDDatabaseType type) {
  const auto message = wire::DecodeOneWay(datagram);
  if (!message || message->id != kLASDNotificationId) return std::nullopt;
  const auto list = platform::ParsePropertyList(message->payload);
  if (!list) return std::nullopt;
  const PropertyList* event = list->find(kLASDNotificationKey);
  if (!event) return std::nullopt;
  if (*event == PropertyList(kLASDNoUpdateRequired)) return Outcome::kCurrent;
  if (*event == PropertyList(kLASDUpdateFailed)) return Outcome::kFailed;
  const PropertyList* name = list->find(kLASDTypeKey);
  const bool isThis =
      *event == PropertyList(kLASDUpdateAvailable) && name && *name == PropertyList(typeName(type));
  return isThis ? std::optional(Outcome::kInstalled) : std::nullopt;
}

/// One check per type, one after the other: a notification of failure does not name its type, and
/// nothing tells the end of a check of several.
ExitCode UpdateAndWait(const GlobalOptions& options, const std::vector<LASDDatabaseType>& types,
                       Clock::duration patience) {
  PublishedPort port(options.client.servicePath, kLASDNotificationPort);
  halvec::HelperClient client = Connect(options);
  ExitCode code = ExitCode::kDone;
  std::string json;
  for (const LASDDatabaseType type : types) {
    Trigger(client, BitOf(type));
    const Clock::time_point deadline = Clock::now() + patience;
    std::optional<Outcome> outcome;
    while (!outcome) outcome = OutcomeIn(port.receive(client.descriptor(), deadline), type);
    if (*outcome == Outcome::kFailed) code = ExitCode::kFailed;
    json += std::string(json.empty() ? "{" : ",") + JsonString(typeName(type)) + ":" +
            JsonString(Word(*outcome));
    if (options.json) continue;
    std::printf("%-5s  %s\n", typeName(type), Word(*outcome));
    std::fflush(stdout);
  }
  if (options.json) std::printf("%s}\n", json.c_str());
  return code;
}

ExitCode RunUpdate(const GlobalOptions& options, Words words) {
  const std::vector<LASDDatabaseType> types = ParseTypes(words.takeOptionWithValue("--types"));
  const bool wait = words.takeOption("--wait");
  const std::optional<std::string> within = words.takeOptionWithValue("--within");
  (void)words.takeAll(0, "");
  if (within && !wait) throw UsageFailure("--within is for --wait");
  const double patience = within ? ParseReal(*within) : kPatienceSeconds;
  if (!(patience >= 0) || patience > kLongestPatienceSeconds) {
    throw UsageFailure("'" + *within + "' is not a number of seconds from 0 to 4000000");
  }
  if (wait) {
    return UpdateAndWait(
        options, types,
        std::chrono::duration_cast<Clock::duration>(std::chrono::duration<double>(patience)));
  }
  std::uint32_t mask = 0;
  for (const LASDDatabaseType type : types) mask |= BitOf(type);
  halvec::HelperClient client = Connect(options);
  Trigger(client, mask);
  if (options.json) std::fputs("{\"code\":0,\"codeName\":\"KERN_SUCCESS\"}\n", stdout);
  return ExitCode::kDone;
}

/// The dictionary recorded for `type`; none without one.
std::optional<PropertyList> Recorded(halvec::HelperClient& client, LASDDatabaseType type) {
  const halvec::Result<halvec::Data> value =
      client.call<requests::CopyPreferenceValue>(kLASDDomain, typeName(type));
  if (!value) throw RequestFailure(value.error());
  auto list = platform::ParsePropertyList((*value).bytes());
  if (list && !list->dictionary()) list.reset();
  return list;
}

/// The files in the directory and their sizes; none where there is no directory to be read.
std::map<std::string, std::uintmax_t> InstalledFiles() {
  std::map<std::string, std::uintmax_t> files;
  std::error_code error;
  for (std::filesystem::directory_iterator at(kLASDDirectory, error), end; !error && at != end;
       at.increment(error)) {
    std::error_code unreadable;  // a file that has just gone
    const std::uintmax_t size = at->file_size(unreadable);
    if (!unreadable) files.emplace(at->path().filename(), size);
  }
  return files;
}

/// The text of `key`, a dash without one.
std::string ShownText(const PropertyList& entry, std::string_view key) {
  const PropertyList* value = entry.find(key);
  return value && value->string() ? Shown(*value->string()) : "-";
}

void PrintStatus(const std::map<LASDDatabaseType, std::optional<PropertyList>>& recorded,
                 const std::map<std::string, std::uintmax_t>& files) {
  for (const LASDDatabaseType type : kLASDTypesInOrder) {
    const std::optional<PropertyList>& entry = recorded.at(type);
    std::printf("%-5s  %s\n", typeName(type),
                entry ? ("version " + ShownText(*entry, kLASDVersionKey) + " from " +
                         ShownText(*entry, kLASDContentURLKey))
                            .c_str()
                      : "never installed");
  }
  for (const auto& [name, size] : files) {
    std::printf("%s/%s  %ju bytes\n", kLASDDirectory, Shown(name).c_str(), size);
  }
}

void PrintStatusJson(const std::map<LASDDatabaseType, std::optional<PropertyList>>& recorded,
                     const std::map<std::string, std::uintmax_t>& files) {
  std::string text = "{\"recorded\":{";
  for (const LASDDatabaseType type : kLASDTypesInOrder) {
    const std::optional<PropertyList>& entry = recorded.at(type);
    if (text.back() != '{') text += ',';
    text += JsonString(typeName(type)) + ":" + (entry ? JsonPropertyList(*entry) : "null");
  }
  text += "},\"files\":{";
  for (const auto& [name, size] : files) {
    if (text.back() != '{') text += ',';
    text += JsonString(name) + ":" + std::to_string(size);
  }
  std::printf("%s}}\n", text.c_str());
}

ExitCode RunStatus(const GlobalOptions& options, Words words) {
  (void)words.takeAll(0, "");
  halvec::HelperClient client = Connect(options);
  std::map<LASDDatabaseType, std::optional<PropertyList>> recorded;
  for (const LASDDatabaseType type : kLASDTypesInOrder) {
    recorded.emplace(type, Recorded(client, type));
  }
  const std::map<std::string, std::uintmax_t> files = InstalledFiles();
  options.json ? PrintStatusJson(recorded, files) : PrintStatus(recorded, files);
  return ExitCode::kDone;
}

ExitCode RunLasd(const GlobalOptions& options, Words words) {
  const std::optional<std::string> action = words.takeFirst();
  if (!action) throw UsageFailure("expected update or status; see halvecctl lasd --help");
  if (*action == "update") return RunUpdate(options, std::move(words));
  if (*action == "status") return RunStatus(options, std::move(words));
  throw UsageFailure("unknown action '" + *action + "'; see halvecctl lasd --help");
}

}  // namespace

constinit const Command kLasdCommand{
    "lasd", "update [--types TYPE,...] [--wait [--within S]] | status",
    "check for LASD databases, or show which are installed",
    "update   has the helper compare the recorded versions with the server's, install what\n"
    "         differs, and tell the telephony daemon. Does not wait for it.\n"
    "           --types TYPE,...  of gsm, umts, cdma, lte and scdma; all without it\n"
    "           --wait            check one type after the other and print what became of each:\n"
    "                             installed, up to date, or failed. Exits with 1 when one failed.\n"
    "                             This program then takes the telephony daemon's place as the one\n"
    "                             that is told, so it does not work while that daemon runs\n"
    "           --within S        give a type up after S seconds (600) and exit with 5\n"
    "status   prints the recorded version of each type and the files that are installed.\n",
    RunLasd};

}  // namespace halvecctl
