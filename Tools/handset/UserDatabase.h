// SPDX-License-Identifier: Apache-2.0
//
// The handset's users: the host's own, and the two that a handset adds. Formats: passwd(5) and
// group(5). Pure functions except where a path is named; one thread, no lock.
#pragma once

#include <sys/types.h>

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace handset {

/// The mobile user owns /var/mobile; the telephony daemon runs as the other one, whose group may
/// write to named message ports.
inline constexpr uid_t kMobileUser = 501;
inline constexpr gid_t kMobileGroup = 501;
inline constexpr uid_t kTelephonyUser = 502;
inline constexpr gid_t kTelephonyGroup = 502;
inline constexpr std::string_view kTelephonyGroupName = "halvec";

struct User {
  std::string name;
  uid_t uid = 0;
  gid_t gid = 0;
  std::string home;
  std::string shell;
};

/// The host's passwd text with the handset's users added. A host entry of the same name or the
/// same number gives way, so that neither is ambiguous inside.
[[nodiscard]] std::string PasswordTextWithHandsetUsers(std::string_view hostText);

/// The host's group text with the handset's groups added, under the same rule.
[[nodiscard]] std::string GroupTextWithHandsetGroups(std::string_view hostText);

/// The entry of the user called `name`, or whose number it is, in a passwd text; nothing where
/// there is none or its numbers do not parse.
[[nodiscard]] std::optional<User> FindUser(std::string_view passwordText, std::string_view name);

/// The groups that name the user as a member in a group text, without the user's own group.
[[nodiscard]] std::vector<gid_t> SupplementaryGroups(std::string_view groupText,
                                                     std::string_view userName);

/// Rewrites /etc/passwd and /etc/group of the file system that the caller runs in; throws Failure.
void InstallUserDatabase();

/// The user called `name` (or that number) of the running system; throws Failure where there is
/// none.
[[nodiscard]] User RequireUser(const std::string& name);

/// Whether a process of another user also becomes a member of the telephony daemon's group.
enum class PortGroup { kMember, kStranger };

/// Gives up root for good: groups, group, user, in that order. Throws Failure where any step is
/// refused.
void BecomeUser(const User& user, PortGroup portGroup);

}  // namespace handset
