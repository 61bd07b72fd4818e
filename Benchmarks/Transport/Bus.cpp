// SPDX-License-Identifier: Apache-2.0
//
// The same call over D-Bus, spoken by sd-bus on both sides: directly between the two processes, or
// through a message bus daemon. The daemon runs on the server's processor.
#include <sys/socket.h>
#include <systemd/sd-bus.h>
#include <systemd/sd-event.h>
#include <unistd.h>

#include <cerrno>
#include <string>
#include <utility>

#include "Benchmarks/Transport/BusDaemon.h"
#include "Benchmarks/Transport/Peer.h"

namespace bench {
namespace {

constexpr char kObject[] = "/benchmark";
constexpr char kInterface[] = "benchmark.Store";
constexpr char kMethod[] = "Set";
constexpr char kServerName[] = "benchmark.Server";

struct CloseBus {
  void operator()(sd_bus* bus) const {
    sd_bus_close(bus);
    sd_bus_unref(bus);
  }
};
using BusPointer = std::unique_ptr<sd_bus, CloseBus>;

struct UnrefEvent {
  void operator()(sd_event* event) const { sd_event_unref(event); }
};
using EventPointer = std::unique_ptr<sd_event, UnrefEvent>;

struct UnrefMessage {
  void operator()(sd_bus_message* message) const { sd_bus_message_unref(message); }
};
using MessagePointer = std::unique_ptr<sd_bus_message, UnrefMessage>;

/// sd-bus answers with negative error numbers.
void Succeed(int result, const char* what) {
  if (result >= 0) return;
  errno = -result;
  Fail(what);
}

int Answer(sd_bus_message* call, void* /*context*/, sd_bus_error* /*error*/) {
  const char* text = nullptr;
  if (sd_bus_message_read(call, "s", &text) < 0) return -EINVAL;
  return sd_bus_reply_method_return(call, "i", 5);
}

const sd_bus_vtable kMethods[] = {
    SD_BUS_VTABLE_START(0), SD_BUS_METHOD(kMethod, "s", "i", Answer, SD_BUS_VTABLE_UNPRIVILEGED),
    SD_BUS_VTABLE_END};

BusPointer NewBus() {
  sd_bus* bus = nullptr;
  Succeed(sd_bus_new(&bus), "sd_bus_new");
  return BusPointer(bus);
}

EventPointer NewEvent() {
  sd_event* event = nullptr;
  Succeed(sd_event_new(&event), "sd_event_new");
  return EventPointer(event);
}

BusPointer OpenSocket(FileDescriptor socket, bool server) {
  BusPointer bus = NewBus();
  const int descriptor = socket.release();
  Succeed(sd_bus_set_fd(bus.get(), descriptor, descriptor), "sd_bus_set_fd");
  if (server) {
    const sd_id128_t id{.qwords = {1, 1}};
    Succeed(sd_bus_set_server(bus.get(), 1, id), "sd_bus_set_server");
    Succeed(sd_bus_add_object_vtable(bus.get(), nullptr, kObject, kInterface,
                                     static_cast<const sd_bus_vtable*>(kMethods), nullptr),
            "sd_bus_add_object_vtable");
  }
  Succeed(sd_bus_start(bus.get()), "sd_bus_start");
  return bus;
}

BusPointer OpenAddress(const std::string& address, bool busClient) {
  BusPointer bus = NewBus();
  Succeed(sd_bus_set_address(bus.get(), address.c_str()), "sd_bus_set_address");
  Succeed(sd_bus_set_bus_client(bus.get(), busClient ? 1 : 0), "sd_bus_set_bus_client");
  Succeed(sd_bus_start(bus.get()), "sd_bus_start");
  return bus;
}

/// One connection needs no event loop: this is the shortest way that the library offers.
void ServeOne(sd_bus* bus) {
  for (;;) {
    const int worked = sd_bus_process(bus, nullptr);
    if (worked < 0) return;
    if (worked == 0 && sd_bus_wait(bus, UINT64_MAX) < 0) return;
  }
}

void ServeSockets(std::vector<FileDescriptor> sockets) {
  if (sockets.size() == 1) {
    return ServeOne(OpenSocket(std::move(sockets.front()), true).get());
  }
  const EventPointer event = NewEvent();
  std::vector<BusPointer> buses;
  for (FileDescriptor& socket : sockets) {
    buses.push_back(OpenSocket(std::move(socket), true));
    Succeed(sd_bus_attach_event(buses.back().get(), event.get(), 0), "sd_bus_attach_event");
  }
  (void)sd_event_loop(event.get());
}

void ServeName(const std::string& address) {
  const BusPointer bus = OpenAddress(address, true);
  Succeed(sd_bus_add_object_vtable(bus.get(), nullptr, kObject, kInterface,
                                   static_cast<const sd_bus_vtable*>(kMethods), nullptr),
          "sd_bus_add_object_vtable");
  Succeed(sd_bus_request_name(bus.get(), kServerName, 0), "sd_bus_request_name");
  ServeOne(bus.get());
}

/// A call that waits; false when there is no such server (yet).
bool CallOnce(sd_bus* bus, const char* destination, const std::string& text) {
  sd_bus_error error{};
  sd_bus_message* answer = nullptr;
  const int result = sd_bus_call_method(bus, destination, kObject, kInterface, kMethod, &error,
                                        &answer, "s", text.c_str());
  const MessagePointer owned(answer);
  sd_bus_error_free(&error);
  std::int32_t code = 0;
  return result >= 0 && sd_bus_message_read(answer, "i", &code) >= 0 && code == 5;
}

class BusDriver final : public Driver {
 public:
  BusDriver(Child daemon, Child server, std::vector<BusPointer> buses, const char* destination)
      : daemon_(std::move(daemon)),
        server_(std::move(server)),
        buses_(std::move(buses)),
        destination_(destination) {
    // A bus daemon answers calls to a name that nobody owns yet with an error.
    while (!CallOnce(buses_.front().get(), destination_, text_)) (void)::usleep(1000);
    if (buses_.size() == 1) return;
    event_ = NewEvent();
    for (const BusPointer& bus : buses_) {
      Succeed(sd_bus_attach_event(bus.get(), event_.get(), 0), "sd_bus_attach_event");
    }
  }

