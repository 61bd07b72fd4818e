// SPDX-License-Identifier: Apache-2.0
#include "Tests/Http/WebServer.h"

#include <gtest/gtest.h>

namespace support {

WebServer::WebServer() : script_({TEST_SCRIPTS "/web_server.py", CERTIFICATES}) {
  for (const std::string& line : script_.lines()) {
    const std::size_t blank = line.find(' ');
    ports_[line.substr(0, blank)] = line.substr(blank + 1);
  }
  EXPECT_FALSE(ports_.empty()) << "the web server did not start";
}

std::string WebServer::url(const std::string& name, const std::string& path,
                           const std::string& host) const {
  const auto port = ports_.find(name);
  EXPECT_NE(port, ports_.end()) << name;
  const std::string scheme = name == "http" ? "http" : "https";
  return scheme + "://" + host + ":" + (port == ports_.end() ? "0" : port->second) + "/" + path;
}

std::string WebServer::authority() { return CERTIFICATES "/authority.pem"; }

}  // namespace support
