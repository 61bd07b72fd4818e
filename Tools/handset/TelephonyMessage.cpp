// SPDX-License-Identifier: Apache-2.0
//
// Pure functions.
#include "Tools/handset/TelephonyMessage.h"

#include <span>

#include "Helper/Platform/PropertyList.h"
#include "Tools/halvecctl/Json.h"
#include "Tools/handset/Json.h"
#include "Tools/handset/WireMessage.h"

namespace handset {
namespace {

using platform::PropertyList;

std::string TextOf(const PropertyList& list, std::string_view key) {
  const PropertyList* value = list.find(key);
  const std::string* text = value == nullptr ? nullptr : value->string();
  return text == nullptr ? "" : *text;
}

std::string SummaryOfUpdate(const PropertyList& list) {
  constexpr std::string_view kPrefix = "com.zarvo.lasd.";
  std::string name = TextOf(list, "Notification");
  if (name.starts_with(kPrefix)) name.erase(0, kPrefix.size());
  const std::string type = TextOf(list, "DBType");
  return type.empty() ? name : name + " " + type;
}

std::string SummaryOfCivicInfo(const PropertyList& list) {
  std::string text = "civic";
  for (const char* key : {"country", "state", "city", "postalCode"}) {
    const PropertyList* value = list.find(key);
    text += std::string(" ") + key + "=";
    text += value == nullptr ? "null" : halvecctl::JsonPropertyList(*value);
  }
  return text;
}

std::string Summary(std::uint32_t id, const PropertyList& list) {
  if (id == kConnectMessage) return "connect " + halvecctl::JsonPropertyList(list);
  return id == kCivicMessage ? SummaryOfCivicInfo(list) : SummaryOfUpdate(list);
}

/// Reads the payload as the binary property list that it must be.
void DescribeList(const std::string& payload, TelephonyEntry& entry) {
  std::string reason = "not in the binary form";
  const auto list = payload.starts_with("bplist00")
                        ? platform::ParsePropertyList(std::as_bytes(std::span(payload)), &reason)
                        : std::nullopt;
  if (!list) {
    entry.fault = "no property list: " + reason;
    return;
  }
  entry.payload = halvecctl::JsonPropertyList(*list);
  entry.summary = Summary(*entry.id, *list);
}

void DescribeSwitch(const std::string& payload, TelephonyEntry& entry) {
  if (payload.size() != sizeof(std::uint32_t)) {
    entry.fault = "not four bytes";
    return;
  }
  const std::uint32_t value = WireWordAt(payload, 0);
  entry.payload = std::to_string(value);
  entry.summary = "log to file " + entry.payload;
  if (value > 1) entry.fault = "neither 0 nor 1";
}

bool IsExpected(const TelephonyEntry& entry) {
  if (entry.connection) return entry.id == kCivicMessage;
  if (entry.port == kConnectionPort) return entry.id == kConnectMessage;
  return entry.id == (entry.port == kRadioPort ? kLogToFileMessage : kUpdateMessage);
}

void DescribePayload(const WireMessage& message, TelephonyEntry& entry) {
  if (!IsExpected(entry)) {
    entry.fault = "unknown message id";
  } else if (entry.port == kRadioPort) {
    DescribeSwitch(message.payload, entry);
  } else {
    DescribeList(message.payload, entry);
  }
}

}  // namespace

TelephonyEntry DescribeTelephonyMessage(std::string_view port, std::optional<unsigned> connection,
                                        std::string_view bytes, std::size_t rights) {
  TelephonyEntry entry;
  entry.port = port;
  entry.connection = connection;
  entry.bytes = bytes;
  entry.payload = "null";
  const auto message = ParseWireMessage(bytes, entry.fault);
  if (message) {
    entry.id = message->id;
    DescribePayload(*message, entry);
    const std::size_t due = message->id == kConnectMessage ? 1 : 0;
    if (message->carriesPort != (due == 1)) {
      entry.fault = due == 1 ? "no port descriptor" : "a port descriptor";
    } else if (rights != due) {
      entry.fault = std::to_string(rights) + " rights beside the message";
    }
  }
  if (entry.summary.empty()) {
    entry.summary = (entry.id ? "message " + std::to_string(*entry.id) + ", " : std::string()) +
                    std::to_string(bytes.size()) + " bytes";
  }
  if (!entry.fault.empty()) entry.summary += " (" + entry.fault + ")";
  return entry;
}

std::string TelephonyEntryJson(const TelephonyEntry& entry) {
  std::string json = "{\"monotonic_ns\":" + std::to_string(entry.nanoseconds) +
                     ",\"port\":" + JsonString(entry.port);
  if (entry.connection) json += ",\"connection\":" + std::to_string(*entry.connection);
  json += ",\"id\":" + (entry.id ? std::to_string(*entry.id) : "null") +
          ",\"payload\":" + entry.payload;
  if (!entry.fault.empty()) json += ",\"error\":" + JsonString(entry.fault);
  return json + ",\"hex\":\"" + HexOf(entry.bytes) + "\"}\n";
}

std::string TelephonyEntryLine(const TelephonyEntry& entry) {
  return entry.port + "  " + entry.summary + "\n";
}

}  // namespace handset
