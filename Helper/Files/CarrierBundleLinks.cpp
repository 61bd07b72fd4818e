// SPDX-License-Identifier: Apache-2.0
//
// Points fixed names in the mobile user's library at carrier bundles, and removes such names
// together with the cached copy of their preference domain. Main thread; no state of its own.
#include <optional>

#include "Helper/Files/PathAllowList.h"
#include "Helper/Platform/DirectoryEntries.h"
#include "Helper/Platform/PreferencesStore.h"
#include "Helper/Platform/String.h"
#include "Helper/Platform/SystemLog.h"
#include "Helper/Shared/Server/RequestRoutines.h"

using platform::DirectoryEntries;
using platform::Log;
using platform::LogPriority;

namespace {

/// The field as a C string: whatever its last byte was, it is zero now.
const char* Terminated(wire::Text<1024>& field) {
  field.bytes.back() = '\0';
  return field.bytes.data();
}

/// Makes the preferences store forget its copy of `domain`. A text that is no UTF-8 names no
/// domain, and nothing is forgotten.
void FlushDomain(const char* domain) {
  const auto name = platform::String::Decode(domain, platform::StringEncoding::kUtf8);
  if (!name) return;
  platform::Shared<platform::PreferencesStore>().flushCachedDomain(std::string(name->utf8()),
                                                                   platform::UserScope::kAnyUser);
}

/// Puts a link to `target` in the place of whatever stands at `path`.
KernReturn ReplaceWithLink(const char* target, const char* path) {
  auto& entries = platform::Shared<DirectoryEntries>();
  // Kept: what could not be removed is not reported, it makes the link fail. And what was removed
  // does not come back when the link fails.
  (void)entries.remove(path);
  return entries.makeLink(target, path) ? KERN_SUCCESS : KERN_FAILURE;
}

}  // namespace

KernReturn server_HvMobileHelperSetCarrierBundleLink(PortName /*port*/, wire::Text<1024>& target,
                                                     wire::Text<1024>& linkPath,
                                                     wire::Text<1024>& domain) {
  const char* const targetText = Terminated(target);
  const char* const path = Terminated(linkPath);
  const char* const domainText = Terminated(domain);
  if (!IsAllowedLinkPath(path)) {
    Log(LogPriority::kError, "Cannot remove symlink: %s", path);
    return KERN_NO_ACCESS;
  }
  if (ReplaceWithLink(targetText, path) != KERN_SUCCESS) return KERN_FAILURE;
  Log(LogPriority::kInfo, "linkpath: %s, domain: %s", path, domainText);
  if (*domainText != '\0') FlushDomain(domainText);
  return KERN_SUCCESS;
}

// Kept: this one asks nobody about the path, unlike the routine above; that the client holds the
// entitlement is its only guard.
KernReturn server_HvMobileHelperCreateSymlink(PortName /*port*/, wire::Text<1024>& target,
                                              wire::Text<1024>& linkPath) {
  return ReplaceWithLink(Terminated(target), Terminated(linkPath));
}

KernReturn server_HvMobileHelperRemoveCarrierBundleLink(PortName /*port*/,
                                                        wire::Text<1024>& linkPath,
                                                        wire::Text<1024>& domain) {
  const char* const path = Terminated(linkPath);
  const char* const domainText = Terminated(domain);
  // Kept: the domain is forgotten before the path is judged, so also when the path is refused.
  if (*domainText != '\0') {
    Log(LogPriority::kNotice, "Removing domain: %s\n", domainText);
    FlushDomain(domainText);
  }
  if (!IsAllowedPath(path)) return KERN_NO_ACCESS;
  return platform::Shared<DirectoryEntries>().remove(path) ? KERN_SUCCESS : KERN_FAILURE;
}
