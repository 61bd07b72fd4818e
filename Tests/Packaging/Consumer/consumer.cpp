// SPDX-License-Identifier: Apache-2.0
//
// The same with the C++ headers, one call included so that its templates are compiled.
#include <Client/HelperClient.h>

#include <cstdio>

int main() {
  halvec::ClientOptions options;
  options.servicePath = "/nonexistent/port";
  auto client = halvec::HelperClient::Connect(options);
  if (client) return client->call<requests::ClearVoicemailToken>() ? 1 : 2;
  std::printf("%s\n", client.error().describe().c_str());
  return client.error().status == HVMH_NOT_RUNNING ? 0 : 3;
}
