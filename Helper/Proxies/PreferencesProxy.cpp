// SPDX-License-Identifier: Apache-2.0
//
// Reads and writes preference values on the telephony daemon's behalf. Main thread; no state of its
// own. The entitlement checked at connect is the only guard: any domain may be named.
#include <cstring>
#include <optional>
#include <string>

#include "Helper/Platform/PreferencesStore.h"
#include "Helper/Platform/PropertyList.h"
#include "Helper/Platform/SystemLog.h"
#include "Helper/Platform/TaskMemory.h"
#include "Helper/Proxies/TextField.h"
#include "Helper/Shared/Server/RequestRoutines.h"

using platform::Log;
using platform::LogPriority;
using platform::PreferenceDomain;
using platform::PreferencesStore;
using platform::PropertyList;

namespace {

/// Kept: a value of exactly one byte, whatever the byte, means that the key is to be removed.
constexpr std::uint32_t kRemovalByteCount = 1;

/// Hands `value` over as an XML property list in a region of its own.
KernReturn HandOver(const PropertyList& value, const char* allocationLine, wire::Address* address,
                    std::uint32_t* byteCount) {
  const std::optional<std::string> content = platform::SerializeXml(value);
  if (!content) return KERN_FAILURE;
  *byteCount = static_cast<std::uint32_t>(content->size());
  if (*byteCount == 0) return KERN_FAILURE;
  const KernReturn code =
      platform::Shared<platform::TaskMemory>().allocate(*address, content->size());
  Log(LogPriority::kError, allocationLine, *byteCount);
  if (code != KERN_SUCCESS) return code;
  std::memcpy(reinterpret_cast<void*>(*address), content->data(), content->size());
  return KERN_SUCCESS;
}

}  // namespace

KernReturn server_HvMobileHelperSetPreferenceValue(PortName /*port*/, wire::Text<256>& domain,
                                                   wire::Text<256>& key, const std::byte* data,
                                                   std::uint32_t byteCount) {
  std::optional<std::string> domainText = TextOf(domain);
  const std::optional<std::string> keyText = TextOf(key);
  if (!domainText || !keyText) return KERN_FAILURE;
  std::optional<PropertyList> value;
  if (byteCount != kRemovalByteCount) {
    value = platform::ParsePropertyList({data, byteCount});
    if (!value) return KERN_FAILURE;
  }
  const PreferenceDomain place{.identifier = *std::move(domainText)};
  auto& store = platform::Shared<PreferencesStore>();
  store.setValue(*keyText, std::move(value), place);
  // Kept: the answer does not depend on it. The store itself logs what it could not write.
  (void)store.synchronize(place);
  return KERN_SUCCESS;
}

KernReturn server_HvMobileHelperCopyPreferenceValue(PortName /*port*/, wire::Text<256>& domain,
                                                    wire::Text<256>& key, wire::Address* address,
                                                    std::uint32_t* byteCount) {
  *address = 0;
  *byteCount = 0;
  std::optional<std::string> domainText = TextOf(domain);
  const std::optional<std::string> keyText = TextOf(key);
  if (!domainText || !keyText) return KERN_FAILURE;
  const PreferenceDomain place{.identifier = *std::move(domainText)};
  auto& store = platform::Shared<PreferencesStore>();
  (void)store.synchronize(place);  // a value that could not be written is still the value
  const std::optional<PropertyList> value = store.copyValue(*keyText, place);
  if (!value) return KERN_SUCCESS;
  // Kept: the format prints the length and then a letter l.
  return HandOver(*value, "VM_ALLOCATE %ul (mhs1)\n", address, byteCount);
}

KernReturn server_HvMobileHelperCopyAppPreferenceValue(PortName /*port*/, wire::Text<256>& domain,
                                                       wire::Text<256>& key, wire::Address* address,
                                                       std::uint32_t* byteCount) {
  *address = 0;
  *byteCount = 0;
  const std::optional<std::string> domainText = TextOf(domain);
  const std::optional<std::string> keyText = TextOf(key);
  if (!domainText || !keyText) return KERN_FAILURE;
  auto& store = platform::Shared<PreferencesStore>();
  (void)store.synchronizeApp(*domainText);
  const std::optional<PropertyList> value = store.copyAppValue(*keyText, *domainText);
  if (!value) return KERN_SUCCESS;
  return HandOver(*value, "VM_ALLOCATE %ul (mhs2)\n", address, byteCount);
}
