// SPDX-License-Identifier: Apache-2.0
//
// The transports that are compared. Each one starts a server process of its own and hands out a
// driver, which makes calls to it from this process. One thread on either side.
#pragma once

#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "Benchmarks/Support/Measure.h"
#include "Benchmarks/Support/WireClient.h"

namespace bench {

/// On which processors the two sides run.
struct Placement {
  const char* name;
  int client;
  int server;
};

/// 256 bytes of text with a header before it: what the quick requests carry.
inline constexpr std::size_t kRequestSize = 288;
inline constexpr std::size_t kReplySize = 36;
/// The request that the measured server answers at once: set the voicemail token.
inline constexpr std::int32_t kMeasuredRequest = 8683549;

/// Connections to one server.
class Driver {
 public:
  virtual ~Driver() = default;
  /// Makes `calls` calls, each connection with one outstanding at a time.
  virtual void run(std::size_t calls) = 0;
};

/// Speaks packets of the request's and the reply's size on sockets: one connection sends and
/// receives in turn, several are driven by epoll.
class SocketDriver final : public Driver {
 public:
  SocketDriver(Child server, std::vector<FileDescriptor> sockets);
  ~SocketDriver() override;
  void run(std::size_t calls) override;
  /// Keeps `descriptors` open as long as the connections.
  void keep(std::vector<FileDescriptor> descriptors) { kept_ = std::move(descriptors); }

 private:
  void runOne(std::size_t calls);
  void runAll(std::size_t calls);

  Child server_;
  std::vector<FileDescriptor> sockets_, kept_;
  std::vector<std::byte> request_;
  FileDescriptor epoll_;
};

enum class RawServer {
  kBlocking,          // receive and send in turn, one connection only
  kEpoll,             // wait for readiness, receive, send
  kEpollCredentials,  // the same, and the kernel attests the sender of each packet
};
/// The least that any transport over packet sockets costs.
[[nodiscard]] std::unique_ptr<Driver> StartRaw(const Placement& placement, std::size_t connections,
                                               RawServer kind);

/// A child that runs the helper's server objects on `service`, with every caller entitled. Its
/// request kMeasuredRequest answers at once; all others are the real ones. The helper remembers an
/// entitled process until that exits; without `remember`, kMeasuredRequest makes it forget.
[[nodiscard]] Child StartHelperServer(int processor, FileDescriptor service, bool remember = true);
[[nodiscard]] std::unique_ptr<Driver> StartHelper(const Placement& placement,
                                                  std::size_t connections);

enum class Bus { kPeerToPeer, kDaemon, kBroker };
/// The same call as a D-Bus method: a text of 255 letters in, an integer out. Null, with the reason
/// in `reason`, where the build or the machine lacks what it takes.
[[nodiscard]] std::unique_ptr<Driver> StartBus(const Placement& placement, std::size_t connections,
                                               Bus bus, std::string& reason);

/// Makes one fresh connection after the other.
class Connector {
 public:
  virtual ~Connector() = default;
  /// Connects from nothing and makes one call.
  virtual void open() = 0;
  virtual void close() = 0;
};
[[nodiscard]] std::unique_ptr<Connector> StartBusConnector(const Placement& placement,
                                                           std::string& reason);

}  // namespace bench
