// SPDX-License-Identifier: Apache-2.0
//
// Which databases differ from the server's: the recorded versions, the manifest, the comparison.
#include <optional>
#include <span>
#include <utility>

#include "Helper/LASD/HttpDownloader.h"
#include "Helper/LASD/LASDUpdater.h"
#include "Helper/LASD/VersionDictionary.h"
#include "Helper/Platform/PreferencesStore.h"
#include "Helper/Platform/SystemLog.h"
#include "Helper/Platform/TextComparison.h"
#include "Helper/Platform/Utf8.h"

using platform::Log;
using platform::LogPriority;
using platform::PropertyList;

std::uint32_t LASDUpdater::loadVersions(const std::string& source, bool isLocal,
                                        std::uint32_t mask) {
  if (!isLocal) return readManifest(source, mask);
  Log(LogPriority::kNotice, "Reading local resource %s\n", source.c_str());
  if (platform::IsUtf8(source)) readRecordedVersions(source, mask);
  return 0;
}

void LASDUpdater::readRecordedVersions(const std::string& domain, std::uint32_t mask) {
  auto& store = platform::Shared<platform::PreferencesStore>();
  for (const LASDDatabaseType type : kLASDTypesInOrder) {
    if ((mask & BitOf(type)) == 0) continue;
    std::optional<PropertyList> recorded = store.copyValue(typeName(type), {.identifier = domain});
    if (recorded && !recorded->dictionary()) recorded.reset();
    versionTable_[type] = std::move(recorded);
  }
}

std::uint32_t LASDUpdater::readManifest(const std::string& url, std::uint32_t mask) {
  HttpDownloader downloader;
  if (!downloader.fetch(url, /*wifiOnly=*/true)) {
    Log(LogPriority::kNotice, "Could not fetch data from source %s\n", url.c_str());
    return kFetchFailed;
  }
  const auto manifest = platform::ParsePropertyList(std::as_bytes(std::span(downloader.body())));
  if (!manifest || !manifest->dictionary()) {
    Log(LogPriority::kNotice, "Could not create version dictionary from downloaded plist!\n");
    // Kept: an unreadable manifest counts as nothing to update, not as a failure.
    return 0;
  }
  std::uint32_t outdated = 0;
  for (auto& [type, entry] : versionTable_) {
    if ((mask & BitOf(type)) == 0 || isUpToDate(&*manifest, type)) continue;
    if (const PropertyList* server = DictionaryAt(*manifest, typeName(type))) {
      entry = *server;
      outdated |= BitOf(type);
    }
  }
  return outdated;
}

bool LASDUpdater::isUpToDate(const PropertyList* manifest, LASDDatabaseType type) {
  if (!manifest) return false;
  const char* name = typeName(type);
  const PropertyList* server = DictionaryAt(*manifest, name);
  if (!server) {
    // Kept: it is the server's entry that is missing, whatever the line says.
    Log(LogPriority::kNotice, "%s db is not present locally, update required\n", name);
    return false;
  }
  const std::string* serverVersion = TextAt(*server, kLASDVersionKey);
  const std::optional<PropertyList>& local = versionTable_[type];
  const std::string* localVersion = local ? TextAt(*local, kLASDVersionKey) : nullptr;
  const char* serverText = serverVersion ? serverVersion->c_str() : "";
  if (serverVersion && localVersion &&
      platform::EqualIgnoringCaseWithNumbers(*serverVersion, *localVersion)) {
    Log(LogPriority::kNotice, "%s version %s matches server version\n", name, serverText);
    return true;
  }
  if (localVersion) {
    Log(LogPriority::kNotice, "We have %s version %s, server has %s, update required\n", name,
        localVersion->c_str(), serverText);
  } else {
    // Kept, word for word.
    Log(LogPriority::kNotice,
        "We have don't have a previously downloaded %s database, server has %s, update required\n",
        name, serverText);
  }
  return false;
}
