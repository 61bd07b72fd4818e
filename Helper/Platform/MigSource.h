// SPDX-License-Identifier: Apache-2.0
//
// A run-loop source that serves a MIG subsystem on a port: takes one message at a time, prepares
// the reply, runs the stub and sends what it left. Belongs to its run loop's thread.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <span>

#include "Helper/Platform/Clock.h"
#include "Helper/Platform/Port.h"
#include "Helper/Platform/RunLoop.h"
#include "Helper/Shared/Interface/Message.h"

namespace platform {

/// Checks a request, runs its routine and completes the prepared reply. `request` points to the
/// message with its trailer behind it, `reply` to at least the subsystem's maximum reply size.
using MigStub = void (*)(std::byte* request, std::byte* reply);

struct MigRoutineDescriptor {
  MigStub stub;
  std::uint32_t argumentCount;
  std::uint32_t maxReplySize;
};

struct MigSubsystem {
  MigStub (*demultiplex)(const wire::MessageHeader& request);  // null: no such routine
  std::int32_t startId;
  std::int32_t endId;  // exclusive
  std::uint32_t maxReplySize;
  std::span<const MigRoutineDescriptor> routines;
};

/// The largest reply that a subsystem may announce.
inline constexpr std::uint32_t kMaxReplySize = 512;

/// One message that has been served, for whoever watches.
struct ServedMessage {
  PortName port;  // on which it came
  std::int32_t id;
  wire::AuditToken sender;  // all zero when the message was refused before its sender was known
  KernReturn code;
  Duration took;  // from its arrival to its reply
};

/// `hook` runs after each message that any source of the calling thread has served; null: none.
void SetServedMessageHook(std::function<void(const ServedMessage&)> hook);

/// Writes the reply that stands when a stub leaves it alone: 36 bytes, request id + 100, NDR
/// record, MIG_BAD_ID; everything behind it up to `replySize` is zero.
void PrepareReply(const wire::MessageHeader& request, std::byte* reply, std::uint32_t replySize);

class ReceiveBuffer;

class MigRunLoopSource : public std::enable_shared_from_this<MigRunLoopSource> {
 public:
  /// A source for the receive right `port`, to be added to a loop. `order` is the place among
  /// sources that are ready at once; the loop serves them in turn, so that only 0 is accepted. Null
  /// when the port has no receive right here, or the subsystem is absent or announces too large a
  /// reply.
  [[nodiscard]] static std::shared_ptr<MigRunLoopSource> Create(PortName port,
                                                                const MigSubsystem* subsystem,
                                                                int order);
  ~MigRunLoopSource();
  MigRunLoopSource(const MigRunLoopSource&) = delete;
  MigRunLoopSource& operator=(const MigRunLoopSource&) = delete;

  /// Starts serving on `loop`. False when the loop cannot watch the port.
  bool addTo(RunLoop& loop);
  /// Stops serving for good. Harmless when repeated.
  void invalidate();
  [[nodiscard]] bool isValid() const { return valid_; }

 private:
  struct Watch;
  MigRunLoopSource(PortName port, SharedDescriptor socket, bool named,
                   const MigSubsystem& subsystem);
  void serveOne();
  [[nodiscard]] KernReturn answer(ReceiveBuffer& request, bool refused);

  const PortName port_;
  const SharedDescriptor socket_;
  const bool named_;
  const MigSubsystem& subsystem_;
  bool valid_ = true;
  std::unique_ptr<Watch> watch_;
};

}  // namespace platform
