// SPDX-License-Identifier: Apache-2.0
//
// Lines of colon-separated fields, read and written by hand: the C library's look-ups would load
// whatever name services the host has configured. One thread, no lock.
#include "Tools/handset/UserDatabase.h"

#include <grp.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <charconv>

#include "Tools/handset/Failure.h"
#include "Tools/handset/Files.h"

namespace handset {
namespace {

constexpr const char* kPasswordFile = "/etc/passwd";
constexpr const char* kGroupFile = "/etc/group";

struct NewEntry {
  std::string_view name;
  unsigned number;
  std::string_view line;
};

constexpr std::array kUsers{
    NewEntry{"mobile", kMobileUser, "mobile:x:501:501:Mobile User:/var/mobile:/bin/sh"},
    NewEntry{"halvec", kTelephonyUser, "halvec:x:502:502:Telephony Daemon:/var/empty:/bin/sh"},
};
constexpr std::array kGroups{
    NewEntry{"mobile", kMobileGroup, "mobile:x:501:"},
    NewEntry{kTelephonyGroupName, kTelephonyGroup, "halvec:x:502:"},
};

std::vector<std::string_view> Split(std::string_view text, char separator) {
  std::vector<std::string_view> parts;
  for (;;) {
    const std::size_t end = text.find(separator);
    parts.push_back(text.substr(0, end));
    if (end == std::string_view::npos) return parts;
    text.remove_prefix(end + 1);
  }
}

std::optional<unsigned> Number(std::string_view text) {
  unsigned value = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
  if (error != std::errc{} || end != text.data() + text.size()) return std::nullopt;
  return value;
}

/// Fields 0 (name) and 2 (number) stand at the same place in both files.
template <typename Entries>
std::string Merge(std::string_view hostText, const Entries& added) {
  std::string merged;
  for (const std::string_view line : Split(hostText, '\n')) {
    if (line.empty()) continue;
    const auto fields = Split(line, ':');
    const bool givesWay = std::any_of(added.begin(), added.end(), [&](const NewEntry& entry) {
      return fields[0] == entry.name || (fields.size() > 2 && Number(fields[2]) == entry.number);
    });
    if (!givesWay) merged.append(line).append("\n");
  }
  for (const NewEntry& entry : added) merged.append(entry.line).append("\n");
  return merged;
}

}  // namespace

std::string PasswordTextWithHandsetUsers(std::string_view hostText) {
  return Merge(hostText, kUsers);
}

std::string GroupTextWithHandsetGroups(std::string_view hostText) {
  return Merge(hostText, kGroups);
}

std::optional<User> FindUser(std::string_view passwordText, std::string_view name) {
  const std::optional<unsigned> asNumber = Number(name);
  for (const std::string_view line : Split(passwordText, '\n')) {
    const auto fields = Split(line, ':');
    if (fields.size() < 7) continue;
    const std::optional<unsigned> uid = Number(fields[2]);
    const std::optional<unsigned> gid = Number(fields[3]);
    if (!uid || !gid) continue;
    if (fields[0] != name && asNumber != uid) continue;
    return User{std::string(fields[0]), *uid, *gid, std::string(fields[5]), std::string(fields[6])};
  }
  return std::nullopt;
}

std::vector<gid_t> SupplementaryGroups(std::string_view groupText, std::string_view userName) {
  std::vector<gid_t> groups;
  for (const std::string_view line : Split(groupText, '\n')) {
    const auto fields = Split(line, ':');
    if (fields.size() < 4) continue;
    const std::optional<unsigned> gid = Number(fields[2]);
    const auto members = Split(fields[3], ',');
    if (gid && std::find(members.begin(), members.end(), userName) != members.end()) {
      groups.push_back(*gid);
    }
  }
  return groups;
}

void InstallUserDatabase() {
  ReplaceFile(kPasswordFile, PasswordTextWithHandsetUsers(ReadWholeFile(kPasswordFile)), 0644);
  ReplaceFile(kGroupFile, GroupTextWithHandsetGroups(ReadWholeFile(kGroupFile)), 0644);
}

User RequireUser(const std::string& name) {
  std::optional<User> user = FindUser(ReadWholeFile(kPasswordFile), name);
  if (!user) throw Failure("there is no user " + name);
  return *std::move(user);
}

void BecomeUser(const User& user, PortGroup portGroup) {
  std::vector<gid_t> groups = SupplementaryGroups(ReadWholeFile(kGroupFile), user.name);
  std::erase(groups, kTelephonyGroup);
  groups.push_back(user.gid);
  if (portGroup == PortGroup::kMember) groups.push_back(kTelephonyGroup);
  if (setgroups(groups.size(), groups.data()) != 0) throw Failure::FromErrno("setgroups");
  if (setresgid(user.gid, user.gid, user.gid) != 0) throw Failure::FromErrno("setresgid");
  if (setresuid(user.uid, user.uid, user.uid) != 0) throw Failure::FromErrno("setresuid");
}

}  // namespace handset
