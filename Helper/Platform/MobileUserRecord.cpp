// SPDX-License-Identifier: Apache-2.0
//
// The one look-up of the mobile user. Runs on whichever thread asks first.
#include "Helper/Platform/MobileUserRecord.h"

#include <array>

#include "Helper/Platform/UserDatabase.h"

namespace platform {

void MobileUserRecord::fill() {
  auto& database = Shared<UserDatabase>();
  if (const std::optional<String> home = database.homeDirectory(userName_)) {
    directory_ =
        CFStringGetOrCreateCString(nullptr, &*home, nullptr, nullptr, StringEncoding::kUtf8);
  }
  std::array<char, 32> buffer{};
  std::size_t size = buffer.size();
  char* name =
      CFStringGetOrCreateCString(nullptr, &userName_, buffer.data(), &size, StringEncoding::kUtf8);
  if (!name) return;
  if (const std::optional<UserIds> ids = database.ids(name)) {
    uid_ = ids->user;
    gid_ = ids->group;
  }
  if (name != buffer.data()) DefaultAllocator().deallocate(name);
}

MobileUserRecord& MobileUser() {
  // Never destroyed: the pointer that directory() gave stays good until the process is gone.
  static auto* const record = new MobileUserRecord;  // NOLINT: kept for the life of the process
  return *record;
}

}  // namespace platform
