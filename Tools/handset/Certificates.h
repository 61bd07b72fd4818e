// SPDX-License-Identifier: Apache-2.0
//
// A certificate authority of the handset's own, made for one run by openssl(1), and the web
// server's certificate. One thread, no lock.
#pragma once

#include <string>
#include <vector>

namespace handset {

/// What a server in the world needs to be believed inside: certificate and key, PEM.
inline constexpr const char* kCertificateFile = "/run/handset/web-certificate.pem";
inline constexpr const char* kCertificateKeyFile = "/run/handset/web-key.pem";

/// Makes both files, valid for `hosts`, and makes the authority the only one that the handset
/// trusts: /etc/ssl/certs holds nothing but its certificate, as ca-certificates.crt, and a link to
/// it. Its key is gone afterwards. Throws Failure.
void MakeCertificates(const std::vector<std::string>& hosts);

}  // namespace handset
