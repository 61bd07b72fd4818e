// SPDX-License-Identifier: Apache-2.0
//
// The preferences store on files: one property-list file per domain and scope, read whole into a
// cache that one stat validates, and replaced durably. Any thread; one mutex guards everything, and
// is held while a domain is written.
#pragma once

#include <array>
#include <chrono>
#include <map>
#include <mutex>
#include <optional>
#include <string>

#include "Helper/Platform/Linux/PreferenceFile.h"
#include "Helper/Platform/PreferencesStore.h"

namespace platform {

/// Where preferences are kept. Values for the current host only stand in `ByHost` below either
/// folder, with the host's identifier in the file name.
struct PreferenceRoots {
  std::string currentUser;  // empty: the user has no home, and so no preferences
  std::string anyUser;
  std::string host;
};

/// Library/Preferences in the home that the user database gives the effective user,
/// /Library/Preferences, and the identifier of /etc/machine-id ("localhost" where there is none).
[[nodiscard]] PreferenceRoots SystemPreferenceRoots();

/// Files are written in the binary form, which carries every value, control characters in text and
/// fractions of seconds included; either form is read. A file that is no property list reads as an
/// empty domain, is logged once, and is kept under another name when the domain is next written.
class PreferenceFiles final : public PreferencesStore {
 public:
  /// `patience` bounds the wait for another process that writes the same domain.
  explicit PreferenceFiles(PreferenceRoots roots,
                           std::chrono::milliseconds patience = std::chrono::milliseconds(500));

  [[nodiscard]] std::optional<PropertyList> copyValue(const std::string& key,
                                                      const PreferenceDomain& domain) override;
  void setValue(const std::string& key, std::optional<PropertyList> value,
                const PreferenceDomain& domain) override;
  bool synchronize(const PreferenceDomain& domain) override;
  [[nodiscard]] std::optional<PropertyList> copyAppValue(const std::string& key,
                                                         const std::string& domain) override;
  bool synchronizeApp(const std::string& domain) override;
  void flushCachedDomain(const std::string& domain, UserScope user) override;

 private:
  struct Domain {
    PreferenceFilePath path;
    std::string fullPath;
    // What the file held at `readAt` (nanoseconds since 1970), when `loaded`.
    bool loaded = false;
    bool corrupt = false;
    PreferenceFileStamp stamp;
    std::int64_t readAt = 0;
    PropertyList::Dictionary values;
    // Whether `values` takes more memory than the cache keeps for every domain.
    bool large = false;
    // When synchronize() last validated the copy (nanoseconds of CLOCK_MONOTONIC_COARSE).
    std::int64_t validatedAt = 0;
    // The state of the file that is known to survive a power cut.
    PreferenceFileStamp durable;
    // The state of the file whose defect is in the log already.
    std::optional<PreferenceFileStamp> reported;
    // Changes not yet written; none removes the key.
    std::map<std::string, std::optional<PropertyList>, std::less<>> pending;
  };

  // All of these with mutex_ held.
  [[nodiscard]] Domain& domainAt(const std::string& identifier, UserScope user, HostScope host);
  [[nodiscard]] std::optional<PropertyList> copyFrom(Domain& domain, const std::string& key);
  [[nodiscard]] bool refresh(Domain& domain);
  void forgetValues(Domain& domain);
  void forgetOtherLargeValues(const Domain& domain);
  [[nodiscard]] bool synchronize(Domain& domain);
  [[nodiscard]] bool write(Domain& domain);
  bool giveUp(Domain& domain, const std::string& reason);
  [[nodiscard]] std::size_t waitingBytes() const;
  void report(Domain& domain, const char* state, const std::string& reason);

  const PreferenceRoots roots_;
  const std::chrono::milliseconds patience_;
  std::mutex mutex_;
  // Under mutex_: the domains of each scope, by identifier.
  std::array<std::map<std::string, Domain, std::less<>>, 4> domains_;
};

}  // namespace platform
