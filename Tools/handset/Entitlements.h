// SPDX-License-Identifier: Apache-2.0
//
// Entitlement property lists: one XML file per executable, a dictionary of `Executable` (absolute
// path), `User` (user name, or uid as integer) and `Entitlements` (name to typed value). Used
// inside the handset, as root. One thread, no lock.
#pragma once

#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace handset {

/// What the helper asks of its callers, unless the caller of the tool names another one.
inline constexpr std::string_view kDefaultEntitlement = "com.zarvo.Vintrel.HalvecHelper.allow";

/// Where the system looks for entitlement property lists, first match wins.
[[nodiscard]] std::vector<std::string> EntitlementDirectories();

/// Names with the XML fragment of their values, in the order given.
using EntitlementValues = std::vector<std::pair<std::string, std::string>>;

/// The property list of one executable. `user` is written as an integer where it is a number.
/// Texts are escaped; value fragments are written as they are, well-formed or not.
[[nodiscard]] std::string EntitlementPropertyList(const std::string& executable,
                                                  const std::string& user,
                                                  const EntitlementValues& values);

/// The file name that stands for an executable: its path without the leading slash, '%' and '/'
/// written as %25 and %2F, and ".plist".
[[nodiscard]] std::string EntitlementFileName(const std::string& executable);

/// Throws Failure, saying why, unless `path` is absolute, passes no symbolic link, names a regular
/// executable file, and that file and every folder above it is root's and not writable by others:
/// the system answers nobody's entitlements otherwise.
void RequireEntitleable(const std::string& path);

/// `handset entitle PATH USER [--name NAME] [--value FRAGMENT] [--unchecked]` without its first
/// word. Throws Failure.
void Entitle(const std::vector<std::string>& arguments);

/// `handset install SRC [NAME]` without its first word: copies an executable to where it can be
/// entitled and prints that path. Throws Failure.
void Install(const std::vector<std::string>& arguments);

}  // namespace handset