  void run(std::size_t calls) override {
    if (!event_) {
      for (std::size_t call = 0; call < calls; ++call) {
        if (!CallOnce(buses_.front().get(), destination_, text_)) Fail("sd_bus_call_method");
      }
      return;
    }
    toSend_ = calls;
    toReceive_ = calls;
    for (const BusPointer& bus : buses_) send(bus.get());
    while (toReceive_ > 0) Succeed(sd_event_run(event_.get(), UINT64_MAX), "sd_event_run");
  }

 private:
  void send(sd_bus* bus) {
    if (toSend_ == 0) return;
    --toSend_;
    Succeed(sd_bus_call_method_async(bus, nullptr, destination_, kObject, kInterface, kMethod,
                                     Answered, this, "s", text_.c_str()),
            "sd_bus_call_method_async");
  }

  static int Answered(sd_bus_message* answer, void* context, sd_bus_error* /*error*/) {
    auto* driver = static_cast<BusDriver*>(context);
    std::int32_t code = 0;
    if (sd_bus_message_read(answer, "i", &code) < 0 || code != 5) Fail("answer");
    --driver->toReceive_;
    driver->send(sd_bus_message_get_bus(answer));
    return 0;
  }

  Child daemon_, server_;
  EventPointer event_;
  std::vector<BusPointer> buses_;
  const char* destination_;
  const std::string text_ = std::string(255, 't');
  std::size_t toSend_ = 0;
  std::size_t toReceive_ = 0;
};

/// Accepts connections and serves each until it is closed.
void ServeListener(int listener) {
  const EventPointer event = NewEvent();
  static std::vector<BusPointer> buses;
  const auto accept = [](sd_event_source* source, int descriptor, std::uint32_t /*events*/,
                         void* /*context*/) {
    std::erase_if(buses, [](const BusPointer& bus) { return sd_bus_is_open(bus.get()) <= 0; });
    FileDescriptor socket(::accept4(descriptor, nullptr, nullptr, SOCK_CLOEXEC));
    if (!socket) return 0;
    buses.push_back(OpenSocket(std::move(socket), true));
    return sd_bus_attach_event(buses.back().get(), sd_event_source_get_event(source), 0);
  };
  Succeed(sd_event_add_io(event.get(), nullptr, listener, EPOLLIN, accept, nullptr),
          "sd_event_add_io");
  (void)sd_event_loop(event.get());
}

class BusConnector final : public Connector {
 public:
  BusConnector(Child server, std::string address)
      : server_(std::move(server)), address_(std::move(address)) {}
  void open() override {
    bus_ = OpenAddress(address_, false);
    if (!CallOnce(bus_.get(), nullptr, text_)) Fail("first call");
  }
  void close() override { bus_.reset(); }

 private:
  Child server_;
  const std::string address_;
  const std::string text_ = std::string(255, 't');
  BusPointer bus_;
};

std::unique_ptr<Driver> StartPeerToPeer(const Placement& placement, std::size_t connections) {
  std::vector<FileDescriptor> clients, servers;
  for (std::size_t index = 0; index < connections; ++index) {
    SocketPair pair = MakePair(SOCK_STREAM);
    clients.push_back(std::move(pair.first));
    servers.push_back(std::move(pair.second));
  }
  Child server(placement.server, [&] { ServeSockets(std::move(servers)); });
  servers.clear();
  std::vector<BusPointer> buses;
  buses.reserve(clients.size());
  for (FileDescriptor& socket : clients) buses.push_back(OpenSocket(std::move(socket), false));
  return std::make_unique<BusDriver>(Child(), std::move(server), std::move(buses), nullptr);
}

}  // namespace

std::unique_ptr<Driver> StartBus(const Placement& placement, std::size_t connections, Bus bus,
                                 std::string& reason) {
  if (bus == Bus::kPeerToPeer) return StartPeerToPeer(placement, connections);
  std::optional<BusDaemon> daemon = bus == Bus::kDaemon ? StartDaemon(placement.server, reason)
                                                        : StartBroker(placement.server, reason);
  if (!daemon) return nullptr;
  Child server(placement.server, [&] { ServeName(daemon->address); });
  std::vector<BusPointer> buses;
  for (std::size_t index = 0; index < connections; ++index) {
    buses.push_back(OpenAddress(daemon->address, true));
  }
  return std::make_unique<BusDriver>(std::move(daemon->process), std::move(server),
                                     std::move(buses), kServerName);
}

std::unique_ptr<Connector> StartBusConnector(const Placement& placement, std::string& /*reason*/) {
  const std::string path = "/tmp/halvec-benchmark-bus-" + std::to_string(::getpid());
  const FileDescriptor listener = ListenAt(path);
  Child server(placement.server, [&] { ServeListener(listener.get()); });
  return std::make_unique<BusConnector>(std::move(server), "unix:path=" + path);
}

}  // namespace bench
