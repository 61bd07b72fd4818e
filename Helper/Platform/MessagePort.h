// SPDX-License-Identifier: Apache-2.0
//
// Named message ports of other processes, as one sends to them: a handle to a port by its name, and
// one-way requests. Any thread may ask for a handle; a handle belongs to one thread at a time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <string>

#include "Helper/Platform/SharedService.h"

namespace platform {

/// A port that another process has published.
class RemoteMessagePort {
 public:
  virtual ~RemoteMessagePort() = default;

  /// Sends one request that asks for no reply, with send and receive time-outs of 0 s: it never
  /// waits. True when the message is in the port's queue. False, and the message is lost, when the
  /// queue is full, the publisher has gone, or the payload is longer than
  /// wire::kOneWayPayloadLimit.
  [[nodiscard]] virtual bool sendRequest(std::int32_t messageId,
                                         std::span<const std::byte> payload) = 0;
};

class MessagePorts {
 public:
  virtual ~MessagePorts() = default;

  /// A handle to the port that a process has published as `name`; null when none has, or when
  /// `name` is no port name (empty, with a slash, or with a dot in front).
  [[nodiscard]] virtual std::unique_ptr<RemoteMessagePort> createRemote(
      const std::string& name) = 0;
};

template <>
MessagePorts& DefaultProvider<MessagePorts>();

}  // namespace platform
