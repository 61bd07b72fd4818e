// SPDX-License-Identifier: Apache-2.0
//
// The same in C++: arguments and result follow from the request's row.
#include <cstdio>
#include <span>
#include <string_view>

#include "Client/HelperClient.h"

int main(int count, char** arguments) {
  halvec::ClientOptions options;
  options.reconnect = true;
  options.requestLimit = std::chrono::seconds(5);
  if (count > 1) options.servicePath = arguments[1];

  auto client = halvec::HelperClient::Connect(options);
  if (!client) {
    std::fprintf(stderr, "connect: %s\n", client.error().describe().c_str());
    return 1;
  }

  constexpr std::string_view kValue = "<plist><string>on</string></plist>";
  const auto set = client->call<requests::SetPreferenceValue>("com.example.carrier", "Roaming",
                                                              std::as_bytes(std::span(kValue)));
  if (!set) {
    std::fprintf(stderr, "set: %s\n", set.error().describe().c_str());
    return 1;
  }

  const auto stored = client->call<requests::CopyPreferenceValue>("com.example.carrier", "Roaming");
  if (!stored) {
    std::fprintf(stderr, "copy: %s\n", stored.error().describe().c_str());
    return 1;
  }
  std::printf("%zu bytes\n", (*stored).size());
  return 0;
}
