// SPDX-License-Identifier: Apache-2.0
//
// Reading /dev/log. One thread, no lock.
#include "Tools/handset/SystemLogCapture.h"

#include <sys/epoll.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>

#include <algorithm>
#include <cctype>
#include <charconv>
#include <cstdio>
#include <cstring>
#include <utility>

#include "Tools/handset/Failure.h"
#include "Tools/handset/Files.h"
#include "Tools/handset/Json.h"
#include "Tools/handset/UnixAddress.h"

namespace handset {
namespace {

constexpr const char* kLogSocket = "/dev/log";
constexpr int kUserFacility = 1;
constexpr int kNotice = 5;

/// Takes "<PRI>" off the front of `text`.
void TakePriority(std::string_view& text, LogEntry& entry) {
  entry.facility = kUserFacility;
  entry.priority = kNotice;
  const std::size_t end = text.find('>');
  constexpr std::size_t kLongest = 4;  // "<191"
  if (!text.starts_with('<') || end == std::string_view::npos || end < 2 || end > kLongest) return;
  unsigned value = 0;
  const auto [stop, error] = std::from_chars(text.data() + 1, text.data() + end, value);
  constexpr unsigned kHighest = 191;
  if (error != std::errc{} || stop != text.data() + end || value > kHighest) return;
  entry.facility = static_cast<int>(value / 8);
  entry.priority = static_cast<int>(value % 8);
  text.remove_prefix(end + 1);
}

/// Takes "Mmm dd hh:mm:ss " off the front of `text`.
void TakeTimestamp(std::string_view& text) {
  constexpr std::string_view kShape = "Aaa 00 00:00:00 ";
  if (text.size() < kShape.size()) return;
  for (std::size_t i = 0; i < kShape.size(); ++i) {
    const auto c = static_cast<unsigned char>(text[i]);
    const bool dayBlank = i == 4 && c == ' ';
    const bool fits = kShape[i] == 'A'   ? std::isupper(c) != 0
                      : kShape[i] == 'a' ? std::islower(c) != 0
                      : kShape[i] == '0' ? std::isdigit(c) != 0 || dayBlank
                                         : c == static_cast<unsigned char>(kShape[i]);
    if (!fits) return;
  }
  text.remove_prefix(kShape.size());
}

/// Takes "NAME: " or "NAME[PID]: " off the front of `text`.
void TakeTag(std::string_view& text, LogEntry& entry) {
  const std::size_t end = text.find(": ");
  if (end == std::string_view::npos || end == 0) return;
  std::string_view tag = text.substr(0, end);
  if (tag.find_first_of(" \n\t:") != std::string_view::npos) return;
  const std::size_t bracket = tag.find('[');
  if (bracket != std::string_view::npos) {
    const std::string_view digits = tag.substr(bracket + 1, tag.size() - bracket - 2);
    if (bracket == 0 || !tag.ends_with(']') || digits.empty() ||
        digits.find_first_not_of("0123456789") != std::string_view::npos) {
      return;
    }
    tag = tag.substr(0, bracket);
  }
  entry.identifier = tag;
  text.remove_prefix(end + 2);
}

}  // namespace

LogEntry ParseLogDatagram(std::string_view datagram) {
  LogEntry entry;
  entry.raw = datagram;
  TakePriority(datagram, entry);
  TakeTimestamp(datagram);
  TakeTag(datagram, entry);
  entry.text = datagram;
  return entry;
}

std::string LogEntryJson(const LogEntry& entry) {
  std::string json =
      "{\"facility\":" + std::to_string(entry.facility) +
      ",\"priority\":" + std::to_string(entry.priority) +
      ",\"identifier\":" + JsonString(entry.identifier) + ",\"text\":" + JsonString(entry.text) +
      ",\"pid\":" + std::to_string(entry.sender) + ",\"uid\":" + std::to_string(entry.senderUser) +
      ",\"raw\":" + JsonString(entry.raw);
  if (!IsUtf8(entry.raw)) {
    json += ",\"text_hex\":\"" + HexOf(entry.text) + "\",\"raw_hex\":\"" + HexOf(entry.raw) + '"';
  }
  if (entry.isCutOff) json += ",\"cut_off\":true";
  return json + "}\n";
}

std::string LogEntryLine(const LogEntry& entry) {
  std::string line = "<" + std::to_string(entry.priority) + ">" + entry.text;
  while (line.ends_with('\n')) line.pop_back();
  return line + '\n';
}

void SystemLogCapture::open() {
  socket_.reset(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  if (!socket_) throw Failure::FromErrno("socket");
  const int on = 1;
  if (setsockopt(socket_.get(), SOL_SOCKET, SO_PASSCRED, &on, sizeof on) != 0) {
    throw Failure::FromErrno("SO_PASSCRED");
  }
  BindAt(socket_.get(), kLogSocket);
  if (chmod(kLogSocket, 0666) != 0) throw Failure::FromErrno("chmod /dev/log");
  // The watch lasts as long as the loop, and so does the socket.
  static_cast<void>(loop_.watch(socket_.get(), EPOLLIN, [this](std::uint32_t) { drain(); }));
}

void SystemLogCapture::drain() {
  // A writer that never stops must not keep the launcher from its work.
  constexpr int kMostAtOnce = 8192;
  int count = 0;
  while (count < kMostAtOnce && receiveOne()) ++count;
  if (count > 0 && changed_) changed_();
}

bool SystemLogCapture::receiveOne() {
  iovec vector{buffer_.data(), buffer_.size()};
  alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof(ucred))> control{};
  msghdr message{};
  message.msg_iov = &vector;
  message.msg_iovlen = 1;
  message.msg_control = control.data();
  message.msg_controllen = control.size();
  const ssize_t count = recvmsg(socket_.get(), &message, MSG_DONTWAIT | MSG_CMSG_CLOEXEC);
  if (count < 0) return false;
  LogEntry entry = ParseLogDatagram({buffer_.data(), static_cast<std::size_t>(count)});
  entry.isCutOff = (message.msg_flags & MSG_TRUNC) != 0;
  const cmsghdr* header = CMSG_FIRSTHDR(&message);
  if (header != nullptr && header->cmsg_type == SCM_CREDENTIALS &&
      header->cmsg_len == CMSG_LEN(sizeof(ucred))) {
    ucred credentials{};
    std::memcpy(&credentials, CMSG_DATA(header), sizeof credentials);
    entry.sender = credentials.pid;
    entry.senderUser = credentials.uid;
  }
  keep(std::move(entry));
  return true;
}

void SystemLogCapture::keep(LogEntry entry) {
  if (file_ >= 0 && !WriteAll(file_, LogEntryJson(entry))) {
    static_cast<void>(std::fprintf(stderr, "handset: the log file takes no more\n"));
    file_ = -1;
  }
  if (verbose_) static_cast<void>(std::fputs(("log " + LogEntryLine(entry)).c_str(), stderr));
  entries_.push_back(std::move(entry));
}

}  // namespace handset
