// SPDX-License-Identifier: Apache-2.0
//
// The voicemail tokens of the handset: one current token, tokens by key, and the voicemail records
// that go with them. Texts are UTF-8 without NUL. Any thread may call; the provider has its own
// lock. Nothing is reported to the caller: the store logs what it could not do, and then the
// operation had no effect, and a copy answers none.
#pragma once

#include <optional>
#include <string>

#include "Helper/Platform/SharedService.h"

namespace platform {

class VoicemailTokenStore {
 public:
  virtual ~VoicemailTokenStore() = default;

  /// Sets the current token, or, without `token`, sets it to nothing. On return it is durable.
  virtual void setCurrentToken(const std::optional<std::string>& token) = 0;
  /// Sets the token for `key`. On return it is durable.
  virtual void setToken(const std::string& key, const std::string& token) = 0;
  /// The current token; none when there is none.
  [[nodiscard]] virtual std::optional<std::string> copyCurrentToken() = 0;
  /// The token for `key`; none when there is none.
  [[nodiscard]] virtual std::optional<std::string> copyToken(const std::string& key) = 0;
  /// Removes every voicemail record, durably. Tokens stay.
  virtual void removeAllRecords() = 0;
};

template <>
VoicemailTokenStore& DefaultProvider<VoicemailTokenStore>();

}  // namespace platform
