// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/MigSource.h"

#include <algorithm>
#include <array>

#include "Helper/Platform/CurrentWork.h"
#include "Helper/Platform/PortMessage.h"
#include "Helper/Platform/ProcessExit.h"
#include "Helper/Platform/RunLoopCore.h"

namespace platform {
namespace {

/// One buffer serves every source of a thread: a message is done with before the next is received.
ReceiveBuffer& ThreadBuffer() {
  static thread_local ReceiveBuffer buffer;
  return buffer;
}

std::function<void(const ServedMessage&)>& ServedMessageHook() {
  static thread_local std::function<void(const ServedMessage&)> hook;
  return hook;
}

/// Says what this thread is busy with while it serves one message.
class ScopedRequest {
 public:
  ScopedRequest(std::int32_t id, const wire::AuditToken& sender) {
    CurrentWork& work = WorkOfThisThread();
    work.requestId = id;
    work.process = sender.words[wire::kAuditProcess];
    work.user = sender.words[wire::kAuditUser];
  }
  ~ScopedRequest() { WorkOfThisThread().requestId = 0; }
  ScopedRequest(const ScopedRequest&) = delete;
  ScopedRequest& operator=(const ScopedRequest&) = delete;
};

bool IsComplex(const std::byte* reply) {
  return (wire::Load<std::uint32_t>(reply) & wire::kComplexBit) != 0;
}

/// The code of a finished reply; a complex reply carries none and means success.
KernReturn CodeOfReply(const std::byte* reply) {
  return IsComplex(reply) ? KERN_SUCCESS : wire::Load<KernReturn>(reply + wire::kReplyCodeOffset);
}

}  // namespace

void SetServedMessageHook(std::function<void(const ServedMessage&)> hook) {
  ServedMessageHook() = std::move(hook);
}

struct MigRunLoopSource::Watch : DescriptorWatch {
  Watch(RunLoop& runLoop, MigRunLoopSource& source)
      : DescriptorWatch(
            runLoop,
            [](void* context) {
              // A routine may give the source up while it runs.
              const auto keep = static_cast<MigRunLoopSource*>(context)->shared_from_this();
              keep->serveOne();
            },
            &source),
        loop(runLoop) {}
  RunLoop& loop;
};

void PrepareReply(const wire::MessageHeader& request, std::byte* reply, std::uint32_t replySize) {
  std::fill_n(reply, std::max(replySize, wire::kErrorReplySize), std::byte{0});
  wire::Store(reply,
              wire::MessageHeader{.size = wire::kErrorReplySize, .id = wire::ReplyId(request.id)});
  wire::StoreReturnCode(reply, MIG_BAD_ID);
}

std::shared_ptr<MigRunLoopSource> MigRunLoopSource::Create(PortName port,
                                                           const MigSubsystem* subsystem,
                                                           int order) {
  const auto rights = PortQuery(port);
  if (!rights || !rights->receive || !subsystem || order != 0) return nullptr;
  if (subsystem->maxReplySize > kMaxReplySize) return nullptr;
  return std::shared_ptr<MigRunLoopSource>(
      new MigRunLoopSource(port, PortReceiveDescriptor(port), rights->named, *subsystem));
}

MigRunLoopSource::MigRunLoopSource(PortName port, SharedDescriptor socket, bool named,
                                   const MigSubsystem& subsystem)
    : port_(port), socket_(std::move(socket)), named_(named), subsystem_(subsystem) {}

MigRunLoopSource::~MigRunLoopSource() { invalidate(); }

bool MigRunLoopSource::addTo(RunLoop& loop) {
  if (!valid_ || watch_) return false;
  auto watch = std::make_unique<Watch>(loop, *this);
  if (!watch->open(socket_->get())) return false;
  watch_ = std::move(watch);
  return true;
}

void MigRunLoopSource::invalidate() {
  valid_ = false;
  watch_.reset();
}

void MigRunLoopSource::serveOne() {
  RunLoop& loop = watch_->loop;
  ReceiveBuffer& request = ThreadBuffer();
  const ReceiveStatus status = request.receive(port_, socket_->get(), named_);
  if (status == ReceiveStatus::kEnded) {
    // A client can end the channel that it shares with us; waiting on would only spin. What is
    // left of the client goes when its own port dies.
    watch_.reset();
    return;
  }
  if (status == ReceiveStatus::kNothing) return;
  const bool refused = status == ReceiveStatus::kRefused;
  const auto& hook = ServedMessageHook();
  if (!hook) {
    (void)answer(request, refused);
  } else {
    ServedMessage served{.port = port_,
                         .id = request.header().id,
                         .sender = refused ? wire::AuditToken{} : request.sender(),
                         .code = KERN_SUCCESS,
                         .took = {}};
    const TimePoint start = SystemClock().now();
    served.code = answer(request, refused);
    served.took = SystemClock().now() - start;
    hook(served);
  }
  loop.noteHandledSource();
}

/// Answers the message in the buffer and gives up what came with it. The code of the reply.
KernReturn MigRunLoopSource::answer(ReceiveBuffer& request, bool refused) {
  alignas(std::max_align_t) std::array<std::byte, kMaxReplySize> reply;
  const wire::MessageHeader header = request.header();
  PrepareReply(header, reply.data(), subsystem_.maxReplySize);
  if (refused) {
    wire::StoreReturnCode(reply.data(), request.refusal());
  } else {
    // A process that ended before this message came must be forgotten first: its process id may
    // be the sender's by now.
    if (named_) DeliverPendingProcessExits();
    const ScopedRequest busy(header.id, request.sender());
    if (const MigStub stub = subsystem_.demultiplex(header)) stub(request.message(), reply.data());
  }
  KernReturn code = CodeOfReply(reply.data());
  if (code == KERN_SUCCESS) request.disownRights();
  const int destination = request.replyRight() ? request.replyRight().get()
                          : named_             ? -1
                                               : socket_->get();
  // Without a destination the reply's own rights and memory are still given back.
  if (code != MIG_NO_REPLY && !SendMessage(destination, reply.data()) && IsComplex(reply.data())) {
    // What it carries may be all that could not travel. A client that does not take this reply
    // either has lost it; there is nobody to tell.
    PrepareReply(header, reply.data(), wire::kErrorReplySize);
    wire::StoreReturnCode(reply.data(), KERN_RESOURCE_SHORTAGE);
    if (SendMessage(destination, reply.data())) code = KERN_RESOURCE_SHORTAGE;
  }
  request.clear();
  return code;
}

}  // namespace platform
