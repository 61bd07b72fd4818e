// SPDX-License-Identifier: Apache-2.0
#include "Helper/Shared/Server/ConnectSubsystem.h"

#include "Helper/Shared/Interface/Connect.h"
#include "Helper/Shared/Server/HelperServerUtils.h"

namespace {

/// Disposition move-send, type port descriptor: the upper half of the descriptor's third word.
constexpr std::uint16_t kMoveSendPort = 0x0011;

void ConnectStub(std::byte* request, std::byte* reply) {
  const auto header = wire::Load<wire::MessageHeader>(request);
  if ((header.bits & wire::kComplexBit) == 0 || header.size != wire::kConnectRequestSize ||
      wire::Load<std::uint32_t>(request + wire::kDescriptorCountOffset) != 1) {
    return wire::StoreReturnCode(reply, MIG_BAD_ARGUMENTS);
  }
  const auto kind = wire::Load<std::uint32_t>(request + wire::kConnectDispositionOffset);
  if (kind >> 16U != kMoveSendPort) return wire::StoreReturnCode(reply, MIG_TYPE_ERROR);
  if (wire::Load<std::uint32_t>(request + wire::kConnectTrailerOffset) != 0) {
    // Kept: this one error goes into the request, and the reply stays as it was prepared.
    return wire::StoreReturnCode(request, MIG_TRAILER_ERROR);
  }
  if (wire::Load<std::uint32_t>(request + wire::kConnectTrailerSizeOffset) <= 31) {
    return wire::StoreReturnCode(reply, MIG_TRAILER_ERROR);
  }

  wire::Store(reply + wire::kFirstDescriptorOffset + wire::kPortDispositionOffset,
              std::uint16_t{wire::kCopySend});
  const auto auditToken = wire::Load<wire::AuditToken>(request + wire::kConnectAuditTokenOffset);
  PortName privatePort = kPortNull;
  const KernReturn code = HelperServerConnectClient(
      header.localPort, wire::Load<PortName>(request + wire::kConnectPortOffset), privatePort,
      auditToken);
  if (code != KERN_SUCCESS) return wire::StoreReturnCode(reply, code);

  auto replyHeader = wire::Load<wire::MessageHeader>(reply);
  replyHeader.bits |= wire::kComplexBit;
  replyHeader.size = wire::kConnectReplySize;
  wire::Store(reply, replyHeader);
  wire::Store(reply + wire::kDescriptorCountOffset, std::uint32_t{1});
  wire::Store(reply + wire::kConnectPortOffset, privatePort);
  wire::Store(reply + wire::kConnectPortOffset + sizeof privatePort, std::uint32_t{0});
}

constexpr platform::MigRoutineDescriptor kConnectRoutine{
    .stub = ConnectStub,
    .argumentCount = wire::kConnectArgumentCount,
    .maxReplySize = wire::kConnectReplySize};

}  // namespace

const platform::MigSubsystem& ConnectSubsystem() {
  static constexpr platform::MigSubsystem kSubsystem{
      .demultiplex = [](const wire::MessageHeader& request) -> platform::MigStub {
        return request.id == wire::kConnectId ? ConnectStub : nullptr;
      },
      .startId = wire::kConnectId,
      .endId = wire::kConnectId + 1,
      .maxReplySize = wire::kConnectReplySize,
      .routines = {&kConnectRoutine, 1}};
  return kSubsystem;
}
