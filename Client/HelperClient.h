// SPDX-License-Identifier: Apache-2.0
//
// The C++ interface of the client library: a connection to the mobile helper and one generic call,
// derived from the rows of the request catalogue. An object belongs to one thread at a time and has
// no lock; use one object per thread. Do not use it in a forked child: connect anew there.
#pragma once

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <string>

#include "Client/Data.h"
#include "Client/RequestEncoding.h"
#include "Client/Result.h"
#include "Client/ServiceConnection.h"
#include "Helper/Shared/Interface/Requests.h"

namespace halvec {

class Deadline;
struct IncomingPacket;

/// What a client may choose.
struct ClientOptions {
  std::string servicePath = DefaultServicePath();  // the socket of the service port
  std::chrono::milliseconds connectLimit{10'000};  // of one connect; 0 for none
  std::chrono::milliseconds requestLimit{60'000};  // of one request; 0 for none
  /// Connect again, once per request, when the helper went away before it read the request. Such a
  /// request had no effect, so it is sent again; one that the helper may have begun never is.
  bool reconnect = false;
};

class HelperClient {
 public:
  /// Connects. Errors as ConnectToService().
  [[nodiscard]] static Result<HelperClient> Connect(ClientOptions options = {});

  HelperClient(HelperClient&&) = default;
  HelperClient& operator=(HelperClient&&) = default;
  ~HelperClient() = default;

  /// Sends one request and waits for its reply. Arguments<Row> and ResultValue<Row> say what goes
  /// in and out. A small request costs one send, one receive and no memory beyond its result.
  ///
  /// HVMH_RETURN_CODE, HVMH_REFUSED: the helper's answer; the connection goes on.
  /// HVMH_TOO_LARGE: a text too long for its slot, or data beyond 16 MiB; nothing was sent.
  /// HVMH_INVALID_ARGUMENT: a text with a zero inside; nothing was sent.
  /// HVMH_NOT_CONNECTED: an earlier call closed the connection; nothing was sent.
  /// HVMH_TIMED_OUT, HVMH_HELPER_GONE, HVMH_PROTOCOL_VIOLATION: the connection is closed now,
  /// because a late reply could be taken for that of another request. What the helper kept for it
  /// is gone. Whether the request took effect is not known.
  /// HVMH_NO_MEMORY, HVMH_SYSTEM_ERROR. With `reconnect` also every error of Connect().
  template <class Row, class... Args>
  [[nodiscard]] Result<ResultValue<Row>> call(const Args&... arguments) {
    return callWith<Row>(Arguments<Row>(arguments...));
  }

  /// The same with the arguments as one tuple.
  template <class Row>
  [[nodiscard]] Result<ResultValue<Row>> callWith(const Arguments<Row>& arguments) {
    EncodedRequest<Row> request;
    if (const Error error = request.encode(arguments); error.failed()) return error;
    std::array<std::byte, Row::kMaxReplySize> reply;
    Data data;
    const ReplyShape shape{wire::ReplyId(Row::kId), Row::kReplySize, Row::kComplexReply};
    if (const Error error = exchange(request.message, request.outOfLine, shape, reply, data);
        error.failed()) {
      return error;
    }
    if constexpr (std::is_void_v<ResultValue<Row>>) {
      return {};
    } else {
      return DecodeResult<Row>(reply.data(), data);
    }
  }

  /// Ends the connection, if there is one, and connects anew. Errors as Connect().
  Error reconnect();

  /// Whether the helper was still there a moment ago. Never waits.
  [[nodiscard]] bool isConnected() const;

  /// For an event loop: shows a hang-up (POLLHUP) when the helper goes away, and nothing else. -1
  /// without a connection. Borrowed; never read, write or close it. Changes with every connect.
  [[nodiscard]] int descriptor() const { return connection_.ownPort.get(); }

 private:
  /// What a successful reply looks like.
  struct ReplyShape {
    std::int32_t id;
    std::uint32_t size;
    bool complex;
  };
  struct Outcome;

  explicit HelperClient(ClientOptions options) : options_(std::move(options)) {}

  /// Sends `message` with `outOfLine` and receives the reply into `reply` and `data`. No error
  /// means a reply of the given shape with return code 0.
  [[nodiscard]] Error exchange(std::span<std::byte> message, std::span<const std::byte> outOfLine,
                               const ReplyShape& shape, std::span<std::byte> reply, Data& data);
  [[nodiscard]] Outcome attempt(std::span<std::byte> message, std::span<const std::byte> outOfLine,
                                const ReplyShape& shape, std::span<std::byte> reply, Data& data);
  [[nodiscard]] Outcome sendRequest(std::span<std::byte> message,
                                    std::span<const std::byte> outOfLine, const Deadline& deadline);
  [[nodiscard]] Outcome receiveReply(const ReplyShape& shape, std::span<std::byte> reply,
                                     const Deadline& deadline, Data& data);
  [[nodiscard]] static Error ReadReply(const ReplyShape& shape, std::span<const std::byte> reply,
                                       std::span<const std::byte> behind,
                                       const IncomingPacket& packet, Data& data);
  void disconnect();

  ClientOptions options_;
  ServiceConnection connection_;
  /// Where out-of-line bytes of a packet arrive; made by the first request that returns data.
  std::unique_ptr<std::byte[]> arrivals_;
};

}  // namespace halvec
