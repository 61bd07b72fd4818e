// SPDX-License-Identifier: Apache-2.0
//
// The C interface except for the requests: options, connections, texts about errors.
#include "Client/CInterface.h"

#include <algorithm>
#include <cstddef>
#include <cstdlib>
#include <optional>
#include <string>

namespace {

using halvec::ClientOptions;
using halvec::Error;

/// Reads the caller's options, which may be shorter or longer than this library's structure.
std::optional<ClientOptions> ReadOptions(const hvmh_options* given) {
  ClientOptions options;
  if (given == nullptr) return options;
  hvmh_options copy{};
  hvmh_options_init(&copy, sizeof copy);
  constexpr std::size_t kFirstVersionSize = sizeof(hvmh_options);
  // A longer structure comes from a newer header: what this library cannot know must not be lost
  // silently, so it is refused.
  if (given->size < kFirstVersionSize || given->size > sizeof copy) return std::nullopt;
  std::memcpy(&copy, given, given->size);
  if ((copy.flags & ~std::uint32_t{HVMH_FLAG_RECONNECT}) != 0) return std::nullopt;
  options.reconnect = (copy.flags & HVMH_FLAG_RECONNECT) != 0;
  options.connectLimit = std::chrono::milliseconds(copy.connect_timeout_ms);
  options.requestLimit = std::chrono::milliseconds(copy.request_timeout_ms);
  if (copy.service_path != nullptr) options.servicePath = copy.service_path;
  return options;
}

}  // namespace

int32_t hvmh_abi_version() { return HVMH_ABI_VERSION; }

const char* hvmh_return_code_name(int32_t code) { return ReturnCodeName(code).data(); }

size_t hvmh_error_describe(const hvmh_error* error, char* text, size_t size) {
  if (error == nullptr) return 0;
  try {
    const std::string clause =
        Error{error->status, error->return_code, error->system_error}.describe();
    if (text != nullptr && size != 0) {
      const std::size_t kept = std::min(size - 1, clause.size());
      std::memcpy(text, clause.data(), kept);
      text[kept] = '\0';
    }
    return clause.size();
  } catch (...) {
    if (text != nullptr && size != 0) *text = '\0';
    return 0;
  }
}

void hvmh_options_init(hvmh_options* options, size_t size) {
  if (options == nullptr) return;
  hvmh_options defaults{};
  defaults.size = static_cast<uint32_t>(size);
  defaults.connect_timeout_ms = 10'000;
  defaults.request_timeout_ms = 60'000;
  // A caller with a newer header has a longer structure, whose rest is 0.
  std::memset(options, 0, size);
  std::memcpy(options, &defaults, std::min(size, sizeof defaults));
}

hvmh_status hvmh_client_open(const hvmh_options* options, hvmh_client** client, hvmh_error* error) {
  return halvec::Guard(error, [&]() -> Error {
    if (client == nullptr) return {HVMH_INVALID_ARGUMENT};
    *client = nullptr;
    const std::optional<ClientOptions> wanted = ReadOptions(options);
    if (!wanted) return {HVMH_INVALID_ARGUMENT};
    halvec::Result<halvec::HelperClient> made = halvec::HelperClient::Connect(*wanted);
    if (!made) return made.error();
    *client = new hvmh_client{std::move(*made)};
    return {};
  });
}

void hvmh_client_close(hvmh_client* client) { delete client; }

hvmh_status hvmh_client_reconnect(hvmh_client* client, hvmh_error* error) {
  return halvec::Guard(error, [&]() -> Error {
    if (client == nullptr) return {HVMH_INVALID_ARGUMENT};
    return client->client.reconnect();
  });
}

bool hvmh_client_is_connected(const hvmh_client* client) {
  return client != nullptr && client->client.isConnected();
}

int hvmh_client_descriptor(const hvmh_client* client) {
  return client == nullptr ? -1 : client->client.descriptor();
}

void hvmh_free(void* memory) { std::free(memory); }
