// SPDX-License-Identifier: Apache-2.0
//
// Interface flags by ioctl (netdevice(7)). One thread, no lock.
#include "Tools/handset/Network.h"

#include <fcntl.h>
#include <net/if.h>
#include <sys/ioctl.h>
#include <sys/socket.h>

#include <cstring>
#include <string>

#include "Helper/Platform/FileDescriptor.h"
#include "Tools/handset/Failure.h"
#include "Tools/handset/Files.h"
#include "Tools/handset/Options.h"

namespace handset {
namespace {

constexpr const char* kDatagramQueue = "/proc/sys/net/unix/max_dgram_qlen";

}  // namespace

void Network::bringUpLoopback() {
  const platform::FileDescriptor socket(::socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  if (!socket) throw Failure::FromErrno("socket");
  ifreq request{};
  std::memcpy(static_cast<char*>(request.ifr_name), "lo", sizeof "lo");
  if (ioctl(socket.get(), SIOCGIFFLAGS, &request) != 0) throw Failure::FromErrno("flags of lo");
  request.ifr_flags = static_cast<short>(request.ifr_flags | IFF_UP);
  if (ioctl(socket.get(), SIOCSIFFLAGS, &request) != 0) throw Failure::FromErrno("take lo up");
}

unsigned Network::datagramQueue() {
  std::string text = ReadWholeFile(kDatagramQueue);
  while (text.ends_with('\n')) text.pop_back();
  return WholeNumber(text);
}

void Network::setDatagramQueue(unsigned length) {
  const platform::FileDescriptor file(open(kDatagramQueue, O_WRONLY | O_CLOEXEC));
  if (!file || !WriteAll(file.get(), std::to_string(length))) {
    throw Failure::FromErrno(std::string("write ") + kDatagramQueue);
  }
}

}  // namespace handset
