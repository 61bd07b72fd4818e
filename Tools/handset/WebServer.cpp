// SPDX-License-Identifier: Apache-2.0
//
// The listening socket is made here and handed over in the way in which nginx takes over from an
// older self: so there is no moment to wait for. One thread, no lock.
#include "Tools/handset/WebServer.h"

#include <fcntl.h>
#include <netinet/in.h>
#include <signal.h>
#include <sys/epoll.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cstdio>
#include <utility>

#include "Tools/handset/Certificates.h"
#include "Tools/handset/Failure.h"
#include "Tools/handset/Files.h"
#include "Tools/handset/Process.h"
#include "Tools/handset/SystemLogCapture.h"
#include "Tools/handset/UnixAddress.h"

namespace handset {
namespace {

using platform::FileDescriptor;

constexpr const char* kSettingsFile = "/run/handset/nginx.conf";
constexpr const char* kErrorFile = "/run/handset/web-error.log";
constexpr const char* kLogSocket = "/run/handset/web-log";
constexpr std::uint16_t kHttps = 443;
constexpr int kFirstHandedOver = 3;

std::string Settings() {
  return std::string(
             "daemon off;\n"
             "user root;\n"
             "worker_processes 1;\n"
             "pid /run/handset/nginx.pid;\n"
             "error_log ") +
         kErrorFile +
         ";\n"
         "events {}\n"
         "http {\n"
         "  log_format request escape=json '$remote_addr $host \"$request\" $status '\n"
         "                                 '$body_bytes_sent \"$http_accept_encoding\"';\n"
         "  access_log syslog:server=unix:" +
         kLogSocket +
         ",nohostname request;\n"
         "  client_body_temp_path /run/handset/nginx-body;\n"
         "  proxy_temp_path /run/handset/nginx-proxy;\n"
         "  fastcgi_temp_path /run/handset/nginx-fastcgi;\n"
         "  uwsgi_temp_path /run/handset/nginx-uwsgi;\n"
         "  scgi_temp_path /run/handset/nginx-scgi;\n"
         "  types { application/gzip gz; application/x-plist plist; application/zip zip; }\n"
         "  default_type application/octet-stream;\n"
         "  server {\n"
         "    listen 443 ssl;\n"
         "    ssl_protocols TLSv1.2 TLSv1.3;\n"
         "    root " +
         kWebFolder +
         ";\n"
         "    ssl_certificate " +
         kCertificateFile +
         ";\n"
         "    ssl_certificate_key " +
         kCertificateKeyFile +
         ";\n"
         "  }\n"
         "}\n";
}

FileDescriptor Listen() {
  FileDescriptor socket(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
  const int on = 1;
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_port = htons(kHttps);
  if (!socket || setsockopt(socket.get(), SOL_SOCKET, SO_REUSEADDR, &on, sizeof on) != 0 ||
      bind(socket.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0 ||
      ::listen(socket.get(), SOMAXCONN) != 0) {
    throw Failure::FromErrno("serve the web");
  }
  return socket;
}

/// In the child: the listening socket becomes descriptor 3, and its number the server's to know.
Environment HandOver(int socket, const World& world) {
  const int apart = fcntl(socket, F_DUPFD_CLOEXEC, kFirstHandedOver + 1);
  if (apart < 0 || dup2(apart, kFirstHandedOver) < 0) {
    throw Failure::FromErrno("hand the web server's socket over");
  }
  if (setns(world.descriptor(), CLONE_NEWNET) != 0) throw Failure::FromErrno("enter the world");
  // A session of its own, so that the terminal's interrupt key does not reach it.
  if (setsid() < 0) throw Failure::FromErrno("setsid");
  Environment environment = ServiceEnvironment();
  SetVariable(environment, "NGINX", std::to_string(kFirstHandedOver) + ";");
  return environment;
}

}  // namespace

WebServer::WebServer(EventLoop& loop, const World& world)
    : loop_(loop),
      world_(world),
      logSocket_(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0)) {
  if (!logSocket_) throw Failure::FromErrno("socket");
  BindAt(logSocket_.get(), kLogSocket);
  ReplaceFile(kSettingsFile, Settings(), 0644);
  // The watch lasts as long as the loop, and so does the socket.
  static_cast<void>(loop_.watch(logSocket_.get(), EPOLLIN, [this](std::uint32_t) { drain(); }));
}

void WebServer::start() {
  if (process_) throw Failure("the web server runs already", 1);
  FileDescriptor socket;
  world_.inside([&socket] { socket = Listen(); });
  const int descriptor = socket.get();
  process_ = StartProgram({"nginx", "-e", kErrorFile, "-c", kSettingsFile},
                          [this, descriptor] { return HandOver(descriptor, world_); });
}

void WebServer::stop() {
  if (!process_) throw Failure("the web server does not run", 1);
  kill(*process_, SIGTERM);
  int waitStatus = 0;
  while (waitpid(*process_, &waitStatus, 0) < 0 && errno == EINTR) {
  }
  process_.reset();
}

void WebServer::childEnded(pid_t pid) {
  if (process_ != pid) return;
  process_.reset();
  static_cast<void>(
      std::fprintf(stderr, "handset: the web server ended; see %s inside\n", kErrorFile));
}

void WebServer::drain() {
  std::array<char, 8192> line{};
  bool isNew = false;
  for (;;) {
    const ssize_t count = recv(logSocket_.get(), line.data(), line.size(), 0);
    if (count < 0) break;
    isNew = true;
    log_.push_back(ParseLogDatagram({line.data(), static_cast<std::size_t>(count)}).text + "\n");
  }
  if (isNew && changed_) changed_();
}

}  // namespace handset
