// SPDX-License-Identifier: Apache-2.0
//
// The preferences store: values by key in domains, each domain kept per user and host scope. Any
// thread may call; the provider has its own lock. A value that synchronize() reported as stored
// survives a kill of the process and a power cut.
#pragma once

#include <optional>
#include <string>

#include "Helper/Platform/PropertyList.h"
#include "Helper/Platform/SharedService.h"

namespace platform {

enum class UserScope { kCurrentUser, kAnyUser };
enum class HostScope { kCurrentHost, kAnyHost };

/// Names one stored domain: its identifier (any UTF-8 text) and the scopes that it is kept for.
struct PreferenceDomain {
  std::string identifier;
  UserScope user = UserScope::kCurrentUser;
  HostScope host = HostScope::kAnyHost;
};

class PreferencesStore {
 public:
  virtual ~PreferencesStore() = default;

  /// The value of `key`, changes not yet synchronized included; none when it is absent. Shows what
  /// other processes stored no later than the next synchronize().
  [[nodiscard]] virtual std::optional<PropertyList> copyValue(const std::string& key,
                                                              const PreferenceDomain& domain) = 0;

  /// Sets `key` to `value`, or removes it when `value` is none. Kept in memory until the domain is
  /// synchronized.
  virtual void setValue(const std::string& key, std::optional<PropertyList> value,
                        const PreferenceDomain& domain) = 0;

  /// Writes the pending changes of `domain` durably and picks up what other processes wrote. False
  /// when a pending change could not be written; the store logs why. It stays pending, unless it
  /// never can be stored (the domain would exceed what a property list may hold), or changes of
  /// many megabytes wait already: then the domain's pending changes are dropped.
  virtual bool synchronize(const PreferenceDomain& domain) = 0;

  /// The value of `key` as an application sees it: the first found of current user and current
  /// host, current user and any host, any user and current host, any user and any host.
  [[nodiscard]] virtual std::optional<PropertyList> copyAppValue(const std::string& key,
                                                                 const std::string& domain) = 0;

  /// synchronize() for each of the four scopes that copyAppValue() searches.
  virtual bool synchronizeApp(const std::string& domain) = 0;

  /// Forgets the cached copy of `domain` in every host scope of `user` (kAnyUser: of every user
  /// scope), pending changes included. The next access reads the stored file.
  virtual void flushCachedDomain(const std::string& domain, UserScope user) = 0;
};

template <>
PreferencesStore& DefaultProvider<PreferencesStore>();

}  // namespace platform
