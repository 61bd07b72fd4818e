// SPDX-License-Identifier: Apache-2.0
//
// Messages as they arrive and as they leave: names, addresses, trailer, memory.
#include "Helper/Platform/PortMessage.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <sys/socket.h>

#include "Helper/Platform/ProcessIdentity.h"
#include "Helper/Platform/TaskMemory.h"
#include "Tests/Fakes/FakeTaskMemory.h"
#include "Tests/Support/WireClient.h"

namespace {

using namespace platform;
using support::Bytes;
using support::Get;
using support::Put;

/// A port of this process whose send end the test holds.
class PortMessage : public ::testing::Test {
 protected:
  PortMessage() {
    EXPECT_EQ(PortAllocate(name), KERN_SUCCESS);
    socket = PortReceiveDescriptor(name);
    sender = PortSendDescriptor(name);
  }
  ~PortMessage() override {
    buffer.clear();
    (void)PortDropReceiveRight(name);
  }
  ReceiveStatus receive(const Bytes& bytes, const std::vector<int>& descriptors = {}) {
    EXPECT_EQ(support::SendPacket(sender->get(), bytes, descriptors), 0);
    return buffer.receive(name, socket->get(), /*named=*/false);
  }
  [[nodiscard]] wire::Trailer trailer(std::size_t size) {
    return wire::Load<wire::Trailer>(buffer.message() + ((size + 3) & ~std::size_t{3}));
  }
  /// A complex message of `size` bytes with one out-of-line descriptor for `count` bytes.
  static Bytes withMemory(std::uint32_t size, std::uint32_t count, std::uint64_t place) {
    Bytes bytes = support::Message(7, size);
    Put(bytes, 0, 0x80000000U);
    Put(bytes, 24, 1U);
    Put(bytes, 28, place);
    bytes[39] = 1;
    Put(bytes, 40, count);
    return bytes;
  }
  [[nodiscard]] std::string memoryText() {
    const auto address = wire::Load<std::uint64_t>(buffer.message() + 28);
    const auto size = wire::Load<std::uint32_t>(buffer.message() + 40);
    return {reinterpret_cast<const char*>(address), size};
  }
  static FileDescriptor sealed(const std::string& text) {
    FileDescriptor file(::memfd_create("test", MFD_CLOEXEC | MFD_ALLOW_SEALING));
    EXPECT_EQ(::write(file.get(), text.data(), text.size()), static_cast<ssize_t>(text.size()));
    EXPECT_EQ(::fcntl(file.get(), F_ADD_SEALS, F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_WRITE), 0);
    return file;
  }

