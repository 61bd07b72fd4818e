// SPDX-License-Identifier: Apache-2.0
//
// Literal bytes and plain socket calls.
#include "Tests/Client/FakeHelper.h"
#include "Helper/Platform/UnixSocketAddress.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/mman.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cctype>
#include <cstring>
#include <filesystem>
#include <stdexcept>

namespace fake {
namespace {

constexpr std::string_view kFileName = "/com.zarvo.halvec.mobile-helper";

void Require(bool condition, const char* what) {
  if (!condition) throw std::runtime_error(std::string(what) + ": " + ::strerrordesc_np(errno));
}

std::size_t CountDescriptors() {
  const std::filesystem::directory_iterator folder("/proc/self/fd");
  return static_cast<std::size_t>(std::distance(begin(folder), end(folder)));
}

}  // namespace

Bytes Hex(std::string_view text) {
  std::string digits;
  std::copy_if(text.begin(), text.end(), std::back_inserter(digits),
               [](unsigned char c) { return std::isxdigit(c) != 0; });
  Require(digits.size() % 2 == 0, "odd number of digits");
  Bytes bytes;
  for (std::size_t at = 0; at < digits.size(); at += 2) {
    bytes.push_back(static_cast<std::uint8_t>(std::stoi(digits.substr(at, 2), nullptr, 16)));
  }
  return bytes;
}

Bytes Zeros(std::size_t size) { return Bytes(size, 0); }

Bytes Text(std::string_view text) { return {text.begin(), text.end()}; }

Bytes Slot(std::size_t size, std::string_view text) {
  Bytes bytes = Text(text);
  bytes.resize(size, 0);
  return bytes;
}

Bytes operator+(Bytes left, const Bytes& right) {
  left.insert(left.end(), right.begin(), right.end());
  return left;
}

Bytes Word(std::uint32_t value) {
  return {static_cast<std::uint8_t>(value), static_cast<std::uint8_t>(value >> 8),
          static_cast<std::uint8_t>(value >> 16), static_cast<std::uint8_t>(value >> 24)};
}

std::string ToHex(const Bytes& bytes) {
  constexpr std::string_view kDigits = "0123456789abcdef";
  std::string text;
  for (const std::uint8_t byte : bytes) {
    text += kDigits[byte >> 4];
    text += kDigits[byte & 15];
  }
  return text;
}

Packet Receive(int socket) {
  Packet packet;
  pollfd entry{socket, POLLIN, 0};
  constexpr int kPatienceMilliseconds = 10'000;
  if (::poll(&entry, 1, kPatienceMilliseconds) != 1) return packet;
  packet.bytes.resize(1 << 18);
  std::array<char, 512> control{};
  iovec part{packet.bytes.data(), packet.bytes.size()};
  msghdr header{};
  header.msg_iov = &part;
  header.msg_iovlen = 1;
  header.msg_control = control.data();
  header.msg_controllen = control.size();
  const ssize_t length = ::recvmsg(socket, &header, MSG_DONTWAIT | MSG_CMSG_CLOEXEC);
  packet.bytes.resize(static_cast<std::size_t>(std::max<ssize_t>(length, 0)));
  for (cmsghdr* at = length < 0 ? nullptr : CMSG_FIRSTHDR(&header); at != nullptr;
       at = CMSG_NXTHDR(&header, at)) {
    if (at->cmsg_type == SCM_CREDENTIALS) {
      ucred who{};
      std::memcpy(&who, CMSG_DATA(at), sizeof who);
      packet.senderPid = who.pid;
    } else if (at->cmsg_type == SCM_RIGHTS) {
      for (std::size_t offset = CMSG_LEN(0); offset < at->cmsg_len; offset += sizeof(int)) {
        int number = -1;
        std::memcpy(&number, reinterpret_cast<const char*>(at) + offset, sizeof number);
        packet.descriptors.emplace_back(number);
      }
    }
  }
  return packet;
}

void Send(int socket, const Bytes& bytes, const std::vector<int>& descriptors) {
  std::array<char, 512> control{};
  iovec part{const_cast<std::uint8_t*>(bytes.data()), bytes.size()};
  msghdr header{};
  header.msg_iov = &part;
  header.msg_iovlen = 1;
  if (!descriptors.empty()) {
    const std::size_t size = descriptors.size() * sizeof(int);
    header.msg_control = control.data();
    header.msg_controllen = CMSG_SPACE(size);
    cmsghdr* rights = CMSG_FIRSTHDR(&header);
    rights->cmsg_level = SOL_SOCKET;
    rights->cmsg_type = SCM_RIGHTS;
    rights->cmsg_len = CMSG_LEN(size);
    std::memcpy(CMSG_DATA(rights), descriptors.data(), size);
  }
  const ssize_t sent = ::sendmsg(socket, &header, MSG_DONTWAIT | MSG_NOSIGNAL);
  Require(sent == static_cast<ssize_t>(bytes.size()), "sendmsg");
}

std::pair<FileDescriptor, FileDescriptor> MakePair(int type) {
  std::array<int, 2> ends{};
  Require(::socketpair(AF_UNIX, type | SOCK_CLOEXEC, 0, ends.data()) == 0, "socketpair");
  return {FileDescriptor(ends[0]), FileDescriptor(ends[1])};
}

FileDescriptor MakeMemory(const Bytes& content, int seals) {
  FileDescriptor memory(::memfd_create("reply", MFD_CLOEXEC | MFD_ALLOW_SEALING));
  Require(static_cast<bool>(memory), "memfd_create");
  Require(
      ::write(memory.get(), content.data(), content.size()) == static_cast<ssize_t>(content.size()),
      "write");
  Require(::fcntl(memory.get(), F_ADD_SEALS, seals) == 0, "seal");
  return memory;
}

Bytes PlainReply(std::uint32_t id, std::int32_t code) {
  return Hex("00000000 24000000 00000000 00000000 00000000") + Word(id) + Hex("00000000 01000000") +
         Word(static_cast<std::uint32_t>(code));
}

Bytes DataReply(std::uint32_t id, std::uint32_t address, std::uint32_t size) {
  return Hex("00000080 38000000 00000000 00000000 00000000") + Word(id) + Hex("01000000") +
         Word(address) + Hex("00000000 01010001") + Word(size) + Hex("00000000 01000000") +
         Word(size);
}

Bytes ConnectReply() {
  return Hex(
      "00000080 28000000 00000000 00000000 00000000 d21f4900 01000000"
      "00000000 00000000 00001300");
}

Bytes ConnectRequest() {
  return Hex(
      "12000080 28000000 00000000 00000000 00000000 6e1f4900 01000000"
      "00000000 00000000 00001100");
}

Service::Service() {
  std::array<char, 64> name{"/tmp/halvec-client-test-XXXXXX"};
  Require(::mkdtemp(name.data()) != nullptr, "mkdtemp");
  folder_ = name.data();
  path_ = folder_ + std::string(kFileName);
  bind();
}

Service::~Service() {
  std::error_code ignored;  // a folder that stays behind in /tmp harms no test
  std::filesystem::remove_all(folder_, ignored);
}

void Service::bind() {
  ::unlink(path_.c_str());
  socket_.reset(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  const platform::UnixSocketAddress address(path_);
  Require(::bind(socket_.get(), address.get(), address.size()) == 0, "bind");
}

Connection Accept(int service) {
  Packet packet = Receive(service);
  EXPECT_EQ(ToHex(packet.bytes), ToHex(ConnectRequest()));
  if (packet.descriptors.size() != 2) throw std::runtime_error("a connect without its two rights");
  auto [receiveRight, sendRight] = MakePair(SOCK_SEQPACKET);
  Send(packet.descriptors[0].get(), ConnectReply(), {sendRight.get()});
  return {std::move(packet.descriptors[1]), std::move(receiveRight), std::move(sendRight)};
}

void AnswerConnect(int service, const Bytes& reply, const std::vector<int>& descriptors) {
  const Packet packet = Receive(service);
  EXPECT_EQ(packet.descriptors.size(), 2U);
  if (!packet.descriptors.empty()) Send(packet.descriptors[0].get(), reply, descriptors);
}

DescriptorBalance::DescriptorBalance() : before_(CountDescriptors()) {}

DescriptorBalance::~DescriptorBalance() {
  EXPECT_EQ(CountDescriptors(), before_) << "descriptors leaked or closed twice";
}

}  // namespace fake
