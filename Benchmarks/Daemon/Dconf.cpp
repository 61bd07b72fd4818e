// SPDX-License-Identifier: Apache-2.0
#include "Benchmarks/Daemon/Dconf.h"

#include <dconf.h>
#include <unistd.h>

#include <cstdlib>
#include <optional>
#include <utility>

#include "Benchmarks/Support/Measure.h"
#include "Benchmarks/Transport/BusDaemon.h"

namespace bench {
namespace {

struct Unref {
  void operator()(void* object) const { g_object_unref(object); }
};

class SessionStore final : public DconfStore {
 public:
  explicit SessionStore(BusDaemon bus)
      : bus_(std::move(bus)),
        connection_(g_bus_get_sync(G_BUS_TYPE_SESSION, nullptr, nullptr)),
        client_(dconf_client_new()) {
    if (!connection_) Fail("session bus");
    // The store shares this connection, which by default ends the process when the bus goes.
    g_dbus_connection_set_exit_on_close(connection_.get(), FALSE);
  }
  void set(int value) override {
    GError* error = nullptr;
    if (dconf_client_write_sync(client_.get(), "/benchmark/count", g_variant_new_int32(value),
                                nullptr, nullptr, &error) == 0) {
      Fail(error ? error->message : "dconf");
    }
  }

 private:
  BusDaemon bus_;
  std::unique_ptr<GDBusConnection, Unref> connection_;
  std::unique_ptr<DConfClient, Unref> client_;
};

}  // namespace

std::unique_ptr<DconfStore> StartDconf(std::string& reason) {
  constexpr char kService[] = "/usr/share/dbus-1/services/ca.desrt.dconf.service";
  if (::access(kService, R_OK) != 0) {
    reason = "dconf-service is not installed";
    return nullptr;
  }
  // NOLINTBEGIN(concurrency-mt-unsafe): no other thread runs yet.
  (void)::setenv("HOME", "/root", 1);
  (void)::setenv("XDG_CONFIG_HOME", "/root/.config", 1);
  (void)::setenv("XDG_RUNTIME_DIR", "/run", 1);
  std::optional<BusDaemon> bus = StartDaemon(-1, reason);
  if (!bus) return nullptr;
  (void)::setenv("DBUS_SESSION_BUS_ADDRESS", bus->address.c_str(), 1);
  // NOLINTEND(concurrency-mt-unsafe)
  return std::make_unique<SessionStore>(std::move(*bus));
}

}  // namespace bench
