// SPDX-License-Identifier: Apache-2.0
//
// The helper's own server objects in a child process, with its system services replaced where they
// would measure something else: entitlement files and the system log.
#include <unistd.h>

#include <cstdlib>
#include <string>

#include "Benchmarks/Transport/Peer.h"
#include "Helper/Platform/CallerSecurity.h"
#include "Helper/Platform/SystemLog.h"
#include "Helper/Shared/Interface/Connect.h"
#include "Helper/Shared/Interface/Requests.h"
#include "Helper/Shared/Server/CallerEntitlement.h"
#include "Helper/Shared/Server/HelperServerUtils.h"
#include "Helper/Shared/Server/RequestCatalogue.h"
#include "Helper/Shared/Server/Stub.h"

namespace bench {
namespace {

class EntitledTask final : public platform::SecurityTask {
 public:
  platform::EntitlementAnswer copyValueForEntitlement(std::string_view /*name*/) override {
    return {.value = platform::PropertyList(true)};
  }
};

class EveryoneEntitled final : public platform::CallerSecurity {
 public:
  std::unique_ptr<platform::SecurityTask> createTask(const wire::AuditToken& /*token*/) override {
    return std::make_unique<EntitledTask>();
  }
};

class SilentLog final : public platform::SystemLog {
 public:
  void write(platform::LogPriority /*priority*/, std::string_view /*text*/) override {}
};

/// The process whose entitlement is forgotten with each request; 0: nobody's.
pid_t forgottenProcess = 0;

KernReturn AnswerAtOnce(PortName /*port*/, wire::Text<256>& /*token*/) {
  if (forgottenProcess != 0) HandleProcessExit(forgottenProcess);
  return KERN_FAILURE;
}

static_assert(requests::SetVoicemailToken::kId == kMeasuredRequest);
static_assert(requests::SetVoicemailToken::kRequestSize == kRequestSize);

platform::MigStub Demultiplex(const wire::MessageHeader& request) {
  if (request.id == kMeasuredRequest) return Serve<requests::SetVoicemailToken, AnswerAtOnce>::Stub;
  return RequestSubsystem().demultiplex(request);
}

void RunServer(FileDescriptor service, bool remember) {
  // The way in which a launcher hands the service port over.
  Check(::dup2(service.get(), 3), "dup2");
  // NOLINTBEGIN(concurrency-mt-unsafe): the child has no other thread yet.
  (void)::setenv("LISTEN_PID", std::to_string(::getpid()).c_str(), 1);
  (void)::setenv("LISTEN_FDS", "1", 1);
  (void)::setenv("LISTEN_FDNAMES", wire::kServiceName, 1);
  // NOLINTEND(concurrency-mt-unsafe)
  EveryoneEntitled security;
  SilentLog log;
  const platform::ScopedReplacement<platform::CallerSecurity> securityReplaced(security);
  const platform::ScopedReplacement<platform::SystemLog> logReplaced(log);
  if (!remember) forgottenProcess = ::getppid();
  platform::MigSubsystem subsystem = RequestSubsystem();
  subsystem.demultiplex = Demultiplex;
  HelperServer* server = HelperServerCreate(wire::kServiceName, &subsystem);
  if (!server) Fail("HelperServerCreate");
  (void)HelperServerRun(server);
}

}  // namespace

Child StartHelperServer(int processor, FileDescriptor service, bool remember) {
  return Child(processor, [&] { RunServer(std::move(service), remember); });
}

std::unique_ptr<Driver> StartHelper(const Placement& placement, std::size_t connections) {
  const std::string path = "/tmp/halvec-benchmark-" + std::to_string(::getpid());
  Child server = StartHelperServer(placement.server, BindService(path));
  std::vector<FileDescriptor> sockets, clientPorts;
  for (std::size_t index = 0; index < connections; ++index) {
    WireClient client = Connect(path);
    sockets.push_back(std::move(client.privatePort));
    clientPorts.push_back(std::move(client.clientPort));
  }
  (void)::unlink(path.c_str());
  auto driver = std::make_unique<SocketDriver>(std::move(server), std::move(sockets));
  driver->keep(std::move(clientPorts));
  return driver;
}

}  // namespace bench
