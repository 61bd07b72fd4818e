// SPDX-License-Identifier: Apache-2.0
//
// The telephony framework, as far as the helper uses it: a connection to the telephony daemon and
// the one call over it. Main thread; the call waits for the daemon, for one second at most.
#pragma once

#include <array>
#include <cstdint>
#include <memory>
#include <optional>

#include "Helper/Platform/SharedService.h"
#include "Helper/Platform/String.h"

namespace platform {

/// What a call over a connection came to. Success is an error code of 0, whatever the domain.
struct TelephonyResult {
  std::int32_t domain = 0;
  std::int32_t errorCode = 0;
  friend bool operator==(const TelephonyResult&, const TelephonyResult&) = default;
};

/// The domain of what the framework itself finds wrong; its error codes are HandsetErrors.
inline constexpr std::int32_t kTelephonySystemDomain = 1;

/// Country, state, city, postal code; null where there is no such text.
using CivicInfoTexts = std::array<std::optional<String>, 4>;

/// A connection to the telephony daemon; closed when it is destroyed.
class TelephonyConnection {
 public:
  virtual ~TelephonyConnection() = default;

  /// Hands the civic info of the handset's location to the daemon and waits for its answer: that
  /// answer; or in kTelephonySystemDomain
  /// kInvalidArgument: what came is no answer.
  /// kWouldBlock: the call could not be sent without waiting.
  /// kMessageTooLong: the texts do not fit into one message; nothing was sent.
  /// kNotConnected: the daemon has closed the connection.
  /// kTimedOut: no answer in time.
  [[nodiscard]] virtual TelephonyResult setCivicInfo(const CivicInfoTexts& texts) = 0;
};

/// Runs for each notification of the daemon that arrives while a call waits for its answer.
using TelephonyNotificationCallback = void (*)(TelephonyConnection* connection, void* context);

class TelephonyFramework {
 public:
  virtual ~TelephonyFramework() = default;

  /// Has every later connection name `identifier` to the daemon. Once is enough: an identifier
  /// that is there already is not added again.
  virtual void addIdentifierException(const String& identifier) = 0;

  /// Opens a connection. Never waits. Null when the daemon has not published its port or does not
  /// take the request, or this process has no descriptors left.
  [[nodiscard]] virtual std::unique_ptr<TelephonyConnection> createConnection(
      TelephonyNotificationCallback callback, void* context) = 0;
};

template <>
TelephonyFramework& DefaultProvider<TelephonyFramework>();

}  // namespace platform

/// The framework's calls by the names that its clients know. They use the shared instance.
void _VLServerConnectionAddIdentifierException(const platform::String& identifier);

/// As TelephonyFramework::createConnection(). The connection comes from the C++ heap, wherever
/// `allocator` would take memory from.
[[nodiscard]] std::unique_ptr<platform::TelephonyConnection> _VLServerConnectionCreate(
    platform::Allocator& allocator, platform::TelephonyNotificationCallback callback,
    void* context);

/// As TelephonyConnection::setCivicInfo().
[[nodiscard]] platform::TelephonyResult _VLServerConnectionSetCivicInfoBasedOnCurrentLocation(
    platform::TelephonyConnection& connection, const std::optional<platform::String>& country,
    const std::optional<platform::String>& state, const std::optional<platform::String>& city,
    const std::optional<platform::String>& postalCode);
