// SPDX-License-Identifier: Apache-2.0
//
// Cache and pending changes of the preferences store, and the provider that uses this system's
// folders. What happens to the files themselves stands in PreferenceFile.cpp.
#include "Helper/Platform/Linux/PreferenceFiles.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <ctime>
#include <memory>
#include <vector>

#include "Helper/Platform/Linux/PreferenceFileName.h"
#include "Helper/Platform/SystemLog.h"
#include "Helper/Platform/UserDatabase.h"

namespace platform {

namespace {

// Time stamps of files advance with the timer interrupt, so a file that changed this shortly before
// it was read may have changed once more without looking any different.
constexpr std::int64_t kStampGrain = 20'000'000;

// Clients name the domains, so the cache forgets what it need not remember. Values that take more
// bytes of memory than this are kept for one domain at a time.
constexpr std::size_t kMostDomainsPerScope = 64;
constexpr std::size_t kLargestKept = std::size_t{1} << 20;

// How many bytes of memory the changes that could not be written may take in all: enough for the
// largest value.
constexpr std::size_t kMostWaiting = std::size_t{64} << 20;
static_assert(PropertyListLimits{}.nodes * sizeof(PropertyList) + PropertyListLimits{}.bytes <
              kMostWaiting);

struct Scope {
  UserScope user;
  HostScope host;
};

// In the order in which an application's values are looked up.
constexpr std::array kSearchedScopes{Scope{UserScope::kCurrentUser, HostScope::kCurrentHost},
                                     Scope{UserScope::kCurrentUser, HostScope::kAnyHost},
                                     Scope{UserScope::kAnyUser, HostScope::kCurrentHost},
                                     Scope{UserScope::kAnyUser, HostScope::kAnyHost}};

std::size_t IndexOf(UserScope user, HostScope host) {
  return (user == UserScope::kAnyUser ? 2U : 0U) + (host == HostScope::kAnyHost ? 1U : 0U);
}

// How long a copy may rely on the synchronize() before it, so that the usual pair of the two calls
// costs one look at the file.
constexpr std::int64_t kValidationLasts = 20'000'000;

std::int64_t NanosecondsOf(clockid_t clock) {
  timespec now{};
  ::clock_gettime(clock, &now);
  return std::int64_t{now.tv_sec} * 1'000'000'000 + now.tv_nsec;
}

// Whether the stored values already are what `pending` would make them.
template <class Pending>
bool IsStored(const PropertyList::Dictionary& values, const Pending& pending) {
  return std::all_of(pending.begin(), pending.end(), [&values](const auto& change) {
    const PropertyList* stored = values.find(change.first);
    return change.second ? stored != nullptr && *stored == *change.second : stored == nullptr;
  });
}

std::size_t MemoryOf(const PropertyList::Dictionary& values);

// About how many bytes of memory a value takes. Its file may be much shorter: a text that stands in
// many places is written once.
std::size_t MemoryOf(const PropertyList& value) {
  std::size_t bytes = sizeof value;
  if (const std::string* text = value.string()) {
    bytes += text->size();
  } else if (const PropertyList::Data* data = value.data()) {
    bytes += data->size();
  } else if (const PropertyList::Array* items = value.array()) {
    for (const PropertyList& item : *items) bytes += MemoryOf(item);
  } else if (const PropertyList::Dictionary* entries = value.dictionary()) {
    bytes += MemoryOf(*entries);
  }
  return bytes;
}

std::size_t MemoryOf(const PropertyList::Dictionary& values) {
  std::size_t bytes = 0;
  for (const auto& [key, value] : values) {
    bytes += sizeof(std::string) + key.size() + MemoryOf(value);
  }
  return bytes;
}

std::string HomeOfEffectiveUser() {
  const auto home = Shared<UserDatabase>().homeDirectory(::geteuid());
  return home ? std::string(home->utf8()) : std::string();
}

std::string HostIdentifier() {
  constexpr std::size_t kLongestIdentifier = 64;
  std::array<char, kLongestIdentifier + 1> text{};
  const FileDescriptor file(::open("/etc/machine-id", O_RDONLY | O_NONBLOCK | O_CLOEXEC));
  const ssize_t length = file ? ::read(file.get(), text.data(), kLongestIdentifier) : 0;
  const std::string_view identifier(text.data(), length > 0 ? static_cast<std::size_t>(length) : 0);
  const std::size_t digits =
      std::min(identifier.find_first_not_of("0123456789abcdefABCDEF"), identifier.size());
  return digits == 0 ? "localhost" : std::string(identifier.substr(0, digits));
}

}  // namespace

PreferenceRoots SystemPreferenceRoots() {
  PreferenceRoots roots;
  if (const std::string home = HomeOfEffectiveUser(); home.starts_with('/')) {
    roots.currentUser = (home == "/" ? "" : home) + "/Library/Preferences";
  }
  roots.anyUser = "/Library/Preferences";
  roots.host = HostIdentifier();
  return roots;
}

PreferenceFiles::PreferenceFiles(PreferenceRoots roots, std::chrono::milliseconds patience)
    : roots_(std::move(roots)), patience_(patience) {}

PreferenceFiles::Domain& PreferenceFiles::domainAt(const std::string& identifier, UserScope user,
                                                   HostScope host) {
  auto& domains = domains_[IndexOf(user, host)];
  if (const auto found = domains.find(identifier); found != domains.end()) return found->second;
  if (domains.size() >= kMostDomainsPerScope) {
    std::erase_if(domains, [](const auto& domain) { return domain.second.pending.empty(); });
  }
  Domain& domain = domains[identifier];
  const bool anyUser = user == UserScope::kAnyUser;
  domain.path.folder = anyUser ? roots_.anyUser : roots_.currentUser;
  domain.path.name = PreferenceFileName(identifier);
  if (anyUser) {
    domain.path.folderMode = 0755;
    domain.path.fileMode = 0644;
  }
  if (host == HostScope::kCurrentHost) {
    if (!domain.path.folder.empty()) domain.path.folder += "/ByHost";
    domain.path.name += '.' + PreferenceFileName(roots_.host);
  }
  domain.path.name += ".plist";
  domain.fullPath = domain.path.full();
  return domain;
}

void PreferenceFiles::report(Domain& domain, const char* state, const std::string& reason) {
  if (domain.reported == domain.stamp) return;
  domain.reported = domain.stamp;
  Log(LogPriority::kError, "Preferences file %s is %s: %s", domain.fullPath.c_str(), state,
      reason.c_str());
}

// Brings the cached copy up to date. False when the file cannot be read at present.
bool PreferenceFiles::refresh(Domain& domain) {
  if (domain.loaded && StampOfPreferenceFile(domain.fullPath) == domain.stamp &&
      domain.stamp.changed + kStampGrain < domain.readAt) {
    return true;
  }
  using State = PreferenceFileContents::State;
  domain.readAt = NanosecondsOf(CLOCK_REALTIME);
  PreferenceFileContents contents = ReadPreferenceFile(domain.fullPath);
  domain.stamp = contents.stamp;
  domain.values = std::move(contents.values);
  domain.large = MemoryOf(domain.values) > kLargestKept;
  domain.corrupt = contents.state == State::kCorrupt;
  domain.loaded = contents.state != State::kUnreadable;
  if (domain.corrupt) report(domain, "corrupt", contents.reason);
  if (!domain.loaded) report(domain, "unreadable", contents.reason);
  return domain.loaded;
}

void PreferenceFiles::forgetValues(Domain& domain) {
  domain.loaded = false;
  domain.large = false;
  domain.values = {};
}

void PreferenceFiles::forgetOtherLargeValues(const Domain& domain) {
  for (auto& domains : domains_) {
    for (auto& [identifier, other] : domains) {
      if (other.large && &other != &domain) forgetValues(other);
    }
  }
}

std::optional<PropertyList> PreferenceFiles::copyFrom(Domain& domain, const std::string& key) {
  if (const auto change = domain.pending.find(key); change != domain.pending.end()) {
    return change->second;
  }
  const std::int64_t age = NanosecondsOf(CLOCK_MONOTONIC_COARSE) - domain.validatedAt;
  // An unreadable file has been reported, and reads as empty.
  if (!domain.loaded || age > kValidationLasts) static_cast<void>(refresh(domain));
  const PropertyList* value = domain.values.find(key);
  std::optional<PropertyList> copy;
  if (value != nullptr) copy = *value;
  if (domain.large) forgetValues(domain);
  return copy;
}

std::size_t PreferenceFiles::waitingBytes() const {
  std::size_t bytes = 0;
  for (const auto& domains : domains_) {
    for (const auto& [identifier, domain] : domains) {
      if (!domain.pending.empty()) bytes += sizeof domain;
      for (const auto& change : domain.pending) {
        bytes += sizeof change + change.first.size();
        if (change.second) bytes += MemoryOf(*change.second);
      }
    }
  }
  return bytes;
}

// Logs why the domain's changes could not be written, and leaves them pending while there is room.
// Always false.
bool PreferenceFiles::giveUp(Domain& domain, const std::string& reason) {
  forgetValues(domain);
  const bool dropped = waitingBytes() > kMostWaiting;
  if (dropped) domain.pending.clear();
  Log(LogPriority::kError, "Cannot store preferences in %s: %s%s", domain.fullPath.c_str(),
      reason.c_str(), dropped ? ", and too much waits already; the change is dropped" : "");
  return false;
}

bool PreferenceFiles::write(Domain& domain) {
  PreferenceFileWriter writer(domain.path);
  if (!writer.begin(patience_)) return giveUp(domain, writer.reason());
  // Another process may have written before the lock was ours.
  if (!refresh(domain)) return giveUp(domain, "what it holds cannot be read");
  if (IsStored(domain.values, domain.pending)) {
    if (!writer.settle()) return giveUp(domain, writer.reason());
    domain.durable = domain.stamp;
    domain.pending.clear();
    return true;
  }

  PropertyList merged(domain.values);
  for (const auto& [key, value] : domain.pending) {
    if (value) {
      merged.dictionary()->set(key, *value);
    } else {
      merged.dictionary()->erase(key);
    }
  }
  const auto bytes = SerializeBinary(merged, StoredPreferenceLimits());
  if (!bytes) {
    // No later attempt would fare better, and none of the domain's other changes either.
    domain.pending.clear();
    return giveUp(domain, "more than a property list may hold; the change is dropped");
  }
  if (domain.corrupt) writer.keepAside();
  if (!writer.replace(*bytes)) return giveUp(domain, writer.reason());
  domain.values = std::move(*merged.dictionary());
  domain.stamp = domain.durable = writer.stamp();
  domain.corrupt = false;
  domain.readAt = NanosecondsOf(CLOCK_REALTIME);
  domain.pending.clear();
  domain.large = MemoryOf(domain.values) > kLargestKept;
  if (domain.large) forgetValues(domain);  // a change is no sign that a copy follows
  return true;
}

bool PreferenceFiles::synchronize(Domain& domain) {
  bool synchronized = true;
  const bool readable = refresh(domain);
  if (readable && domain.durable == domain.stamp && IsStored(domain.values, domain.pending)) {
    domain.pending.clear();
  } else if (!domain.pending.empty()) {
    synchronized = write(domain);
  }
  // These stay for the copy that usually follows.
  if (domain.large) forgetOtherLargeValues(domain);
  domain.validatedAt = NanosecondsOf(CLOCK_MONOTONIC_COARSE);
  return synchronized;
}

std::optional<PropertyList> PreferenceFiles::copyValue(const std::string& key,
                                                       const PreferenceDomain& domain) {
  const std::lock_guard lock(mutex_);
  return copyFrom(domainAt(domain.identifier, domain.user, domain.host), key);
}

void PreferenceFiles::setValue(const std::string& key, std::optional<PropertyList> value,
                               const PreferenceDomain& domain) {
  const std::lock_guard lock(mutex_);
  domainAt(domain.identifier, domain.user, domain.host)
      .pending.insert_or_assign(key, std::move(value));
}

bool PreferenceFiles::synchronize(const PreferenceDomain& domain) {
  const std::lock_guard lock(mutex_);
  return synchronize(domainAt(domain.identifier, domain.user, domain.host));
}

std::optional<PropertyList> PreferenceFiles::copyAppValue(const std::string& key,
                                                          const std::string& domain) {
  const std::lock_guard lock(mutex_);
  for (const Scope& scope : kSearchedScopes) {
    if (auto value = copyFrom(domainAt(domain, scope.user, scope.host), key)) return value;
  }
  return std::nullopt;
}

bool PreferenceFiles::synchronizeApp(const std::string& domain) {
  const std::lock_guard lock(mutex_);
  bool synchronized = true;
  for (const Scope& scope : kSearchedScopes) {
    if (!synchronize(domainAt(domain, scope.user, scope.host))) synchronized = false;
  }
  return synchronized;
}

void PreferenceFiles::flushCachedDomain(const std::string& domain, UserScope user) {
  const std::lock_guard lock(mutex_);
  for (const Scope& scope : kSearchedScopes) {
    if (user == UserScope::kCurrentUser && scope.user != user) continue;
    domains_[IndexOf(scope.user, scope.host)].erase(domain);
  }
}

template <>
PreferencesStore& DefaultProvider<PreferencesStore>() {
  static PreferencesStore& store = *new PreferenceFiles(SystemPreferenceRoots());
  return store;
}

}  // namespace platform
