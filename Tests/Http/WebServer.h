// SPDX-License-Identifier: Apache-2.0
//
// The web servers of web_server.py, running while the object lives. One thread.
#pragma once

#include <map>
#include <string>

#include "Tests/Http/Script.h"

namespace support {

class WebServer {
 public:
  WebServer();

  /// The URL of `path` ("hello") on the server called `name` ("http", "https" ...).
  [[nodiscard]] std::string url(const std::string& name, const std::string& path,
                                const std::string& host = "127.0.0.1") const;
  /// The file of the authority that vouches for the good certificates.
  [[nodiscard]] static std::string authority();

 private:
  Script script_;
  std::map<std::string, std::string> ports_;
};

}  // namespace support
