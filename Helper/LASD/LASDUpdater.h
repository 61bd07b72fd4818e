// SPDX-License-Identifier: Apache-2.0
//
// Keeps the handset's LASD databases current: on request it compares the versions that were
// recorded at the last installs with the server's manifest, installs what differs, and tells the
// telephony daemon. One per process, made before main(). The version table belongs to the updater's
// serial queue "LASDUpdater" and has no lock.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>

#include "Helper/Platform/PropertyList.h"
#include "Helper/Platform/vlu/SharedSynchronizable.h"
#include "Helper/Shared/Interface/LASD.h"
#include "Helper/Shared/Server/HelperServerUtils.h"

/// https, the host that the build names, "/1/v3/lasd.plist".
extern const char* const kLASDManifestURL;

class LASDUpdater : public vlu::SharedSynchronizable<LASDUpdater> {
 public:
  /// Per type its version dictionary now in force: the recorded one, or the manifest's once an
  /// update is due; none where there is no dictionary.
  using VersionTable = std::map<LASDDatabaseType, std::optional<platform::PropertyList>>;

  /// What loadVersions() answers when the manifest could not be fetched.
  static constexpr std::uint32_t kFetchFailed = 0xFFFFFFFF;

  /// `directory` holds the database files; it is made, in an existing folder, when missing.
  explicit LASDUpdater(std::string directory = kLASDDirectory);

  /// Starts a check of the types in `mask` and returns; other bits select nothing. The check holds
  /// a work token of `server` until it has ended. Any thread that may ask the server for one. A
  /// null server has no tokens to give: the check runs all the same, and an idle exit may end it.
  void checkForUpdates(HelperServer* server, std::uint32_t mask);

  // The steps of a check, on the queue.

  /// Local: reads the recorded versions of the types in `mask` from the preference domain `source`
  /// into the table; answers 0. Else: fetches the manifest at the URL `source` and enters its
  /// dictionaries for the types of `mask` that are in the table and not up to date. Answers the
  /// mask of those; 0 also when the manifest is no dictionary; kFetchFailed without one.
  [[nodiscard]] std::uint32_t loadVersions(const std::string& source, bool isLocal,
                                           std::uint32_t mask);

  /// Whether the version that `manifest` (may be null) gives for `type` equals the table's. A
  /// higher one counts no more than a lower one, so that the server can roll a database back.
  [[nodiscard]] bool isUpToDate(const platform::PropertyList* manifest, LASDDatabaseType type);

  /// Installs the database of `type` from its table entry's "ContentURL" and sends the notification
  /// of the outcome. Without an entry or URL there is one line in the log and no notification.
  void updateDatabase(LASDDatabaseType type);

  /// Downloads `url` over Wi-Fi, gunzips it beside its final place, puts it there and records the
  /// table's dictionary of `type`. True when all of that is done and on the disk. False, with a
  /// line in the log where the step has one: the last step that succeeded stays in effect. Nothing
  /// outside the directory is touched, whatever the URL.
  [[nodiscard]] bool installDatabase(const std::string& url, LASDDatabaseType type);

  [[nodiscard]] const VersionTable& versionTable() const { return versionTable_; }

 private:
  void runCycle(HelperServer* server, std::uint32_t mask);
  void readRecordedVersions(const std::string& domain, std::uint32_t mask);
  [[nodiscard]] std::uint32_t readManifest(const std::string& url, std::uint32_t mask);
  [[nodiscard]] bool makeDirectory() const;
  [[nodiscard]] bool record(LASDDatabaseType type) const;

  const std::string directory_;
  VersionTable versionTable_;
};

/// The updater of the process. Kept: its destruction at exit is left to its queue and not waited
/// for.
extern const std::shared_ptr<LASDUpdater> lasdUpdater;
