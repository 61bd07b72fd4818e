// SPDX-License-Identifier: Apache-2.0
//
// The kernel answers each request while it is sent, so that the one receive never waits long. One
// thread, no lock.
#include "Tools/handset/Netlink.h"

#include <linux/if.h>
#include <linux/netlink.h>
#include <linux/rtnetlink.h>
#include <sys/ioctl.h>
#include <sys/socket.h>

#include <algorithm>
#include <chrono>
#include <cstring>
#include <thread>

#include "Tools/handset/Failure.h"

namespace handset {
namespace {

constexpr std::size_t kLongestAnswer = 16384;

template <typename Fixed>
Fixed At(const std::string& answer, std::size_t offset, const std::string& doing) {
  Fixed fixed{};
  if (answer.size() < offset + sizeof fixed) throw Failure(doing + ": the answer is too short");
  std::memcpy(&fixed, answer.data() + offset, sizeof fixed);
  return fixed;
}

}  // namespace

NetlinkRequest::NetlinkRequest(std::uint16_t type, unsigned flags) {
  nlmsghdr header{};
  header.nlmsg_type = type;
  header.nlmsg_flags = static_cast<std::uint16_t>(flags | NLM_F_REQUEST);
  append(header);
}

void NetlinkRequest::appendBytes(std::string_view bytes) {
  bytes_ += bytes;
  bytes_.resize(NLMSG_ALIGN(bytes_.size()));
}

void NetlinkRequest::attribute(unsigned type, std::string_view bytes) {
  const std::size_t start = open(type);
  bytes_ += bytes;
  close(start);
}

void NetlinkRequest::attributeText(unsigned type, const std::string& text) {
  attribute(type, {text.c_str(), text.size() + 1});
}

std::size_t NetlinkRequest::open(unsigned type) {
  const std::size_t start = bytes_.size();
  rtattr header{};
  header.rta_type = static_cast<std::uint16_t>(type);
  append(header);
  return start;
}

void NetlinkRequest::close(std::size_t attribute) {
  const auto length = static_cast<std::uint16_t>(bytes_.size() - attribute);
  std::memcpy(bytes_.data() + attribute + offsetof(rtattr, rta_len), &length, sizeof length);
  bytes_.resize(NLMSG_ALIGN(bytes_.size()));
}

const std::string& NetlinkRequest::bytes() {
  const auto length = static_cast<std::uint32_t>(bytes_.size());
  std::memcpy(bytes_.data() + offsetof(nlmsghdr, nlmsg_len), &length, sizeof length);
  return bytes_;
}

RouteSocket::RouteSocket() : socket_(socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_ROUTE)) {
  if (!socket_) throw Failure::FromErrno("netlink");
}

std::string RouteSocket::exchange(NetlinkRequest& request, const std::string& doing) const {
  const std::string& bytes = request.bytes();
  if (send(socket_.get(), bytes.data(), bytes.size(), 0) < 0) throw Failure::FromErrno(doing);
  std::string answer(kLongestAnswer, '\0');
  const ssize_t count = recv(socket_.get(), answer.data(), answer.size(), 0);
  if (count < 0) throw Failure::FromErrno(doing);
  answer.resize(static_cast<std::size_t>(count));
  const auto header = At<nlmsghdr>(answer, 0, doing);
  if (header.nlmsg_type != NLMSG_ERROR) return answer;
  const auto verdict = At<nlmsgerr>(answer, NLMSG_HDRLEN, doing);
  if (verdict.error != 0) throw Failure::FromErrno(doing, -verdict.error);
  return answer;
}

void RouteSocket::call(NetlinkRequest& request, const std::string& doing) const {
  static_cast<void>(exchange(request, doing));  // a verdict that is not good throws
}

unsigned RouteSocket::operationalState(unsigned index) const {
  const std::string doing = "ask for an interface's state";
  NetlinkRequest request(RTM_GETLINK, 0);
  ifinfomsg fixed{};
  fixed.ifi_index = static_cast<int>(index);
  request.append(fixed);
  const std::string answer = exchange(request, doing);
  for (std::size_t at = NLMSG_HDRLEN + NLMSG_ALIGN(sizeof fixed); at < answer.size();) {
    const auto attribute = At<rtattr>(answer, at, doing);
    if (attribute.rta_type == IFLA_OPERSTATE) {
      return static_cast<unsigned char>(answer.at(at + RTA_LENGTH(0)));
    }
    at += std::max<std::size_t>(RTA_ALIGN(attribute.rta_len), sizeof attribute);
  }
  throw Failure(doing + ": the answer has none");
}

void RouteSocket::waitUntilReady(unsigned index) const {
  // From Linux 6.8 on the first question itself completes the connection.
  constexpr int kMostTries = 5000;
  for (int i = 0; operationalState(index) != IF_OPER_UP; ++i) {
    if (i == kMostTries) throw Failure("an interface does not come up");
    std::this_thread::sleep_for(std::chrono::milliseconds(1));
  }
}

unsigned RouteSocket::indexOf(const std::string& name) const {
  ifreq request{};
  if (name.size() >= sizeof request.ifr_name) return 0;
  std::memcpy(static_cast<char*>(request.ifr_name), name.data(), name.size());
  if (ioctl(socket_.get(), SIOCGIFINDEX, &request) != 0) return 0;
  return static_cast<unsigned>(request.ifr_ifindex);
}

}  // namespace handset
