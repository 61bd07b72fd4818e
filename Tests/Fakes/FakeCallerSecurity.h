// SPDX-License-Identifier: Apache-2.0
//
// Caller security that answers what a test has told it, for every process. One thread at a time.
#pragma once

#include <map>
#include <string>
#include <utility>

#include "Helper/Platform/CallerSecurity.h"

namespace fakes {

class FakeCallerSecurity final : public platform::CallerSecurity {
 public:
  /// What the question for `name` is answered from now on.
  void answer(const std::string& name, platform::EntitlementAnswer answer) {
    answers_.insert_or_assign(name, std::move(answer));
  }
  void grant(const std::string& name) { answer(name, {.value = platform::PropertyList(true)}); }
  void withholdTask() { providesTask_ = false; }
  [[nodiscard]] int questions() const { return questions_; }

  std::unique_ptr<platform::SecurityTask> createTask(const wire::AuditToken& /*token*/) override {
    return providesTask_ ? std::make_unique<Task>(*this) : nullptr;
  }

 private:
  class Task final : public platform::SecurityTask {
   public:
    explicit Task(FakeCallerSecurity& owner) : owner_(owner) {}
    platform::EntitlementAnswer copyValueForEntitlement(std::string_view name) override {
      ++owner_.questions_;
      const auto found = owner_.answers_.find(std::string(name));
      return found == owner_.answers_.end() ? platform::EntitlementAnswer{} : found->second;
    }

   private:
    FakeCallerSecurity& owner_;
  };

  std::map<std::string, platform::EntitlementAnswer> answers_;
  bool providesTask_ = true;
  int questions_ = 0;
};

}  // namespace fakes
