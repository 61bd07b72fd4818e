// SPDX-License-Identifier: Apache-2.0
#include "Tools/halvecctl/CivicInfoListener.h"

#include <span>
#include <vector>

#include "Helper/Platform/PropertyList.h"
#include "Helper/Shared/Interface/TelephonyConnection.h"
#include "Tools/halvecctl/Exit.h"

namespace halvecctl {
namespace {

/// The message that is at `socket`. Throws Failure when it is none.
std::span<const std::byte> Receive(platform::ReceiveBuffer& buffer, int socket, bool named) {
  if (buffer.receive(kPortNull, socket, named) != platform::ReceiveStatus::kMessage) {
    throw Failure(ExitCode::kLost, "what came to the telephony daemon's port is no message");
  }
  return {buffer.message(), buffer.header().size};
}

/// The civic info in a message of the helper's; none when it holds none.
std::optional<CivicInfo> Decode(std::span<const std::byte> packet) {
  const auto message = wire::DecodeOneWay(packet);
  if (!message || message->id != wire::kTelephonySetCivicInfo) return std::nullopt;
  const auto list = platform::ParsePropertyList(message->payload);
  if (!list || !list->dictionary()) return std::nullopt;
  CivicInfo info;
  for (std::size_t index = 0; index < info.size(); ++index) {
    const platform::PropertyList* text = list->find(wire::kCivicInfoKeys[index]);
    if (text && text->string()) info[index] = *text->string();
  }
  return info;
}

}  // namespace

CivicInfoListener::CivicInfoListener(const std::string& servicePath)
    : port_(servicePath, wire::kTelephonyConnectionPort) {}

CivicInfo CivicInfoListener::take(int helper, std::chrono::steady_clock::time_point deadline) {
  AwaitPacket(port_.descriptor(), helper, deadline);
  const auto request = Receive(buffer_, port_.descriptor(), true);
  const auto right = wire::DecodeTelephonyConnect(request)
                         ? wire::Load<PortName>(request.data() + wire::kFirstDescriptorOffset)
                         : kPortNull;
  const platform::SharedDescriptor connection = platform::PortSendDescriptor(right);
  if (!connection) throw Failure(ExitCode::kLost, "what came asks for no connection");
  AwaitPacket(connection->get(), helper, deadline);
  const std::optional<CivicInfo> info = Decode(Receive(buffer_, connection->get(), false));
  if (!info) throw Failure(ExitCode::kLost, "what came is no civic info");
  const wire::TelephonyAnswer success;
  std::vector<std::byte> answer = wire::EncodeOneWay(
      {.id = wire::kTelephonyCivicInfoAnswer, .payload = std::as_bytes(std::span(&success, 1))});
  (void)platform::SendMessage(connection->get(), answer.data());  // the helper's log tells a loss
  return *info;
}

}  // namespace halvecctl
