// SPDX-License-Identifier: Apache-2.0
//
// halvecctl call: any request by name or id. Arguments and results follow from the request's row.
#include <cstdio>
#include <limits>
#include <optional>
#include <span>
#include <string>
#include <tuple>
#include <type_traits>
#include <utility>
#include <vector>

#include "Helper/Shared/Interface/Requests.h"
#include "Tools/halvecctl/Command.h"
#include "Tools/halvecctl/Input.h"
#include "Tools/halvecctl/Json.h"

namespace halvecctl {
namespace {

/// What the helper answered, ready to be printed.
struct Answer {
  std::string_view request;
  std::int32_t id = 0;
  halvec::Error error;
  std::string_view resultName;       // empty without a result
  std::string plain;                 // the result itself: text, true or false, or bytes
  std::string json;                  // the result as JSON
  std::optional<std::size_t> bytes;  // for data: how many
  bool failed = false;               // a success flag that is false
};

void Keep(const std::string& text, Answer& answer) {
  answer.plain = text;
  answer.json = JsonString(text);
}

void Keep(bool flag, Answer& answer) {
  answer.plain = answer.json = flag ? "true" : "false";
  // Other flags are answers to a question, and "no" is a good answer.
  answer.failed = !flag && answer.resultName == "success";
}

void Keep(const halvec::Data& data, Answer& answer) {
  answer.plain = data.text();
  answer.json = JsonData(data.bytes());
  answer.bytes = data.size();
}

std::string_view ParseField(const std::string& text, std::string_view*, std::vector<std::byte>&) {
  return text;
}
std::int32_t ParseField(const std::string& text, std::int32_t*, std::vector<std::byte>&) {
  using Limits = std::numeric_limits<std::int32_t>;
  return static_cast<std::int32_t>(ParseInteger(text, Limits::min(), Limits::max()));
}
std::uint32_t ParseField(const std::string& text, std::uint32_t*, std::vector<std::byte>&) {
  return static_cast<std::uint32_t>(ParseUnsigned(text, std::numeric_limits<std::uint32_t>::max()));
}
double ParseField(const std::string& text, double*, std::vector<std::byte>&) {
  return ParseReal(text);
}
std::span<const std::byte> ParseField(const std::string& text, std::span<const std::byte>*,
                                      std::vector<std::byte>& storage) {
  if (text != "-" && !text.starts_with('@')) {
    throw UsageFailure("'" + text + "' is neither @FILE nor - for standard input");
  }
  storage = ReadInput(text == "-" ? text : text.substr(1));
  return storage;
}

template <class Row>
std::string ArgumentNames() {
  std::string names;
  for (const std::string_view name : Row::kInputNames) {
    if (!names.empty()) names += ' ';
    for (const char letter : name) {
      names += letter >= 'a' && letter <= 'z' ? static_cast<char>(letter - 'a' + 'A') : letter;
    }
  }
  return names;
}

template <class Row, std::size_t... Index>
Answer CallRow(const GlobalOptions& options, Words& words, std::index_sequence<Index...>) {
  using Arguments = halvec::Arguments<Row>;
  const std::vector<std::string> texts = words.takeAll(sizeof...(Index), ArgumentNames<Row>());
  std::vector<std::byte> storage;
  const Arguments arguments(ParseField(
      texts[Index], static_cast<std::tuple_element_t<Index, Arguments>*>(nullptr), storage)...);
  halvec::HelperClient client = Connect(options);
  auto result = client.template callWith<Row>(arguments);
  Answer answer;
  answer.request = Row::kName;
  answer.id = Row::kId;
  answer.error = result.error();
  if constexpr (!std::is_void_v<halvec::ResultValue<Row>>) {
    answer.resultName = Row::kOutputNames[0];
    if (result) Keep(*result, answer);
  }
  return answer;
}

/// Calls the row if `wanted` is its name or id, into `answer`; tells whether it was.
template <class Row>
bool CallIfWanted(const std::string& wanted, std::optional<std::uint64_t> id,
                  const GlobalOptions& options, Words& words, std::optional<Answer>& answer) {
  if (wanted != Row::kName && id != std::uint64_t{Row::kId}) return false;
  answer = CallRow<Row>(options, words,
                        std::make_index_sequence<std::tuple_size_v<halvec::Arguments<Row>>>{});
  return true;
}

template <class... Rows>
std::optional<Answer> CallWanted(const std::tuple<Rows...>*, const std::string& wanted,
                                 const GlobalOptions& options, Words& words) {
  std::optional<std::uint64_t> id;
  const bool isNumber = !wanted.empty() && wanted.front() >= '0' && wanted.front() <= '9';
  if (isNumber) id = ParseUnsigned(wanted, std::numeric_limits<std::uint32_t>::max());
  std::optional<Answer> answer;
  (void)(... || CallIfWanted<Rows>(wanted, id, options, words, answer));
  return answer;
}

void Print(std::string_view text) { std::fwrite(text.data(), 1, text.size(), stdout); }

void PrintJson(const Answer& answer) {
  const KernReturn code = answer.error.returnCode;
  Print("{\"request\":" + JsonString(answer.request) + ",\"id\":" + std::to_string(answer.id) +
        ",\"code\":" + std::to_string(code) + ",\"codeName\":" + JsonString(ReturnCodeName(code)) +
        ",\"results\":{");
  if (!answer.json.empty()) Print(JsonString(answer.resultName) + ":" + answer.json);
  Print("}}\n");
}

void PrintText(const Answer& answer) {
  const KernReturn code = answer.error.returnCode;
  Print("code " + std::to_string(code) + " (" + std::string(ReturnCodeName(code)) + ")\n");
  if (answer.json.empty()) return;
  const std::string name(answer.resultName);
  const bool printable = IsPrintable(answer.plain);
  if (!answer.bytes) {
    // What a terminal might obey is shown in JSON's escapes.
    Print(name + ": " + (printable ? answer.plain : answer.json) + "\n");
    return;
  }
  Print(name + ": " + std::to_string(*answer.bytes) + " bytes\n");
  if (answer.plain.empty()) return;
  Print(printable ? answer.plain : Base64(std::as_bytes(std::span(answer.plain))));
  if (!printable || answer.plain.back() != '\n') Print("\n");
}

ExitCode RunCall(const GlobalOptions& options, Words words) {
  const bool raw = words.takeOption("--raw");
  const std::optional<std::string> wanted = words.takeFirst();
  if (!wanted) throw UsageFailure("no request; see halvecctl call --help");
  const std::optional<Answer> answer =
      CallWanted(static_cast<const requests::All*>(nullptr), *wanted, options, words);
  if (!answer) throw UsageFailure("unknown request '" + *wanted + "'; see halvecctl list");
  // Only a return code is an answer to print; every other error is a failure to get one.
  if (answer->error.failed() && answer->error.returnCode == KERN_SUCCESS) {
    throw RequestFailure(answer->error);
  }
  if (raw) {
    if (answer->error.failed()) throw RequestFailure(answer->error);
    Print(answer->plain);
  } else {
    options.json ? PrintJson(*answer) : PrintText(*answer);
  }
  if (answer->error.failed()) return RequestFailure(answer->error).code();
  return answer->failed ? ExitCode::kFailed : ExitCode::kDone;
}

}  // namespace

constinit const Command kCallCommand{
    "call", "REQUEST [ARGUMENT...] [--raw]", "make any request, by name or id",
    "Makes one request and prints the return code and the result. REQUEST is a name or an id as\n"
    "halvecctl list prints them; the arguments are its inputs in that order:\n"
    "  text      as it is\n"
    "  integer   decimal, or hexadecimal behind 0x\n"
    "  mask      the same, without a sign\n"
    "  real      decimal\n"
    "  data      @FILE, or - for standard input\n"
    "Data that is printable text is printed as text, any other as base64.\n"
    "\n"
    "  --raw     print the bare result and nothing else\n",
    RunCall};

}  // namespace halvecctl
