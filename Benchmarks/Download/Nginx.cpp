// SPDX-License-Identifier: Apache-2.0
#include "Benchmarks/Download/Nginx.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cstdlib>
#include <fstream>

namespace bench {
namespace {

sockaddr_in Local(int port) {
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_port = htons(static_cast<std::uint16_t>(port));
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  return address;
}

int FreePort() {
  const int socket = Check(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0), "socket");
  sockaddr_in address = Local(0);
  socklen_t length = sizeof address;
  Check(::bind(socket, reinterpret_cast<const sockaddr*>(&address), length), "bind");
  Check(::getsockname(socket, reinterpret_cast<sockaddr*>(&address), &length), "getsockname");
  ::close(socket);
  return ntohs(address.sin_port);
}

/// Returns when somebody listens there.
void WaitForListener(int port) {
  for (int attempt = 0; attempt < 500; ++attempt) {
    const int socket = Check(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0), "socket");
    const sockaddr_in address = Local(port);
    const int result =
        ::connect(socket, reinterpret_cast<const sockaddr*>(&address), sizeof address);
    ::close(socket);
    if (result == 0) return;
    (void)::poll(nullptr, 0, 10);
  }
  Fail("start nginx");
}

void WriteConfiguration(const std::filesystem::path& root, int httpPort, int httpsPort) {
  std::ofstream file(root / "nginx.conf");
  file << "daemon off; master_process off; error_log stderr crit; pid nginx.pid;\n"
          "events {}\n"
          "http {\n"
          "  access_log off; sendfile on; types { application/gzip gz; }\n"
          "  client_body_temp_path t1; proxy_temp_path t2; fastcgi_temp_path t3;\n"
          "  uwsgi_temp_path t4; scgi_temp_path t5;\n"
          "  server {\n"
          "    listen 127.0.0.1:"
       << httpPort << "; listen 127.0.0.1:" << httpsPort << " ssl;\n"
       << "    ssl_certificate certificate.pem; ssl_certificate_key key.pem;\n"
       << "    root " << (root / "web").string() << ";\n  }\n}\n";
}

}  // namespace

Nginx::Nginx(const std::filesystem::path& root)
    : root_(root), httpPort_(FreePort()), httpsPort_(FreePort()) {
  const std::string certificate =
      "cd '" + root.string() +
      "' && openssl req -x509 -newkey rsa:2048 -nodes -keyout key.pem -out certificate.pem -days 2 "
      "-subj /CN=localhost -addext subjectAltName=IP:127.0.0.1 2>openssl.log";
  if (std::system(certificate.c_str()) != 0) Fail("make a certificate");
  WriteConfiguration(root, httpPort_, httpsPort_);
  process_ = Child(-1, [&] {
    ::execlp("nginx", "nginx", "-p", root.c_str(), "-c", "nginx.conf", nullptr);
    Fail("run nginx");
  });
  WaitForListener(httpsPort_);
}

std::string Nginx::url(const std::string& scheme, const std::string& file) const {
  const int port = scheme == "https" ? httpsPort_ : httpPort_;
  return scheme + "://127.0.0.1:" + std::to_string(port) + "/" + file;
}

}  // namespace bench
