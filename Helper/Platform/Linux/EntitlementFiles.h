// SPDX-License-Identifier: Apache-2.0
//
// Entitlements from root-owned property lists, one per executable: a dictionary with `Executable`
// (absolute path), `User` (name or uid) and `Entitlements` (name to value). Stateless: every
// question reads the files, so a change counts from the next connect of a new process on.
#pragma once

#include <string>
#include <vector>

#include "Helper/Platform/CallerSecurity.h"

namespace platform {

class EntitlementFiles final : public CallerSecurity {
 public:
  /// Searches `directories` in order; within one, files named *.plist by name. The first that
  /// names the executable and the user answers.
  explicit EntitlementFiles(std::vector<std::string> directories);
  std::unique_ptr<SecurityTask> createTask(const wire::AuditToken& token) override;

 private:
  const std::vector<std::string> directories_;
};

}  // namespace platform
