// SPDX-License-Identifier: Apache-2.0
//
// Loads a property-list file that the telephony daemon may not read itself. Main thread; no state.
// No path is refused: the entitlement checked at connect is the only guard.
#include <cstring>
#include <optional>
#include <string>

#include "Helper/Files/DictionaryFile.h"
#include "Helper/Files/FileUtilities.h"
#include "Helper/Platform/SystemLog.h"
#include "Helper/Platform/TaskMemory.h"
#include "Helper/Shared/Server/RequestRoutines.h"

using platform::Log;
using platform::LogPriority;

KernReturn server_HvMobileHelperCopyPropertyListFile(PortName /*port*/, wire::Text<256>& path,
                                                     wire::Address* address,
                                                     std::uint32_t* byteCount) {
  *address = 0;
  *byteCount = 0;
  const std::string pathText(path.view());
  Log(LogPriority::kInfo, "Loading %s as plist", pathText.c_str());
  const ReleasePoolScope pool;
  const std::optional<platform::PropertyList> dictionary =
      CreateDictionaryFromFile(pathText.c_str());
  const std::optional<std::string> content =
      dictionary ? platform::SerializeXml(*dictionary) : std::nullopt;
  if (!content) {
    Log(LogPriority::kError, "Could not create data representation of dictionary");
    return KERN_MEMORY_FAILURE;
  }
  *byteCount = static_cast<std::uint32_t>(content->size());
  platform::VmAddress region = 0;
  const KernReturn code =
      platform::Shared<platform::TaskMemory>().allocate(region, content->size());
  if (code != KERN_SUCCESS) {
    Log(LogPriority::kError, "Could not allocate %d bytes for payload",
        static_cast<int>(*byteCount));
    return code;
  }
  std::memcpy(reinterpret_cast<void*>(region), content->data(), content->size());
  *address = region;
  return KERN_SUCCESS;
}
