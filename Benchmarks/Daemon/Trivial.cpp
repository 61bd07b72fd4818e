// SPDX-License-Identifier: Apache-2.0
//
// The least that a C++ service started on demand can be: it answers the one message that waits on
// the socket handed over to it, on the reply socket that came with the message, and leaves.
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cstring>
#include <string>
#include <vector>

int main() {
  constexpr int kHandedOver = 3;
  std::vector<char> message(4096);
  alignas(cmsghdr) std::array<char, CMSG_SPACE(4 * sizeof(int)) + CMSG_SPACE(sizeof(ucred))>
      control{};
  iovec part{.iov_base = message.data(), .iov_len = message.size()};
  msghdr header{};
  header.msg_iov = &part;
  header.msg_iovlen = 1;
  header.msg_control = control.data();
  header.msg_controllen = control.size();
  if (::recvmsg(kHandedOver, &header, 0) <= 0) return 1;
  for (cmsghdr* entry = CMSG_FIRSTHDR(&header); entry; entry = CMSG_NXTHDR(&header, entry)) {
    if (entry->cmsg_type != SCM_RIGHTS) continue;
    int reply = -1;
    std::memcpy(&reply, CMSG_DATA(entry), sizeof reply);
    const std::string answer(40, '\0');
    if (::send(reply, answer.data(), answer.size(), MSG_NOSIGNAL) < 0) return 1;
  }
  return 0;
}
