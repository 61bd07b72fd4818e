// SPDX-License-Identifier: Apache-2.0
//
// halvecctl list: the request catalogue, from the rows that server and client are made of. Needs no
// helper.
#include <array>
#include <cstdio>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include "Helper/Shared/Interface/Requests.h"
#include "Tools/halvecctl/Command.h"
#include "Tools/halvecctl/Json.h"

namespace halvecctl {
namespace {

/// One argument or result of a request.
struct FieldInfo {
  std::string_view name;
  std::string_view type;
  std::size_t offset;
  std::size_t size;
};

struct RequestInfo {
  std::int32_t id;
  std::string_view name;
  std::size_t requestSize;
  std::size_t replySize;
  std::size_t maxReplySize;
  std::size_t argumentCount;
  bool complexRequest;
  bool complexReply;
  std::vector<FieldInfo> inputs;
  std::vector<FieldInfo> outputs;
};

template <class Field>
constexpr std::string_view kTypeName = "text";
template <>
constexpr std::string_view kTypeName<wire::Integer> = "integer";
template <>
constexpr std::string_view kTypeName<wire::Mask> = "mask";
template <>
constexpr std::string_view kTypeName<wire::Real> = "real";
template <>
constexpr std::string_view kTypeName<wire::Flag> = "flag";
template <>
constexpr std::string_view kTypeName<wire::OutOfLine> = "data";

template <class... Fields, class Names, class Offsets>
std::vector<FieldInfo> Describe(const std::tuple<Fields...>*, const Names& names,
                                const Offsets& offsets) {
  std::vector<FieldInfo> fields;
  std::size_t index = 0;
  ((fields.push_back({names[index], kTypeName<Fields>, offsets[index], sizeof(Fields)}), ++index),
   ...);
  return fields;
}

template <class Row>
RequestInfo Describe() {
  return {Row::kId,
          Row::kName,
          Row::kRequestSize,
          Row::kReplySize,
          Row::kMaxReplySize,
          Row::kArgumentCount,
          Row::kComplexRequest,
          Row::kComplexReply,
          Describe(static_cast<const typename Row::InputFields*>(nullptr), Row::kInputNames,
                   Row::kInputOffsets),
          Describe(static_cast<const typename Row::OutputFields*>(nullptr), Row::kOutputNames,
                   Row::kOutputOffsets)};
}

template <class... Rows>
std::vector<RequestInfo> DescribeAll(const std::tuple<Rows...>*) {
  return {Describe<Rows>()...};
}

std::string HexId(std::int32_t id) {
  std::array<char, 16> text{};
  (void)std::snprintf(text.data(), text.size(), "0x%x", static_cast<unsigned>(id));  // fits
  return text.data();
}

void PrintFields(const char* direction, const std::vector<FieldInfo>& fields) {
  for (const FieldInfo& field : fields) {
    const std::string type = std::string(field.type) + "[" + std::to_string(field.size) + "]";
    std::printf("           %-4s%-24.*s%-12s at %zu\n", direction,
                static_cast<int>(field.name.size()), field.name.data(), type.c_str(), field.offset);
  }
}

void PrintText(const std::vector<RequestInfo>& requests) {
  std::printf("%-8s  %-8s  %-32s  %7s  %5s  %5s  %4s\n", "id", "hex", "name", "request", "reply",
              "max", "args");
  for (const RequestInfo& request : requests) {
    std::printf("%-8d  %-8s  %-32.*s  %7zu  %5zu  %5zu  %4zu%s%s\n", request.id,
                HexId(request.id).c_str(), static_cast<int>(request.name.size()),
                request.name.data(), request.requestSize, request.replySize, request.maxReplySize,
                request.argumentCount, request.complexRequest ? "  complex request" : "",
                request.complexReply ? "  complex reply" : "");
    PrintFields("in", request.inputs);
    PrintFields("out", request.outputs);
  }
}

std::string JsonFields(const std::vector<FieldInfo>& fields) {
  std::string out = "[";
  for (const FieldInfo& field : fields) {
    if (out.size() > 1) out += ',';
    out += "{\"name\":" + JsonString(field.name) + ",\"type\":" + JsonString(field.type) +
           ",\"offset\":" + std::to_string(field.offset) +
           ",\"size\":" + std::to_string(field.size) + "}";
  }
  return out + "]";
}

void PrintJson(const std::vector<RequestInfo>& requests) {
  std::string out = "[";
  for (const RequestInfo& request : requests) {
    out += out.size() > 1 ? ",\n " : "\n ";
    out += "{\"id\":" + std::to_string(request.id) + ",\"hexId\":" + JsonString(HexId(request.id)) +
           ",\"name\":" + JsonString(request.name) +
           ",\"requestSize\":" + std::to_string(request.requestSize) +
           ",\"complexRequest\":" + (request.complexRequest ? "true" : "false") +
           ",\"inputs\":" + JsonFields(request.inputs) +
           ",\"replySize\":" + std::to_string(request.replySize) +
           ",\"maxReplySize\":" + std::to_string(request.maxReplySize) +
           ",\"complexReply\":" + (request.complexReply ? "true" : "false") +
           ",\"outputs\":" + JsonFields(request.outputs) +
           ",\"argumentCount\":" + std::to_string(request.argumentCount) + "}";
  }
  std::printf("%s\n]\n", out.c_str());
}

ExitCode RunList(const GlobalOptions& options, Words words) {
  (void)words.takeAll(0, "");
  const std::vector<RequestInfo> requests = DescribeAll(static_cast<const requests::All*>(nullptr));
  options.json ? PrintJson(requests) : PrintText(requests);
  return ExitCode::kDone;
}

}  // namespace

constinit const Command kListCommand{
    "list", "", "print the request catalogue",
    "Prints every request: id, name, size of the request, of a successful reply and of the "
    "largest\n"
    "reply, number of arguments as the routine's descriptor counts them, and each argument's and\n"
    "result's type, bytes and offset. Connects to nothing.\n",
    RunList};

}  // namespace halvecctl
