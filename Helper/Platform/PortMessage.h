// SPDX-License-Identifier: Apache-2.0
//
// Receives and sends single messages. Receiving turns what travelled (bytes and descriptors) into a
// message as a routine reads it: names, addresses and a trailer filled in on this side. One receive
// buffer belongs to one thread; sending is free of state. Nothing here ever blocks.
#pragma once

#include <array>
#include <cstddef>
#include <memory>
#include <span>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/Port.h"
#include "Helper/Shared/Interface/Message.h"

namespace platform {

/// The largest message without its out-of-line bytes.
inline constexpr std::size_t kMaxMessageSize = 4096;
/// Out-of-line bytes travel behind the message up to here, in a sealed memfd above.
inline constexpr std::size_t kMaxInlineData = 128 * 1024;
/// The most out-of-line bytes that one descriptor may carry.
inline constexpr std::size_t kMaxOutOfLineData = 16 * 1024 * 1024;

enum class ReceiveStatus {
  kMessage,  // a message is in the buffer
  kRefused,  // a message came that the transport refuses: answer it with refusal()
  kNothing,  // no message is waiting, or one came that cannot be answered and was dropped
  kEnded,    // nothing will ever come on this port again
};

/// Room for one message and its trailer, and for what came with it. Reused from message to message.
class ReceiveBuffer {
 public:
  ReceiveBuffer();

  /// Takes one message off the port `name`, whose receive right is `socket`. Forgets the previous
  /// message, rights that nobody took included. On a named port memory is checked but not read: its
  /// address is null.
  ReceiveStatus receive(PortName name, int socket, bool named);

  /// The message, 4-byte aligned, trailer behind it; valid until the next receive() or clear().
  [[nodiscard]] std::byte* message() { return message_; }
  [[nodiscard]] wire::MessageHeader header() const {
    return wire::Load<wire::MessageHeader>(message_);
  }
  [[nodiscard]] KernReturn refusal() const { return refusal_; }
  /// Who sent the message; all zero when that is not known.
  [[nodiscard]] wire::AuditToken sender() const;
  /// The reply right that came with the message; empty when the answer goes back on the same port.
  [[nodiscard]] const FileDescriptor& replyRight() const { return replyRight_; }

  /// The routine took the rights of the message's body over.
  void disownRights() { rightCount_ = 0; }
  /// Gives up everything that came with the message and was not taken over.
  void clear();

 private:
  struct Control;
  ReceiveStatus accept(PortName name, std::size_t length, Control& control, bool named);
  bool readDescriptors(std::size_t length, Control& control, bool named);
  bool readMemory(std::byte* descriptor, std::size_t& inlineAt, std::size_t length,
                  Control& control, bool named);
  void writeTrailer(const Control& control, bool named);

  static constexpr std::size_t kHeadRoom = 64;  // a trailer fits between message and data
  static constexpr std::size_t kMaxRights = 2;

  std::unique_ptr<std::byte[]> storage_;
  std::byte* message_ = nullptr;
  std::uint32_t sequence_ = 0;
  KernReturn refusal_ = KERN_SUCCESS;
  FileDescriptor replyRight_;
  SharedDescriptor sender_;  // pidfd of the sender; only on named ports
  std::array<PortName, kMaxRights> rights_{};
  std::size_t rightCount_ = 0;
  /// What came in a memfd. The file stays open until the reply is out: who closes the last
  /// descriptor frees the pages, and the client need not wait for that.
  struct Memory {
    std::unique_ptr<std::byte[]> bytes;
    FileDescriptor file;
  };
  std::vector<Memory> memory_;
};

/// Sends the message at `message` (its header's size counts) to `socket`. A port descriptor's name
/// becomes its send right; an out-of-line descriptor's bytes go behind the message or, where they
/// do not fit there, into a sealed memfd. A region marked deallocate is given back whether or not
/// the message could be sent. False, with nothing sent, when the other side is gone or does not
/// read, when a right is not there, and when a memfd is needed and none is to be had: the bytes are
/// too many, or the system has no room, or earlier messages lie unread.
[[nodiscard]] bool SendMessage(int socket, std::byte* message);

}  // namespace platform
