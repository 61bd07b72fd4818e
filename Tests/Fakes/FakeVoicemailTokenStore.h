// SPDX-License-Identifier: Apache-2.0
//
// A voicemail token store in memory. Several stores may share one storage, as processes share the
// file of a system. Any thread; one lock per storage.
#pragma once

#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "Helper/Platform/VoicemailTokenStore.h"

namespace fakes {

class FakeVoicemailTokenStore final : public platform::VoicemailTokenStore {
 public:
  /// What changes the storage.
  enum class Change { kSetCurrentToken, kClearCurrentToken, kSetToken, kRemoveAllRecords };
  struct Storage {
    std::mutex mutex;
    std::optional<std::string> current;
    std::map<std::string, std::string> tokens;
    int records = 0;
    std::vector<Change> changes;
  };

  FakeVoicemailTokenStore() : FakeVoicemailTokenStore(std::make_shared<Storage>()) {}
  explicit FakeVoicemailTokenStore(std::shared_ptr<Storage> storage)
      : storage_(std::move(storage)) {}

  void setCurrentToken(const std::optional<std::string>& token) override {
    const std::lock_guard guard(storage_->mutex);
    storage_->current = token;
    storage_->changes.push_back(token ? Change::kSetCurrentToken : Change::kClearCurrentToken);
  }
  void setToken(const std::string& key, const std::string& token) override {
    const std::lock_guard guard(storage_->mutex);
    storage_->tokens.insert_or_assign(key, token);
    storage_->changes.push_back(Change::kSetToken);
  }
  std::optional<std::string> copyCurrentToken() override {
    const std::lock_guard guard(storage_->mutex);
    return storage_->current;
  }
  std::optional<std::string> copyToken(const std::string& key) override {
    const std::lock_guard guard(storage_->mutex);
    const auto found = storage_->tokens.find(key);
    return found == storage_->tokens.end() ? std::nullopt : std::optional(found->second);
  }
  void removeAllRecords() override {
    const std::lock_guard guard(storage_->mutex);
    storage_->records = 0;
    storage_->changes.push_back(Change::kRemoveAllRecords);
  }

  /// What the voicemail service itself does.
  void addRecord() {
    const std::lock_guard guard(storage_->mutex);
    ++storage_->records;
  }
  [[nodiscard]] int records() {
    const std::lock_guard guard(storage_->mutex);
    return storage_->records;
  }
  /// What was changed since the last call, in that order.
  [[nodiscard]] std::vector<Change> takeChanges() {
    const std::lock_guard guard(storage_->mutex);
    return std::exchange(storage_->changes, {});
  }

 private:
  const std::shared_ptr<Storage> storage_;
};

}  // namespace fakes
