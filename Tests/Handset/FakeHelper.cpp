// SPDX-License-Identifier: Apache-2.0
//
// A helper for the tests of the handset: checks its hand-over, serves exactly one datagram of text
// and ends. It reads nothing ahead, so every further message needs an instance of its own. One
// thread, no lock.
#include <dirent.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <syslog.h>
#include <unistd.h>

#include <array>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <string>
#include <string_view>
#include <system_error>

namespace {

constexpr int kPort = 3;
constexpr const char* kName = "com.zarvo.halvec.mobile-helper";

int Complain(const char* what, int status) {
  static_cast<void>(std::fprintf(stderr, "fake helper: %s\n", what));
  return status;
}

bool IsVariable(const char* name, const std::string& value) {
  // Nobody changes the environment of this program.
  const char* found = std::getenv(name);  // NOLINT(concurrency-mt-unsafe)
  return found != nullptr && value == found;
}

/// 0, or the exit status that says which part of the hand-over is wrong.
int CheckHandOver() {
  constexpr int kFirstComplaint = 64;
  if (!IsVariable("LISTEN_PID", std::to_string(getpid()))) {
    return Complain("LISTEN_PID", kFirstComplaint);
  }
  if (!IsVariable("LISTEN_FDS", "1")) return Complain("LISTEN_FDS", kFirstComplaint + 1);
  if (!IsVariable("LISTEN_FDNAMES", kName)) return Complain("LISTEN_FDNAMES", kFirstComplaint + 2);
  sockaddr_un address{};
  socklen_t length = sizeof address;
  if (getsockname(kPort, reinterpret_cast<sockaddr*>(&address), &length) != 0 ||
      std::string(HALVEC_PORTS_DIRECTORY) + "/" + kName !=
          static_cast<const char*>(address.sun_path)) {
    return Complain("the socket's name", kFirstComplaint + 3);
  }
  int type = 0;
  length = sizeof type;
  if (getsockopt(kPort, SOL_SOCKET, SO_TYPE, &type, &length) != 0 || type != SOCK_DGRAM) {
    return Complain("the socket's type", kFirstComplaint + 4);
  }
  return 0;
}

std::string OpenDescriptors() {
  DIR* folder = opendir("/proc/self/fd");
  if (folder == nullptr) return "none to be seen";
  std::string numbers;
  // NOLINTNEXTLINE(concurrency-mt-unsafe)
  while (const dirent* entry = readdir(folder)) {
    const std::string name = static_cast<const char*>(entry->d_name);
    if (name != "." && name != ".." && name != std::to_string(dirfd(folder))) numbers += name + " ";
  }
  closedir(folder);
  return numbers;
}

std::string EnvironmentNames() {
  std::string names;
  for (char** entry = environ; *entry != nullptr; ++entry) {
    const std::string_view text(*entry);
    const std::string_view name = text.substr(0, text.find('='));
    if (!name.ends_with("SAN_OPTIONS")) names.append(name).append(" ");
  }
  return names;
}

void WriteLog() {
  openlog("FakeHelper", LOG_PID, LOG_DAEMON);
  syslog(LOG_ERR, "%s", "unable to start\n");
  syslog(LOG_NOTICE, "%s", "trailing blank and newline \n");
  syslog(LOG_NOTICE, "%s", "two: colons: no newline");
}

/// True for the first `count` instances that ask: they are to leave their message where it is.
bool IsTooEarly(int count) {
  constexpr const char* kMarks = "/run/fake-helper-instances";
  std::error_code error;
  std::uintmax_t before = std::filesystem::file_size(kMarks, error);
  if (error) before = 0;
  if (before >= static_cast<std::uintmax_t>(count)) {
    std::filesystem::remove(kMarks, error);
    return false;
  }
  std::ofstream(kMarks, std::ios::app) << '.';
  return true;
}

struct Request {
  std::string text;
  sockaddr_un sender{};
  socklen_t senderLength = sizeof sender;
  std::string credentials = "none";
};

bool Receive(Request& request, int flags) {
  std::array<char, 4096> text{};
  alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof(ucred))> control{};
  iovec vector{text.data(), text.size()};
  msghdr message{};
  message.msg_name = &request.sender;
  message.msg_namelen = sizeof request.sender;
  message.msg_iov = &vector;
  message.msg_iovlen = 1;
  message.msg_control = control.data();
  message.msg_controllen = control.size();
  const ssize_t count = recvmsg(kPort, &message, flags);
  if (count < 0) return false;
  request.senderLength = message.msg_namelen;
  request.text.assign(text.data(), static_cast<std::size_t>(count));
  const cmsghdr* header = CMSG_FIRSTHDR(&message);
  if (header != nullptr && header->cmsg_type == SCM_CREDENTIALS) {
    ucred who{};
    std::memcpy(&who, CMSG_DATA(header), sizeof who);
    request.credentials =
        std::to_string(who.pid) + " " + std::to_string(who.uid) + " " + std::to_string(who.gid);
  }
  return true;
}

}  // namespace

int main() {
  const int wrong = CheckHandOver();
  if (wrong != 0) return wrong;
  Request request;
  if (!Receive(request, MSG_PEEK)) return Complain("nothing to look at", 72);
  if (request.text.starts_with("late ") && IsTooEarly(std::atoi(request.text.c_str() + 5))) {
    return 1;
  }
  if (!Receive(request, 0)) return Complain("nothing to read", 70);
  const std::string_view text = request.text;
  std::string reply;
  if (text == "who") {
    reply = request.credentials;
  } else if (text == "descriptors") {
    reply = OpenDescriptors();
  } else if (text == "environment") {
    reply = EnvironmentNames();
  } else if (text == "log") {
    WriteLog();
    reply = "logged";
  } else if (text == "block") {
    syslog(LOG_NOTICE, "%s", "blocking");
    pause();
  } else if (text == "abort") {
    raise(SIGABRT);
  } else if (text.starts_with("late ")) {
    return 0;
  } else if (text.starts_with("exit ")) {
    return std::atoi(request.text.c_str() + 5);
  } else {
    reply = request.text + " by " + std::to_string(getpid());
  }
  if (sendto(kPort, reply.data(), reply.size(), MSG_NOSIGNAL,
             reinterpret_cast<const sockaddr*>(&request.sender), request.senderLength) < 0) {
    return Complain("the answer was not taken", 71);
  }
  return 0;
}