  PortName name = kPortNull;
  SharedDescriptor socket;
  SharedDescriptor sender;
  ReceiveBuffer buffer;
};

TEST_F(PortMessage, ArrivesWithTheReceiversNameAndNoneOfTheSenders) {
  Bytes bytes = support::Message(8683551, 24);
  Put(bytes, 8, 0x11111111U);
  Put(bytes, 12, 0x22222222U);
  Put(bytes, 16, 0x33333333U);
  ASSERT_EQ(receive(bytes), ReceiveStatus::kMessage);
  const wire::MessageHeader header = buffer.header();
  EXPECT_EQ(header.localPort, name);
  EXPECT_EQ(header.remotePort, kPortNull);
  EXPECT_EQ(header.voucherPort, kPortNull);
  EXPECT_EQ(header.id, 8683551);
}

TEST_F(PortMessage, HasATrailerFromTheKernelBehindItWhateverItsBytesSay) {
  Bytes bytes = support::Message(1, 288);
  std::fill(bytes.begin() + 24, bytes.end(), std::uint8_t{0xff});
  ASSERT_EQ(receive(bytes), ReceiveStatus::kMessage);
  const wire::Trailer first = trailer(288);
  EXPECT_EQ(first.type, 0U);
  EXPECT_EQ(first.size, 52U);
  EXPECT_EQ(first.sequence, 0U);
  EXPECT_EQ(first.securityUid, ::getuid());
  EXPECT_EQ(first.securityGid, ::getgid());
  const auto process = static_cast<std::uint32_t>(::getpid());
  EXPECT_EQ(first.auditToken.words,
            (std::array<std::uint32_t, 8>{::getuid(), ::getuid(), ::getgid(), ::getuid(),
                                          ::getgid(), process, 0, 0}));
  ASSERT_EQ(receive(support::Message(1, 25)), ReceiveStatus::kMessage);
  EXPECT_EQ(trailer(25).sequence, 1U) << "on the next multiple of four bytes";
}

TEST_F(PortMessage, OnANamedPortCarriesTheProcessVersion) {
  const support::LauncherSocket launcher("com.example.version");
  PortName service = kPortNull;
  ASSERT_EQ(BootstrapCheckIn("com.example.version", service), KERN_SUCCESS);
  support::WireClient client(launcher.path());
  client.sendConnect();
  const SharedDescriptor port = PortReceiveDescriptor(service);
  ASSERT_EQ(buffer.receive(service, port->get(), /*named=*/true), ReceiveStatus::kMessage);
  EXPECT_EQ(trailer(40).auditToken.words[7],
            ProcessVersion(OpenPidfd(::getpid()).get(), ::getpid()));
  EXPECT_EQ(PortDeallocate(service), KERN_SUCCESS);
}

TEST_F(PortMessage, IsNothingWhereNoneWaits) {
  EXPECT_EQ(buffer.receive(name, socket->get(), false), ReceiveStatus::kNothing);
}

TEST_F(PortMessage, OfNoBytesIsNotTheEndButAShutdownIs) {
  EXPECT_EQ(receive({}), ReceiveStatus::kNothing);
  ASSERT_EQ(::shutdown(sender->get(), SHUT_WR), 0);
  EXPECT_EQ(buffer.receive(name, socket->get(), false), ReceiveStatus::kEnded);
}

TEST_F(PortMessage, MovesASendRightUnderANewName) {
  support::PortPair port = support::MakePort();
  Bytes bytes = support::Message(7, 40);
  Put(bytes, 0, 0x80000000U);
  Put(bytes, 24, 1U);
  bytes[38] = 17;
  ASSERT_EQ(receive(bytes, {port.send.get()}), ReceiveStatus::kMessage);
  port.send.reset();
  const auto right = wire::Load<PortName>(buffer.message() + 28);
  ASSERT_TRUE(PortQuery(right));
  EXPECT_EQ(PortQuery(right)->sendReferences, 1U);

  buffer.disownRights();
  buffer.clear();
  EXPECT_TRUE(PortQuery(right)) << "the routine has taken it over";
  EXPECT_EQ(PortDeallocate(right), KERN_SUCCESS);
  EXPECT_TRUE(support::IsHungUp(port.receive.get()));
}

TEST_F(PortMessage, TakesItsRightsWithItWhenNobodyTookThemOver) {
  support::PortPair port = support::MakePort();
  const std::size_t names = PortNameCount();
  Bytes bytes = support::Message(7, 40);
  Put(bytes, 0, 0x80000000U);
  Put(bytes, 24, 1U);
  bytes[38] = 17;
  ASSERT_EQ(receive(bytes, {port.send.get()}), ReceiveStatus::kMessage);
  port.send.reset();
  buffer.clear();
  EXPECT_EQ(PortNameCount(), names);
  EXPECT_TRUE(support::IsHungUp(port.receive.get()));
}

TEST_F(PortMessage, ReadsMemoryThatTravelsBehindIt) {
  for (const std::uint32_t size : {44U, 45U, 46U, 47U, 568U}) {
    Bytes bytes = withMemory(size, 11, 0);
    for (const char letter : std::string("elevenbytes")) {
      bytes.push_back(static_cast<std::uint8_t>(letter));
    }
    ASSERT_EQ(receive(bytes), ReceiveStatus::kMessage) << size;
    EXPECT_EQ(memoryText(), "elevenbytes") << size;
    EXPECT_EQ(buffer.header().size, size);
    EXPECT_EQ(trailer(size).size, 52U) << "the trailer must not overwrite the memory";
    EXPECT_EQ(reinterpret_cast<std::uintptr_t>(buffer.message()) % 4, 0U);
  }
}

TEST_F(PortMessage, Reads128KiBBehindItAndRefusesOneByteMore) {
  Bytes bytes = withMemory(568, 131072, 0);
  bytes.resize(568 + 131072, 'x');
  ASSERT_EQ(receive(bytes), ReceiveStatus::kMessage);
  EXPECT_EQ(memoryText(), std::string(131072, 'x'));
  for (const std::uint32_t size : {568U, 4096U}) {
    bytes = withMemory(size, 131073, 0);
    bytes.resize(size + 131073, 'x');
    ASSERT_EQ(receive(bytes), ReceiveStatus::kRefused) << size;
    EXPECT_EQ(buffer.refusal(), MIG_BAD_ARGUMENTS);
  }
}

TEST_F(PortMessage, RefusesMemoryOfSeveralDescriptorsBeyond128KiBInAll) {
  for (const std::uint32_t second : {1U, 2U}) {
    Bytes bytes = withMemory(60, 131071, 0);
    Put(bytes, 24, 2U);
    bytes[55] = 1;
    Put(bytes, 56, second);
    bytes.resize(60 + 131071 + second, 'x');
    EXPECT_EQ(receive(bytes), second == 1 ? ReceiveStatus::kMessage : ReceiveStatus::kRefused);
  }
}

TEST_F(PortMessage, ReadsSealedMemoryOfAnySize) {
  for (const std::size_t size : {1UL, 4096UL, 131073UL, 16UL * 1024 * 1024}) {
    const std::string text(size, 'y');
    const FileDescriptor file = sealed(text);
    ASSERT_EQ(receive(withMemory(44, static_cast<std::uint32_t>(size), 1), {file.get()}),
              ReceiveStatus::kMessage);
    EXPECT_EQ(memoryText(), text);
  }
}

TEST_F(PortMessage, OnANamedPortHasItsMemoryCheckedButNotRead) {
  const FileDescriptor file = sealed("0123456789");
  ASSERT_EQ(support::SendPacket(sender->get(), withMemory(44, 10, 1), {file.get()}), 0);
  ASSERT_EQ(buffer.receive(name, socket->get(), /*named=*/true), ReceiveStatus::kMessage);
  EXPECT_EQ(wire::Load<std::uint64_t>(buffer.message() + 28), 0U) << "there is no copy";
  ASSERT_EQ(support::SendPacket(sender->get(), withMemory(44, 11, 1), {file.get()}), 0);
  EXPECT_EQ(buffer.receive(name, socket->get(), /*named=*/true), ReceiveStatus::kRefused);
}

TEST_F(PortMessage, LeavesTheFileOffsetOfSealedMemoryAlone) {
  const FileDescriptor file = sealed("0123456789");
  ASSERT_EQ(::lseek(file.get(), 4, SEEK_SET), 4);
  ASSERT_EQ(receive(withMemory(44, 10, 1), {file.get()}), ReceiveStatus::kMessage);
  EXPECT_EQ(memoryText(), "0123456789");
  EXPECT_EQ(::lseek(file.get(), 0, SEEK_CUR), 4);
}

TEST_F(PortMessage, WithAnUnknownPlaceOfMemoryIsRefused) {
  EXPECT_EQ(receive(withMemory(44, 1, 2)), ReceiveStatus::kRefused);
  EXPECT_EQ(receive(withMemory(44, 1, ~std::uint64_t{0})), ReceiveStatus::kRefused);
}

TEST_F(PortMessage, WithEmptyMemoryHasANullAddress) {
  ASSERT_EQ(receive(withMemory(44, 0, 0)), ReceiveStatus::kMessage);
  EXPECT_EQ(wire::Load<std::uint64_t>(buffer.message() + 28), 0U);
}

/// Sending: what leaves, and what leaves the address space with it.
class OutgoingMessage : public ::testing::Test {
 protected:
  /// A reply that hands over `size` bytes.
  std::vector<std::byte> reply(std::uint32_t size) {
    std::vector<std::byte> bytes(56);
    wire::Store(bytes.data(), wire::MessageHeader{.bits = wire::kComplexBit, .size = 56, .id = 9});
    wire::Store(bytes.data() + 24, std::uint32_t{1});
    VmAddress address = 0;
    if (size > 0) {
      EXPECT_EQ(memory.allocate(address, size), KERN_SUCCESS);
      std::memset(reinterpret_cast<void*>(address), 'z', size);
    }
    wire::Store(bytes.data() + 28, address);
    wire::Store(bytes.data() + 36, std::array<std::uint8_t, 4>{1, 1, 0, 1});
    wire::Store(bytes.data() + 40, size);
    return bytes;
  }
  fakes::FakeTaskMemory memory;
  ScopedReplacement<TaskMemory> replacement{memory};
  support::PortPair port = support::MakePort();
};

TEST_F(OutgoingMessage, CarriesUpTo128KiBBehindIt) {
  for (const std::uint32_t size : {0U, 1U, 131072U}) {
    std::vector<std::byte> message = reply(size);
    ASSERT_TRUE(SendMessage(port.send.get(), message.data()));
    const support::Packet packet = support::ReceivePacket(port.receive.get());
    ASSERT_EQ(packet.bytes.size(), 56 + size);
    EXPECT_EQ(Get<std::uint64_t>(packet.bytes, 28), 0U);
    EXPECT_TRUE(packet.descriptors.empty());
    EXPECT_EQ(memory.regions(), 0) << "the region has left the address space";
  }
}

TEST_F(OutgoingMessage, CarriesMoreInSealedMemory) {
  std::vector<std::byte> message = reply(131073);
  ASSERT_TRUE(SendMessage(port.send.get(), message.data()));
  const support::Packet packet = support::ReceivePacket(port.receive.get());
  EXPECT_EQ(packet.bytes.size(), 56U);
  EXPECT_EQ(Get<std::uint64_t>(packet.bytes, 28), 1U);
  EXPECT_EQ(Get<std::uint32_t>(packet.bytes, 40), 131073U);
  ASSERT_EQ(packet.descriptors.size(), 1U);
  const int file = packet.descriptors[0].get();
  EXPECT_EQ(::fcntl(file, F_GET_SEALS), F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_WRITE | F_SEAL_SEAL);
  std::string content(131074, '\0');
  EXPECT_EQ(::pread(file, content.data(), content.size(), 0), 131073);
  EXPECT_EQ(content.substr(0, 131073), std::string(131073, 'z'));
  EXPECT_EQ(memory.regions(), 0);
}

TEST_F(OutgoingMessage, CarriesInSealedMemoryWhatTheSocketTakesInNoPacket) {
  const int small = 32 * 1024;
  ASSERT_EQ(::setsockopt(port.send.get(), SOL_SOCKET, SO_SNDBUF, &small, sizeof small), 0);
  std::vector<std::byte> message = reply(100'000);
  ASSERT_TRUE(SendMessage(port.send.get(), message.data()));
  const support::Packet packet = support::ReceivePacket(port.receive.get());
  EXPECT_EQ(packet.bytes.size(), 56U);
  EXPECT_EQ(Get<std::uint64_t>(packet.bytes, 28), 1U);
  EXPECT_EQ(Get<std::uint32_t>(packet.bytes, 40), 100'000U);
  ASSERT_EQ(packet.descriptors.size(), 1U);
  std::string content(100'001, '\0');
  EXPECT_EQ(::pread(packet.descriptors[0].get(), content.data(), content.size(), 0), 100'000);
  EXPECT_EQ(content.substr(0, 100'000), std::string(100'000, 'z'));
  EXPECT_EQ(memory.regions(), 0);
}

TEST_F(OutgoingMessage, WithMoreThan16MiBIsNotSent) {
  std::vector<std::byte> message = reply(16 * 1024 * 1024 + 1);
  EXPECT_FALSE(SendMessage(port.send.get(), message.data()));
  EXPECT_TRUE(support::ReceivePacket(port.receive.get()).bytes.empty());
  EXPECT_EQ(memory.regions(), 0);
}

TEST_F(OutgoingMessage, GivesItsMemoryBackWhenNobodyReceivesIt) {
  port.receive.reset();
  std::vector<std::byte> message = reply(100);
  EXPECT_FALSE(SendMessage(port.send.get(), message.data()));
  EXPECT_EQ(memory.regions(), 0);
  message = reply(100);
  EXPECT_FALSE(SendMessage(-1, message.data()));
  EXPECT_EQ(memory.regions(), 0);
}

TEST_F(OutgoingMessage, DoesNotWaitForAReceiverThatDoesNotRead) {
  std::vector<std::byte> message = reply(0);
  int sent = 0;
  while (sent < 10'000 && SendMessage(port.send.get(), message.data())) ++sent;
  EXPECT_GT(sent, 10);
  EXPECT_LT(sent, 10'000);
}

TEST_F(OutgoingMessage, WithARightThatIsNotThereIsNotSent) {
  std::vector<std::byte> message(40);
  wire::Store(message.data(), wire::MessageHeader{.bits = wire::kComplexBit, .size = 40, .id = 9});
  wire::Store(message.data() + 24, std::uint32_t{1});
  wire::Store(message.data() + 38, std::uint16_t{wire::kCopySend});
  EXPECT_FALSE(SendMessage(port.send.get(), message.data()));
}

TEST(TaskMemoryRegion, IsZeroFilledAndRefusedForNoSize) {
  TaskMemory& memory = DefaultProvider<TaskMemory>();
  VmAddress address = 77;
  EXPECT_EQ(memory.allocate(address, 0), KERN_INVALID_ARGUMENT);
  EXPECT_EQ(address, 77U);
  EXPECT_EQ(memory.allocate(address, std::size_t{1} << 60), KERN_NO_SPACE);
  EXPECT_EQ(address, 77U);
  ASSERT_EQ(memory.allocate(address, 5000), KERN_SUCCESS);
  const auto* bytes = reinterpret_cast<const char*>(address);
  EXPECT_EQ(std::string(bytes, 5000), std::string(5000, '\0'));
  memory.deallocate(address, 5000);
}

}  // namespace
