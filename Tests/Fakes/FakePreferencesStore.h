// SPDX-License-Identifier: Apache-2.0
//
// A preferences store in memory. Several stores may share one storage, as processes share the files
// of a system; what others stored is seen as late as a store may show it, at the next synchronize.
// Any thread; one lock per store, and the storage belongs to one thread at a time.
#pragma once

#include <array>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include "Helper/Platform/PreferencesStore.h"

namespace fakes {

class FakePreferencesStore final : public platform::PreferencesStore {
 public:
  using Domain = std::tuple<std::string, platform::UserScope, platform::HostScope>;
  using Storage = std::map<Domain, std::map<std::string, platform::PropertyList>>;

  FakePreferencesStore() : FakePreferencesStore(std::make_shared<Storage>()) {}
  explicit FakePreferencesStore(std::shared_ptr<Storage> storage) : storage_(std::move(storage)) {}

  /// Makes every write fail, or succeed again.
  void setWritable(bool writable) {
    const std::lock_guard guard(mutex_);
    writable_ = writable;
  }

  /// The domains that were synchronized since the last call, in that order.
  [[nodiscard]] std::vector<Domain> takeSynchronized() {
    const std::lock_guard guard(mutex_);
    return std::exchange(synchronized_, {});
  }

  std::optional<platform::PropertyList> copyValue(
      const std::string& key, const platform::PreferenceDomain& domain) override {
    const std::lock_guard guard(mutex_);
    return copy(key, {domain.identifier, domain.user, domain.host});
  }

  void setValue(const std::string& key, std::optional<platform::PropertyList> value,
                const platform::PreferenceDomain& domain) override {
    const std::lock_guard guard(mutex_);
    pending_[{domain.identifier, domain.user, domain.host}].insert_or_assign(key, std::move(value));
  }

  bool synchronize(const platform::PreferenceDomain& domain) override {
    const std::lock_guard guard(mutex_);
    return store({domain.identifier, domain.user, domain.host});
  }

  std::optional<platform::PropertyList> copyAppValue(const std::string& key,
                                                     const std::string& domain) override {
    const std::lock_guard guard(mutex_);
    for (const auto& [user, host] : kSearched) {
      if (auto value = copy(key, {domain, user, host})) return value;
    }
    return std::nullopt;
  }

  bool synchronizeApp(const std::string& domain) override {
    const std::lock_guard guard(mutex_);
    bool stored = true;
    for (const auto& [user, host] : kSearched) {
      if (!store({domain, user, host})) stored = false;
    }
    return stored;
  }

  void flushCachedDomain(const std::string& domain, platform::UserScope user) override {
    const std::lock_guard guard(mutex_);
    for (const auto& [scope, host] : kSearched) {
      if (user == platform::UserScope::kAnyUser || scope == user) {
        pending_.erase({domain, scope, host});
        seen_.erase({domain, scope, host});
      }
    }
  }

 private:
  using Values = Storage::mapped_type;
  using Changes = std::map<std::string, std::optional<platform::PropertyList>>;

  static constexpr std::array<std::pair<platform::UserScope, platform::HostScope>, 4> kSearched{
      {{platform::UserScope::kCurrentUser, platform::HostScope::kCurrentHost},
       {platform::UserScope::kCurrentUser, platform::HostScope::kAnyHost},
       {platform::UserScope::kAnyUser, platform::HostScope::kCurrentHost},
       {platform::UserScope::kAnyUser, platform::HostScope::kAnyHost}}};

  std::optional<platform::PropertyList> copy(const std::string& key, const Domain& domain) {
    if (const auto changes = pending_.find(domain); changes != pending_.end()) {
      const auto change = changes->second.find(key);
      if (change != changes->second.end()) return change->second;
    }
    if (!seen_.contains(domain)) look(domain);
    const Values& values = seen_[domain];
    const auto value = values.find(key);
    return value == values.end() ? std::nullopt : std::optional(value->second);
  }

  void look(const Domain& domain) {
    const auto values = storage_->find(domain);
    seen_[domain] = values == storage_->end() ? Values{} : values->second;
  }

  bool store(const Domain& domain) {
    synchronized_.push_back(domain);
    const bool stored = write(domain);
    look(domain);
    return stored;
  }

  bool write(const Domain& domain) {
    const auto changes = pending_.find(domain);
    if (changes == pending_.end()) return true;
    if (!writable_) return false;
    for (auto& [key, value] : changes->second) {
      if (value) {
        (*storage_)[domain].insert_or_assign(key, std::move(*value));
      } else {
        (*storage_)[domain].erase(key);
      }
    }
    pending_.erase(changes);
    return true;
  }

  std::mutex mutex_;
  std::shared_ptr<Storage> storage_;
  std::map<Domain, Changes> pending_;
  std::map<Domain, Values> seen_;  // as of the last synchronize, or else of the first look
  std::vector<Domain> synchronized_;
  bool writable_ = true;
};

}  // namespace fakes
