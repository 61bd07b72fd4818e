// SPDX-License-Identifier: Apache-2.0
//
// Feeds packets to a private port and to a service port, as a client could send them: the port
// layer, every stub and every routine, on services in memory. The first byte picks the port and
// whether descriptors come along; the rest is the packet. Whatever arrives, every name and
// descriptor must be given back. One thread, beside those of the work that requests start.
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/socket.h>

#include <cstdlib>
#include <memory>

#include "Helper/Platform/PortMessage.h"
#include "Helper/Platform/vlu/HttpTransport.h"
#include "Helper/Shared/Server/ConnectSubsystem.h"
#include "Helper/Shared/Server/RequestCatalogue.h"
#include "Tests/Fakes/FakeArchiveCopier.h"
#include "Tests/Fakes/FakeCallerSecurity.h"
#include "Tests/Fakes/FakeDirectoryEntries.h"
#include "Tests/Fakes/FakeEchoService.h"
#include "Tests/Fakes/FakeFileManager.h"
#include "Tests/Fakes/FakeMapService.h"
#include "Tests/Fakes/FakeMessagePorts.h"
#include "Tests/Fakes/FakePreferencesStore.h"
#include "Tests/Fakes/FakeSystemLog.h"
#include "Tests/Fakes/FakeUserDatabase.h"
#include "Tests/Fakes/FakeVoicemailTokenStore.h"
#include "Tests/Support/WireClient.h"

namespace {

/// Reaches nothing.
class NoWeb final : public vlu::Http::HttpTransport {
 public:
  bool accepts(const std::string& /*url*/) override { return false; }
  std::shared_ptr<vlu::Http::HttpResponse> retrieve(
      const vlu::Http::Transfer& /*transfer*/) override {
    return nullptr;
  }
};

/// Whatever a request may change or open is in memory: this runs on somebody's own machine, and a
/// descriptor that another thread opens meanwhile would be taken for a lost one.
struct Bench {
  fakes::FakeSystemLog log;
  platform::ScopedReplacement<platform::SystemLog> logReplacement{log};
  fakes::FakeCallerSecurity security;  // nobody is entitled: connects end before a server is needed
  platform::ScopedReplacement<platform::CallerSecurity> securityReplacement{security};
  fakes::FakePreferencesStore store;
  platform::ScopedReplacement<platform::PreferencesStore> storeReplacement{store};
  fakes::FakeVoicemailTokenStore tokens;
  platform::ScopedReplacement<platform::VoicemailTokenStore> tokensReplacement{tokens};
  fakes::FakeMessagePorts ports;  // none is published
  platform::ScopedReplacement<platform::MessagePorts> portsReplacement{ports};
  fakes::FakeFileManager files;
  platform::ScopedReplacement<platform::FileManager> filesReplacement{files};
  fakes::FakeDirectoryEntries entries;
  platform::ScopedReplacement<platform::DirectoryEntries> entriesReplacement{entries};
  fakes::FakeArchiveCopierFactory archives;
  platform::ScopedReplacement<platform::ArchiveCopierFactory> archivesReplacement{archives};
  fakes::FakeUserDatabase users;
  platform::ScopedReplacement<platform::UserDatabase> usersReplacement{users};
  fakes::FakeMapService maps;
  platform::ScopedReplacement<platform::MapService> mapsReplacement{maps};
  fakes::FakeCountryConfiguration country;
  platform::ScopedReplacement<platform::CountryConfiguration> countryReplacement{country};
  fakes::FakeEchoService network;
  platform::ScopedReplacement<platform::EchoService> networkReplacement{network};
  NoWeb web;
  platform::ScopedReplacement<vlu::Http::HttpTransport> webReplacement{web};
  platform::ReceiveBuffer buffer;
  PortName port = kPortNull;

  Bench() { (void)platform::PortAllocate(port); }

  void deliver(const support::Bytes& packet, bool named, const std::vector<int>& descriptors) {
    const auto sender = platform::PortSendDescriptor(port);
    const auto receiver = platform::PortReceiveDescriptor(port);
    if (support::SendPacket(sender->get(), packet, descriptors) != 0) return;
    if (buffer.receive(port, receiver->get(), named) == platform::ReceiveStatus::kMessage) {
      const platform::MigSubsystem& subsystem = named ? ConnectSubsystem() : RequestSubsystem();
      alignas(16) std::array<std::byte, platform::kMaxReplySize> reply;
      const wire::MessageHeader header = buffer.header();
      platform::PrepareReply(header, reply.data(), subsystem.maxReplySize);
      if (const platform::MigStub stub = subsystem.demultiplex(header)) {
        stub(buffer.message(), reply.data());
      }
      (void)platform::SendMessage(receiver->get(), reply.data());
    }
    buffer.clear();
    while (!support::ReceivePacket(sender->get()).bytes.empty()) {
    }
    (void)log.takeLines();
    (void)network.takeSent();
    maps.submissions.clear();
    archives.copies.clear();
  }
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static auto* bench = new Bench;
  if (size == 0) return 0;
  const std::uint8_t choice = data[0];
  const support::Bytes packet(data + 1, data + size);
  const std::size_t names = platform::PortNameCount();
  const std::size_t open = support::OpenDescriptors();
  {
    const support::PortPair right = support::MakePort();
    const support::FileDescriptor memory(::memfd_create("fuzz", MFD_CLOEXEC | MFD_ALLOW_SEALING));
    if (::ftruncate(memory.get(), choice & 0x3f) != 0) std::abort();
    (void)::fcntl(memory.get(), F_ADD_SEALS, F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_WRITE);
    std::vector<int> descriptors;
    if ((choice & 0x40) != 0) descriptors.push_back(right.send.get());
    if ((choice & 0x20) != 0) descriptors.push_back(memory.get());
    bench->deliver(packet, (choice & 0x80) != 0, descriptors);
  }
  if (platform::PortNameCount() != names || support::OpenDescriptors() != open) std::abort();
  return 0;
}
