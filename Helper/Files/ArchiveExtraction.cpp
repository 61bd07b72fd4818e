// SPDX-License-Identifier: Apache-2.0
//
// Unpacks a package, such as a carrier bundle's, where the telephony daemon cannot write. Main
// thread; no state. No path is refused: the entitlement checked at connect is the only guard. What
// the work comes to is in the flag alone: the return code is always success.
#include <memory>
#include <string>

#include "Helper/Files/FileUtilities.h"
#include "Helper/Platform/ArchiveCopier.h"
#include "Helper/Platform/SystemLog.h"
#include "Helper/Shared/Server/RequestRoutines.h"

using platform::Log;
using platform::LogPriority;

KernReturn server_HvMobileHelperExtractArchive(PortName /*port*/, wire::Text<256>& sourcePath,
                                               wire::Text<256>& destinationPath,
                                               wire::Flag& success) {
  success.value = 0;
  const ReleasePoolScope pool;
  const std::unique_ptr<platform::ArchiveCopier> copier =
      platform::Shared<platform::ArchiveCopierFactory>().create();
  if (!copier) return KERN_SUCCESS;
  const platform::ArchiveCopyOptions options{{platform::kExtractPKZip, true},
                                             {platform::kCopyExtendedAttributes, true},
                                             {platform::kCopyResources, true}};
  // Kept: one item that cannot be extracted is left out without a line in the log.
  copier->setFileErrorCallback(
      [](const std::string& /*name*/, int /*error*/) { return platform::kLeaveItemOut; });
  copier->setFatalErrorCallback(
      [] { Log(LogPriority::kError, "ArchiveCopier signaled fatal file error"); });
  const std::string source(sourcePath.view());
  const std::string destination(destinationPath.view());
  success.value = copier->copy(source, destination, options) == 0 ? 1 : 0;
  return KERN_SUCCESS;
}
