// SPDX-License-Identifier: Apache-2.0
//
// Which entitlements the process behind an audit token holds. Any thread may ask.
#pragma once

#include <memory>
#include <optional>
#include <string_view>

#include "Helper/Platform/PropertyList.h"
#include "Helper/Platform/SharedService.h"
#include "Helper/Shared/Interface/Message.h"

namespace platform {

/// The answer to one question: a value of any type, or none; and whether the question could not be
/// answered reliably. A value that comes with an error is worth nothing.
struct EntitlementAnswer {
  std::optional<PropertyList> value;
  bool error = false;
};

/// One process, as an audit token names it.
class SecurityTask {
 public:
  virtual ~SecurityTask() = default;
  [[nodiscard]] virtual EntitlementAnswer copyValueForEntitlement(std::string_view name) = 0;
};

class CallerSecurity {
 public:
  virtual ~CallerSecurity() = default;
  /// Null when the process is not there any more or cannot be examined.
  [[nodiscard]] virtual std::unique_ptr<SecurityTask> createTask(const wire::AuditToken& token) = 0;
};

template <>
CallerSecurity& DefaultProvider<CallerSecurity>();

/// The process id in an audit token.
[[nodiscard]] constexpr std::int32_t AuditTokenProcess(const wire::AuditToken& token) {
  return static_cast<std::int32_t>(token.words[5]);
}
/// The process version in an audit token: tells processes apart that had the same id in turn.
[[nodiscard]] constexpr std::uint32_t AuditTokenProcessVersion(const wire::AuditToken& token) {
  return token.words[7];
}

}  // namespace platform
