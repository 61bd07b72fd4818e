// SPDX-License-Identifier: Apache-2.0
//
// Process tests of the updater: the real helper, a real web server. One thread.
#pragma once

#include <string>
#include <vector>

#include "Tests/Process/ProcessSuite.h"

namespace lasd_test {

/// The script's own web server on the loopback interface, https, certified for the manifest's host
/// by an authority that this handset alone trusts. Serves /tmp/web, and
/// what is in its folder `slow` at 10 KB a second.
inline const std::string kServe =
    "mkdir -p /tmp/web/1/v3 /tmp/web/slow /tmp/nginx /var/mobile/Library\n"
    "openssl req -x509 -newkey ec -pkeyopt ec_paramgen_curve:prime256v1 -nodes -days 2 "
    "-keyout /tmp/nginx/key.pem -out /tmp/nginx/cert.pem -subj /CN=test "
    "-addext subjectAltName=DNS:" MANIFEST_HOST
    " 2>/dev/null\n"
    "cat /tmp/nginx/cert.pem >/etc/ssl/certs/ca-certificates.crt\n"
    "echo 127.0.0.1 " MANIFEST_HOST
    " >>/etc/hosts\n"
    "cat >/tmp/nginx/nginx.conf <<'END'\n"
    "user root; pid /tmp/nginx/pid; error_log /tmp/nginx/error.log; events {}\n"
    "http { access_log /tmp/nginx/access.log; types { application/gzip gz; }\n"
    "  server { listen 127.0.0.1:443 ssl; root /tmp/web; location /slow { limit_rate 10k; }\n"
    "    ssl_certificate cert.pem; ssl_certificate_key key.pem; } }\n"
    "END\n"
    "nginx -p /tmp/nginx -c /tmp/nginx/nginx.conf\n";

}  // namespace lasd_test
