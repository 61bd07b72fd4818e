// SPDX-License-Identifier: Apache-2.0
#include "Benchmarks/Transport/BusDaemon.h"
#include "Helper/Platform/UnixSocketAddress.h"

#include <fcntl.h>
#include <sys/socket.h>
#include <systemd/sd-bus.h>
#include <unistd.h>

#include <array>
#include <fstream>

namespace bench {
namespace {

constexpr char kDaemonProgram[] = "/usr/bin/dbus-daemon";
constexpr char kBrokerProgram[] = "/usr/bin/dbus-broker";

std::string OwnPath(const char* what) {
  return std::string("/tmp/halvec-benchmark-") + what + "-" + std::to_string(::getpid());
}

/// The broker is told by its controller whom to listen to and what to allow: here everything, in
/// the policy layout of its release 32 (batches by uid and by gid, SELinux labels, AppArmor).
bool AddListener(sd_bus* bus, int listener) {
  constexpr char kBatch[] = "bta(btbs)a(btssssuutt)a(btssssuutt)";
  const std::string batch(kBatch);
  const std::string byUser = "(u(" + batch + "))";
  const std::string byGroup = "(buu(" + batch + "))";
  const std::string policy = "a" + byUser + "a" + byGroup + "a(ss)bs";
  sd_bus_message* message = nullptr;
  sd_bus_error error{};
  constexpr std::uint64_t kPriority = 1;
  constexpr std::uint64_t kAnyCount = UINT64_MAX;
  bool added =
      sd_bus_message_new_method_call(bus, &message, nullptr, "/org/bus1/DBus/Broker",
                                     "org.bus1.DBus.Broker", "AddListener") >= 0 &&
      sd_bus_message_append(message, "oh", "/org/bus1/DBus/Listener/0", listener) >= 0 &&
      sd_bus_message_open_container(message, 'v', ("(" + policy + ")").c_str()) >= 0 &&
      sd_bus_message_open_container(message, 'r', policy.c_str()) >= 0 &&
      sd_bus_message_open_container(message, 'a', byUser.c_str()) >= 0 &&
      sd_bus_message_append(message, byUser.c_str(), UINT32_MAX,  // whoever has no batch of his own
                            1, kPriority,                         // may connect
                            1, 1, kPriority, 1, "",               // may own any name
                            1, 1, kPriority, "", "", "", "", 0, 0, std::uint64_t{0}, kAnyCount, 1,
                            1, kPriority, "", "", "", "", 0, 0, std::uint64_t{0}, kAnyCount) >= 0 &&
      sd_bus_message_close_container(message) >= 0 &&
      sd_bus_message_append(message, ("a" + byGroup).c_str(), 0) >= 0 &&
      sd_bus_message_append(message, "a(ss)bs", 0, 0, "system") >= 0 &&
      sd_bus_message_close_container(message) >= 0 &&
      sd_bus_message_close_container(message) >= 0 &&
      sd_bus_call(bus, message, 0, &error, nullptr) >= 0;
  if (!added && error.message) std::fprintf(stderr, "dbus-broker: %s\n", error.message);
  sd_bus_error_free(&error);
  sd_bus_message_unref(message);
  return added;
}

}  // namespace

FileDescriptor ListenAt(const std::string& path) {
  FileDescriptor socket(
      Check(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0), "socket"));
  const platform::UnixSocketAddress address(path);
  (void)::unlink(path.c_str());
  Check(::bind(socket.get(), address.get(), address.size()), "bind");
  Check(::listen(socket.get(), SOMAXCONN), "listen");
  return socket;
}

std::optional<BusDaemon> StartDaemon(int processor, std::string& reason) {
  if (::access(kDaemonProgram, X_OK) != 0) {
    reason = "dbus-daemon is not installed";
    return std::nullopt;
  }
  const std::string socket = OwnPath("daemon");
  const std::string configuration = socket + ".conf";
  std::ofstream(configuration)
      << "<!DOCTYPE busconfig PUBLIC \"-//freedesktop//DTD D-Bus Bus Configuration 1.0//EN\" "
         "\"http://www.freedesktop.org/standards/dbus/1.0/busconfig.dtd\">\n"
         "<busconfig><type>session</type><listen>unix:path="
      << socket
      << "</listen><servicedir>/usr/share/dbus-1/services</servicedir><auth>EXTERNAL</auth><policy "
         "context=\"default\"><allow user=\"*\"/>"
         "<allow own=\"*\"/><allow send_type=\"method_call\"/><allow send_destination=\"*\"/>"
         "<allow receive_sender=\"*\"/></policy></busconfig>\n";
  std::array<int, 2> ready{};
  Check(::pipe(ready.data()), "pipe");
  FileDescriptor readEnd(ready[0]), writeEnd(ready[1]);
  Child process(processor, [&] {
    const std::string file = "--config-file=" + configuration;
    const std::string print = "--print-address=" + std::to_string(writeEnd.get());
    ::execl(kDaemonProgram, kDaemonProgram, "--nofork", "--nopidfile", file.c_str(), print.c_str(),
            nullptr);
  });
  writeEnd.reset();
  // The daemon prints its address once it listens; without one it has failed.
  std::array<char, 256> line{};
  const ssize_t length = ::read(readEnd.get(), line.data(), line.size());
  (void)::unlink(configuration.c_str());
  if (length <= 0) {
    reason = "dbus-daemon did not start";
    return std::nullopt;
  }
  return BusDaemon{std::move(process), "unix:path=" + socket};
}

std::optional<BusDaemon> StartBroker(int processor, std::string& reason) {
  if (::access(kBrokerProgram, X_OK) != 0) {
    reason = "dbus-broker is not installed";
    return std::nullopt;
  }
  const std::string path = OwnPath("broker");
  FileDescriptor listener = ListenAt(path);
  SocketPair control = MakePair(SOCK_STREAM);
  Child process(processor, [&] {
    (void)::fcntl(control.second.get(), F_SETFD, 0);
    const std::string descriptor = std::to_string(control.second.get());
    ::execl(kBrokerProgram, kBrokerProgram, "--controller", descriptor.c_str(), "--machine-id",
            "0123456789abcdef0123456789abcdef", "--max-bytes", "536870912", "--max-fds", "4096",
            "--max-matches", "16384", nullptr);
  });
  control.second.reset();
  sd_bus* bus = nullptr;
  const int descriptor = control.first.release();
  const bool listening = sd_bus_new(&bus) >= 0 && sd_bus_set_fd(bus, descriptor, descriptor) >= 0 &&
                         sd_bus_start(bus) >= 0 && AddListener(bus, listener.get());
  if (!listening) {
    sd_bus_close_unref(bus);
    reason = "dbus-broker did not accept its controller";
    return std::nullopt;
  }
  // The broker leaves when its controller does, so the connection stays open to the end.
  static std::vector<sd_bus*> controllers;
  controllers.push_back(bus);
  return BusDaemon{std::move(process), "unix:path=" + path};
}

}  // namespace bench
