// SPDX-License-Identifier: Apache-2.0
//
// Places files where the telephony daemon cannot write: one file, the crash logs, a carrier bundle.
// Main thread; no state. The entitlement was checked at connect; the allow-list judges the
// destination of a file and of a bundle. What the work comes to is in the flag alone: the return
// code is always success.
#include <string>

#include "Helper/Files/FileUtilities.h"
#include "Helper/Files/MobileUser.h"
#include "Helper/Files/PathAllowList.h"
#include "Helper/Platform/SystemLog.h"
#include "Helper/Shared/Server/RequestRoutines.h"

using platform::Log;
using platform::LogPriority;

namespace {

/// Joins a directory and what stands below it with one separator.
std::string CrashLogDirectory() {
  const char* home = GetMobileUserDirectory();
  std::string path = home ? home : "";
  if (!path.ends_with('/')) path += '/';
  return path + "Library/Logs/CrashReporter/";
}

/// Gives the item to the mobile user.
/// Kept: as chown(2) does it. A link is followed, so that of a copied link what it points to is
/// given, and a link to nothing makes it fail. So does another's link, which is not followed.
bool GiveToMobileUser(const std::string& path) {
  return SetItemOwner(path.c_str(), GetMobileUserUID(), GetMobileUserGID(),
                      /*recursive=*/false) == 0;
}

}  // namespace

KernReturn server_HvMobileHelperCopyFile(PortName /*port*/, wire::Text<256>& sourceDirectory,
                                         wire::Text<256>& destinationDirectory,
                                         wire::Text<256>& fileName, wire::Flag& success) {
  const std::string from(sourceDirectory.view());
  const std::string to(destinationDirectory.view());
  const std::string name(fileName.view());
  success.value = 0;
  const std::string destination = to + '/' + name;
  Log(LogPriority::kNotice, "'%s', '%s', '%s'\n", from.c_str(), to.c_str(), name.c_str());
  if (!IsAllowedPath(destination.c_str())) {
    Log(LogPriority::kError, "Destination directory %s is not within the allowed directories\n",
        destination.c_str());
    return KERN_SUCCESS;
  }
  const ReleasePoolScope pool;
  if (CopyFileIntoDirectory(from.c_str(), to.c_str(), name.c_str()) == 0) {
    // Kept: where the destination is a directory, into which the file went, the directory is given.
    success.value = GiveToMobileUser(destination) ? 1 : 0;
  } else {
    Log(LogPriority::kError, "Failed to copy the file %s to %s\n", from.c_str(), to.c_str());
  }
  return KERN_SUCCESS;
}

// No allow-list: the destination is fixed, and the source may be any path.
KernReturn server_HvMobileHelperCopyCrashLogs(PortName /*port*/, wire::Text<256>& sourcePath,
                                              wire::Flag& success) {
  const std::string destination = CrashLogDirectory();
  const std::string from(sourcePath.view());
  Log(LogPriority::kNotice, "'%s', '%s'\n", from.c_str(), destination.c_str());
  const ReleasePoolScope pool;
  const std::int32_t code = CopyDirectory(from.c_str(), destination.c_str());
  if (code != 0) {
    Log(LogPriority::kNotice, "Failed to copy the directory %s to %s. Error: %d\n", from.c_str(),
        destination.c_str(), code);
  }
  success.value = code == 0 ? 1 : 0;
  return KERN_SUCCESS;
}

KernReturn server_HvMobileHelperMoveCarrierBundles(PortName /*port*/, wire::Text<256>& sourcePath,
                                                   wire::Text<256>& destinationDirectory,
                                                   wire::Text<256>& name, wire::Flag& success) {
  const std::string from(sourcePath.view());
  const std::string to(destinationDirectory.view());
  const std::string bundle(name.view());
  success.value = 0;
  Log(LogPriority::kNotice, "'%s', '%s'\n", from.c_str(), to.c_str());
  const ReleasePoolScope pool;
  // Kept: the directory is made before the allow-list judges, and stays when it refuses.
  if (!FileExists(to.c_str())) {
    const std::int32_t code =
        CreateDirectory(to.c_str(), kFileDirectoryMode, /*intermediates=*/true);
    if (code != 0) {
      Log(LogPriority::kNotice, "Failed to create CarrierBundles Dir  to %s. Error: %d\n",
          to.c_str(), code);
      return KERN_SUCCESS;
    }
  }
  const std::string destination = to + '/' + bundle;
  Log(LogPriority::kNotice, "'%s', '%s', '%s'\n", from.c_str(), to.c_str(), bundle.c_str());
  if (!IsAllowedPath(destination.c_str())) {
    Log(LogPriority::kError, "Destination directory %s is not within the allowed directories\n",
        destination.c_str());
    return KERN_SUCCESS;
  }
  const std::int32_t code = MoveItemWithOwner(from.c_str(), destination.c_str());
  if (code != 0) {
    Log(LogPriority::kError, "Failed to move the directory %s to %s. Error: %d\n", from.c_str(),
        to.c_str(), code);
  }
  success.value = code == 0 ? 1 : 0;
  return KERN_SUCCESS;
}
