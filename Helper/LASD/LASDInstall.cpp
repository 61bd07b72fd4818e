// SPDX-License-Identifier: Apache-2.0
//
// The installation of one database: directory, download, the file beside its final place, the
// exchange, the record. Whenever the process ends in between, what stands under the final name is
// whole and at least as new as the recorded version, or absent.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <optional>
#include <system_error>

#include "Helper/LASD/HttpDownloader.h"
#include "Helper/LASD/LASDNotification.h"
#include "Helper/LASD/LASDUpdater.h"
#include "Helper/LASD/VersionDictionary.h"
#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/PreferencesStore.h"
#include "Helper/Platform/SystemLog.h"

using platform::FileDescriptor;
using platform::Log;
using platform::LogPriority;
using platform::PropertyList;

namespace {

constexpr mode_t kDirectoryMode = 0755;

std::string ErrorText(int error) { return std::generic_category().message(error); }

/// The name under which the content of `url` is installed: what stands behind the last slash, up to
/// the first ".gz". None without a slash. It has no slash, so that of all names only "", "." and
/// ".." mean something else than a file of the directory: those are directories that are not empty
/// and cannot be removed to make room.
std::optional<std::string> FileNameOf(const std::string& url) {
  const std::size_t slash = url.rfind('/');
  if (slash == std::string::npos) return std::nullopt;
  const std::string name = url.substr(slash + 1);
  return name.substr(0, name.find(".gz"));
}

/// Waits until what stands at `path` is on the disk. `kind` tells what that may be: O_NOFOLLOW, no
/// link; O_DIRECTORY, a directory. A FIFO is not waited for.
bool Synchronize(const std::string& path, int kind) {
  const FileDescriptor file(
      ::open(path.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC | kind));
  return file && ::fsync(file.get()) == 0;
}

/// Gunzips what was downloaded to `path`, where nothing stands or a file of an earlier attempt.
bool WriteDatabase(const HttpDownloader& downloader, const std::string& path) {
  Log(LogPriority::kNotice, "uncompressing to %s\n", path.c_str());
  // A link or a FIFO that stands there would not be opened, nor a file with a second name. What
  // cannot be removed, a directory, cannot be opened for writing either.
  (void)::unlink(path.c_str());
  if (downloader.uncompressTo(path) && Synchronize(path, O_NOFOLLOW)) return true;
  Log(LogPriority::kNotice, "Failed to commit the data to file for %s\n", path.c_str());
  return false;
}

/// Puts the file at `temporaryPath` in the place of the one at `finalPath`.
///
/// Kept: the old file goes before the new one comes. Whoever looks in between finds none, and if
/// the process ends there, none is there until the next update.
bool Exchange(const std::string& temporaryPath, const std::string& finalPath) {
  struct stat status {};
  if (::stat(finalPath.c_str(), &status) == 0) {
    if (std::remove(finalPath.c_str()) != 0) {
      Log(LogPriority::kNotice, "Failed to remove the previous download at location %s\n",
          finalPath.c_str());
      return false;
    }
    Log(LogPriority::kNotice, "Removed old database %s\n", finalPath.c_str());
  }
  Log(LogPriority::kNotice, "Moving %s to %s\n", temporaryPath.c_str(), finalPath.c_str());
  if (std::rename(temporaryPath.c_str(), finalPath.c_str()) == 0) return true;
  const std::string reason = ErrorText(errno);
  Log(LogPriority::kNotice, "Could not rename %s to %s: %s\n", temporaryPath.c_str(),
      finalPath.c_str(), reason.c_str());
  return false;
}

}  // namespace

void LASDUpdater::updateDatabase(LASDDatabaseType type) {
  const auto entry = versionTable_.find(type);
  if (entry == versionTable_.end()) {
    Log(LogPriority::kNotice, "Could not find %s database URL", typeName(type));
    return;
  }
  const std::string* url = entry->second ? TextAt(*entry->second, kLASDContentURLKey) : nullptr;
  if (!url || url->empty()) {
    Log(LogPriority::kNotice, "URL for %s database is empty\n", typeName(type));
    return;
  }
  const bool installed = installDatabase(*url, type);
  sendNotification(makeNotification(
      installed ? LASDNotificationKind::kUpdateAvailable : LASDNotificationKind::kUpdateFailed,
      type));
}

bool LASDUpdater::installDatabase(const std::string& url, LASDDatabaseType type) {
  if (!makeDirectory()) return false;
  HttpDownloader downloader;
  if (!downloader.fetch(url, /*wifiOnly=*/true)) {
    Log(LogPriority::kNotice,
        "cannot download file %s. Either Wifi is turned OFF or not Wifi attached\n", url.c_str());
    return false;
  }
  const std::optional<std::string> name = FileNameOf(url);
  if (!name) return false;
  const std::string finalPath = directory_ + "/" + *name;
  const std::string temporaryPath = finalPath + ".tmp";
  if (!WriteDatabase(downloader, temporaryPath) || !Exchange(temporaryPath, finalPath))
    return false;
  // The file's name, and that of a new directory, are on the disk before the record is: a power cut
  // may not leave a record without its file.
  return Synchronize(directory_, O_DIRECTORY) && Synchronize(directory_ + "/..", O_DIRECTORY) &&
         record(type);
}

bool LASDUpdater::makeDirectory() const {
  struct stat status {};
  const bool exists = ::stat(directory_.c_str(), &status) == 0;
  // Kept: the one bit is looked at, which sockets and block devices have too; nothing can be
  // written below those.
  const bool isDirectory = (status.st_mode & S_IFDIR) != 0;
  if (exists ? isDirectory : errno != ENOENT) return true;
  if (::mkdir(directory_.c_str(), kDirectoryMode) == 0) return true;
  const std::string reason = ErrorText(errno);
  Log(LogPriority::kNotice, "Cannot create %s errno set to %s\n", directory_.c_str(),
      reason.c_str());
  return false;
}

bool LASDUpdater::record(LASDDatabaseType type) const {
  const char* name = typeName(type);
  if (std::find(kLASDTypesInOrder.begin(), kLASDTypesInOrder.end(), type) ==
      kLASDTypesInOrder.end()) {
    return false;
  }
  const auto entry = versionTable_.find(type);
  const std::optional<PropertyList> version =
      entry == versionTable_.end() ? std::nullopt : entry->second;
  const platform::PreferenceDomain domain{.identifier = kLASDDomain};
  auto& store = platform::Shared<platform::PreferencesStore>();
  store.setValue(name, version, domain);
  if (!store.synchronize(domain)) return false;
  const std::string* text = version ? TextAt(*version, kLASDVersionKey) : nullptr;
  Log(LogPriority::kNotice, "Downloaded %s database version %s successfully\n", name,
      text ? text->c_str() : "");
  return true;
}
