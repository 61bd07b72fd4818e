// SPDX-License-Identifier: Apache-2.0
//
// Elliptic-curve keys, because they are made in no time. One thread, no lock.
#include "Tools/handset/Certificates.h"

#include <unistd.h>

#include "Tools/handset/Failure.h"
#include "Tools/handset/Files.h"
#include "Tools/handset/Mounts.h"
#include "Tools/handset/Process.h"

namespace handset {
namespace {

constexpr const char* kTrustFolder = "/etc/ssl/certs";
constexpr const char* kTrustFile = "/etc/ssl/certs/ca-certificates.crt";
constexpr const char* kAuthorityKeyFile = "/run/handset/authority-key.pem";
constexpr const char* kSettingsFile = "/run/handset/openssl.cnf";

std::string Settings(const std::vector<std::string>& hosts) {
  std::string names;
  for (const std::string& host : hosts) names += (names.empty() ? "DNS:" : ",DNS:") + host;
  return "[req]\ndistinguished_name = name\nprompt = no\n"
         "[name]\nCN = Handset\n"
         "[authority]\nbasicConstraints = critical,CA:TRUE\nkeyUsage = critical,keyCertSign\n"
         "subjectKeyIdentifier = hash\n"
         "[server]\nbasicConstraints = critical,CA:FALSE\nextendedKeyUsage = serverAuth\n"
         "subjectAltName = " +
         names + "\n";
}

/// openssl(1) `req` for a new key and a certificate with the extensions of one section.
std::vector<std::string> Request(const char* section, const char* subject, const char* keyFile,
                                 const char* certificateFile) {
  return {"openssl",     "req",          "-x509",
          "-config",     kSettingsFile,  "-newkey",
          "ec",          "-pkeyopt",     "ec_paramgen_curve:P-256",
          "-nodes",      "-days",        "30",
          "-extensions", section,        "-subj",
          subject,       "-keyout",      keyFile,
          "-out",        certificateFile};
}

}  // namespace

void MakeCertificates(const std::vector<std::string>& hosts) {
  ReplaceFile(kSettingsFile, Settings(hosts), 0644);
  MountMemory(kTrustFolder, "755");
  RunTool(Request("authority", "/CN=Handset authority", kAuthorityKeyFile, kTrustFile));
  // Some programs look authorities up by the hashes of their names.
  RunTool({"openssl", "rehash", kTrustFolder});
  std::vector<std::string> server =
      Request("server", "/CN=Handset web server", kCertificateKeyFile, kCertificateFile);
  server.insert(server.end(), {"-CA", kTrustFile, "-CAkey", kAuthorityKeyFile});
  RunTool(server);
  unlink(kAuthorityKeyFile);
}

}  // namespace handset
