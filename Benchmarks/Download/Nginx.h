// SPDX-License-Identifier: Apache-2.0
//
// nginx on the loopback interface, serving one folder over http and https while the object lives.
// One thread.
#pragma once

#include <filesystem>
#include <string>

#include "Benchmarks/Support/Measure.h"

namespace bench {

class Nginx {
 public:
  /// Serves `root`/web; makes its certificate and its configuration below `root`. Fails where nginx
  /// or openssl is not installed.
  explicit Nginx(const std::filesystem::path& root);

  /// The URL of the file of that name.
  [[nodiscard]] std::string url(const std::string& scheme, const std::string& file) const;
  /// The authority that vouches for the certificate.
  [[nodiscard]] std::string authority() const { return root_ / "certificate.pem"; }

 private:
  const std::filesystem::path root_;
  const int httpPort_;
  const int httpsPort_;
  Child process_;
};

}  // namespace bench
