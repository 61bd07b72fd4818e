// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/EntitlementFiles.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cstddef>
#include <span>
#include <string_view>
#include <utility>

#include "Helper/Platform/Linux/ProcessFile.h"
#include "Helper/Platform/Linux/TrustedPath.h"
#include "Helper/Platform/ProcessIdentity.h"
#include "Helper/Platform/UserDatabase.h"

namespace platform {
namespace {

constexpr uid_t kOverflowUser = 65534;
constexpr std::string_view kExtension = ".plist";
/// Far more than any list of entitlements needs.
constexpr off_t kMaxFileSize = 1024 * 1024;

/// Names of a folder's entitlement files, sorted, so that the answer does not depend on the order
/// in which the file system gives them.
std::vector<std::string> FileNames(int folder) {
  std::vector<std::string> names;
  DIR* stream = ::fdopendir(::openat(folder, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!stream) return names;
  while (const dirent* entry = ::readdir(stream)) {  // NOLINT(concurrency-mt-unsafe): own stream
    const std::string_view name(static_cast<const char*>(entry->d_name));
    if (name.ends_with(kExtension) && !name.starts_with('.')) names.emplace_back(name);
  }
  ::closedir(stream);
  std::sort(names.begin(), names.end());
  return names;
}

std::optional<PropertyList> ReadPropertyList(int folder, const std::string& name) {
  const FileDescriptor file = OpenTrustedAt(folder, name.c_str(), O_RDONLY | O_NONBLOCK);
  struct stat status {};
  if (!file || ::fstat(file.get(), &status) != 0 || !S_ISREG(status.st_mode)) return std::nullopt;
  if (status.st_size > kMaxFileSize) return std::nullopt;
  std::vector<std::byte> content(static_cast<std::size_t>(status.st_size));
  std::size_t done = 0;
  while (done < content.size()) {
    const ssize_t count = ::read(file.get(), content.data() + done, content.size() - done);
    if (count <= 0) return std::nullopt;
    done += static_cast<std::size_t>(count);
  }
  return ParsePropertyList(content);
}

std::optional<uid_t> UserOf(const PropertyList* value) {
  if (!value) return std::nullopt;
  if (const auto number = value->integer()) {
    return std::in_range<uid_t>(*number) ? std::optional(static_cast<uid_t>(*number))
                                         : std::nullopt;
  }
  const std::string* name = value->string();
  if (!name) return std::nullopt;
  const auto ids = Shared<UserDatabase>().ids(name->c_str());
  return ids ? std::optional(ids->user) : std::nullopt;
}

/// Whether `path` is, now and trusted, the very file that `running` is.
bool IsExecutable(const std::string& path, const struct stat& running) {
  const FileDescriptor file = OpenTrusted(path, O_PATH);
  struct stat status {};
  return file && ::fstat(file.get(), &status) == 0 && S_ISREG(status.st_mode) &&
         status.st_dev == running.st_dev && status.st_ino == running.st_ino;
}

class Task final : public SecurityTask {
 public:
  Task(FileDescriptor pidfd, struct stat executable, uid_t user,
       const std::vector<std::string>& directories)
      : pidfd_(std::move(pidfd)), executable_(executable), user_(user), directories_(directories) {}

  EntitlementAnswer copyValueForEntitlement(std::string_view name) override {
    EntitlementAnswer answer{.value = std::nullopt, .error = true};
    for (const std::string& directory : directories_) {
      const FileDescriptor folder = OpenTrusted(directory, O_PATH | O_DIRECTORY);
      if (!folder) continue;
      for (const std::string& file : FileNames(folder.get())) {
        const std::optional<PropertyList> list = ReadPropertyList(folder.get(), file);
        if (!list || !names(*list)) continue;
        const PropertyList* entitlements = list->find("Entitlements");
        const PropertyList* value = entitlements ? entitlements->find(name) : nullptr;
        if (value) answer.value = *value;
        // What was read describes the caller only if it was alive all the while: its process id
        // could be somebody else's by now.
        answer.error = HasExited(pidfd_.get());
        return answer;
      }
    }
    return answer;
  }

 private:
  [[nodiscard]] bool names(const PropertyList& list) const {
    const PropertyList* path = list.find("Executable");
    // The user at the moment of sending: a caller that runs another program after it sent its
    // message does not gain that program's rights.
    return path && path->string() && UserOf(list.find("User")) == user_ &&
           IsExecutable(*path->string(), executable_);
  }

  const FileDescriptor pidfd_;
  const struct stat executable_;
  const uid_t user_;
  const std::vector<std::string>& directories_;
};

std::vector<std::string> Split(std::string_view text) {
  std::vector<std::string> parts;
  while (!text.empty()) {
    const std::size_t end = std::min(text.find(':'), text.size());
    if (end > 0) parts.emplace_back(text.substr(0, end));
    text.remove_prefix(std::min(end + 1, text.size()));
  }
  return parts;
}

}  // namespace

EntitlementFiles::EntitlementFiles(std::vector<std::string> directories)
    : directories_(std::move(directories)) {}

std::unique_ptr<SecurityTask> EntitlementFiles::createTask(const wire::AuditToken& token) {
  const pid_t process = AuditTokenProcess(token);
  const uid_t user = token.words[1];
  if (process <= 0 || user == kOverflowUser) return nullptr;
  FileDescriptor pidfd = OpenPidfd(process);
  if (!pidfd || ProcessVersion(pidfd.get(), process) != AuditTokenProcessVersion(token)) {
    return nullptr;
  }
  // O_PATH through the link: the running file itself, whatever stands under its name now.
  const FileDescriptor executable = OpenProcessFile(process, "exe", O_PATH);
  struct stat status {};
  if (!executable || ::fstat(executable.get(), &status) != 0) return nullptr;
  return std::make_unique<Task>(std::move(pidfd), status, user, directories_);
}

template <>
CallerSecurity& DefaultProvider<CallerSecurity>() {
  static auto* provider = new EntitlementFiles(Split(HALVEC_ENTITLEMENT_DIRECTORIES));
  return *provider;
}

}  // namespace platform
