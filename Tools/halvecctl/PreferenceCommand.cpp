// SPDX-License-Identifier: Apache-2.0
//
// halvecctl preference: set, get and remove one preference value. Values travel as property lists.
#include <algorithm>
#include <array>
#include <cstdio>
#include <limits>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "Helper/Platform/PropertyList.h"
#include "Helper/Shared/Interface/Requests.h"
#include "Tools/halvecctl/Command.h"
#include "Tools/halvecctl/Input.h"
#include "Tools/halvecctl/Json.h"

namespace halvecctl {
namespace {

using platform::PropertyList;

void Print(std::string_view text) { std::fwrite(text.data(), 1, text.size(), stdout); }

PropertyList ParseValue(const std::string& text, std::string_view type) {
  if (type == "--integer") {
    constexpr std::int64_t kLeast = std::numeric_limits<std::int64_t>::min();
    if (text.starts_with('-')) return ParseInteger(text, kLeast, 0);
    return ParseUnsigned(text, std::numeric_limits<std::uint64_t>::max(), std::to_string(kLeast));
  }
  if (type == "--real") return ParseReal(text);
  if (type == "--boolean") {
    if (text != "true" && text != "false") {
      throw UsageFailure("'" + text + "' is neither true nor false");
    }
    return text == "true";
  }
  return text;
}

/// The bytes of a property list for a set.
std::vector<std::byte> Serialize(const PropertyList& value) {
  const std::optional<std::string> xml = platform::SerializeXml(value);
  if (!xml) throw UsageFailure("this value has no property-list form; texts must be plain UTF-8");
  const auto bytes = std::as_bytes(std::span(*xml));
  return {bytes.begin(), bytes.end()};
}

std::vector<std::byte> ReadPropertyListFile(const std::string& path) {
  std::vector<std::byte> bytes = ReadInput(path);
  // Judged here, because the helper can only answer with a code, and because a file of one byte
  // would remove the key.
  std::string reason;
  if (!platform::ParsePropertyList(bytes, &reason)) {
    throw UsageFailure((path == "-" ? "standard input" : path) +
                       " is not a property list: " + reason);
  }
  return bytes;
}

ExitCode RunSet(const GlobalOptions& options, Words words) {
  std::vector<std::string_view> types;
  for (const std::string_view type : {"--string", "--integer", "--real", "--boolean"}) {
    if (words.takeOption(type)) types.push_back(type);
  }
  const std::optional<std::string> file = words.takeOptionWithValue("--plist");
  if (types.size() + (file ? 1 : 0) > 1) throw UsageFailure("more than one type for the value");
  const std::vector<std::string> texts =
      file ? words.takeAll(2, "DOMAIN KEY --plist FILE") : words.takeAll(3, "DOMAIN KEY VALUE");
  const std::vector<std::byte> value =
      file ? ReadPropertyListFile(*file)
           : Serialize(ParseValue(texts[2], types.empty() ? "--string" : types.front()));
  halvec::HelperClient client = Connect(options);
  return FinishWithCode(
      client.call<requests::SetPreferenceValue>(texts[0], texts[1], std::span(value)).error(),
      options);
}

ExitCode RunRemove(const GlobalOptions& options, Words words) {
  const std::vector<std::string> texts = words.takeAll(2, "DOMAIN KEY");
  // A value of exactly one byte, whichever, removes the key.
  constexpr std::array kRemoval{std::byte{0}};
  halvec::HelperClient client = Connect(options);
  return FinishWithCode(
      client.call<requests::SetPreferenceValue>(texts[0], texts[1], std::span(kRemoval)).error(),
      options);
}

ExitCode RunGet(const GlobalOptions& options, Words words) {
  const bool app = words.takeOption("--app");
  const bool xml = words.takeOption("--xml");
  if (xml && options.json) throw UsageFailure("--xml and --json exclude one another");
  const std::vector<std::string> texts = words.takeAll(2, "DOMAIN KEY");
  halvec::HelperClient client = Connect(options);
  const halvec::Result<halvec::Data> value =
      app ? client.call<requests::CopyAppPreferenceValue>(texts[0], texts[1])
          : client.call<requests::CopyPreferenceValue>(texts[0], texts[1]);
  if (!value) throw RequestFailure(value.error());
  if ((*value).empty()) {
    if (options.json) Print("null\n");
    return ExitCode::kAbsent;
  }
  const std::string_view text = (*value).text();
  if (xml) {
    Print(text);
    return ExitCode::kDone;
  }
  std::string reason;
  const std::optional<PropertyList> list = platform::ParsePropertyList((*value).bytes(), &reason);
  if (!list) throw Failure(ExitCode::kLost, "the helper's answer is no property list: " + reason);
  if (options.json) {
    Print(JsonPropertyList(*list) + "\n");
  } else if (const std::optional<std::string> scalar = PlainScalar(*list)) {
    Print(*scalar + "\n");
  } else {
    Print(text);
  }
  return ExitCode::kDone;
}

ExitCode RunPreference(const GlobalOptions& options, Words words) {
  const std::optional<std::string> action = words.takeFirst();
  if (!action) throw UsageFailure("expected set, get or remove; see halvecctl preference --help");
  if (*action == "set") return RunSet(options, std::move(words));
  if (*action == "get") return RunGet(options, std::move(words));
  if (*action == "remove") return RunRemove(options, std::move(words));
  throw UsageFailure("unknown action '" + *action + "'; see halvecctl preference --help");
}

}  // namespace

constinit const Command kPreferenceCommand{
    "preference", "set DOMAIN KEY VALUE [TYPE] | get DOMAIN KEY [OPTION...] | remove DOMAIN KEY",
    "set, get or remove a preference value",
    "set      stores the value durably. TYPE is one of\n"
    "           --string      the text as it is (the default)\n"
    "           --integer     decimal, or hexadecimal behind 0x\n"
    "           --real        decimal\n"
    "           --boolean     true or false\n"
    "           --plist FILE  instead of VALUE: a property list, XML or binary; - reads standard\n"
    "                         input\n"
    "get      prints a number, text, boolean, date or data as it is, and a container as an XML\n"
    "         property list. Without a value it prints nothing (null with --json) and exits with "
    "6.\n"
    "           --app         search all scopes of user and host, as an application does\n"
    "           --xml         print the XML property list\n"
    "           --json        print JSON: data is base64 text, a date ISO 8601 text\n"
    "remove   removes the key; it need not exist.\n",
    RunPreference};

}  // namespace halvecctl
