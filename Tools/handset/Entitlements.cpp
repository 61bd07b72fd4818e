// SPDX-License-Identifier: Apache-2.0
//
// Writing entitlement property lists and installing what they name. One thread, no lock.
#include "Tools/handset/Entitlements.h"

#include <sys/stat.h>

#include <algorithm>
#include <cstdio>

#include "Tools/handset/Failure.h"
#include "Tools/handset/Files.h"
#include "Tools/handset/Options.h"
#include "Tools/handset/Root.h"
#include "Tools/handset/UserDatabase.h"

namespace handset {
namespace {

constexpr std::string_view kTrue = "<true/>";

std::string XmlText(std::string_view text) {
  std::string out;
  for (const char c : text) {
    if (c == '&') {
      out += "&amp;";
    } else if (c == '<') {
      out += "&lt;";
    } else if (c == '>') {
      out += "&gt;";
    } else {
      out += c;
    }
  }
  return out;
}

bool IsNumber(std::string_view text) {
  return !text.empty() &&
         std::all_of(text.begin(), text.end(), [](char c) { return c >= '0' && c <= '9'; });
}

/// Options may stand before, between and after the two positional arguments.
struct EntitleRequest {
  std::vector<std::string> positional;
  EntitlementValues values;
  bool isChecked = true;
};

EntitleRequest ParseEntitle(const std::vector<std::string>& arguments) {
  EntitleRequest request;
  std::vector<std::string> left = arguments;
  while (!left.empty()) {
    OptionReader reader(left);
    while (const auto option = reader.nextOption()) {
      if (*option == "--name") {
        request.values.emplace_back(reader.value(), kTrue);
      } else if (*option == "--value") {
        if (request.values.empty()) request.values.emplace_back(kDefaultEntitlement, kTrue);
        request.values.back().second = reader.value();
      } else if (*option == "--unchecked") {
        request.isChecked = false;
      } else {
        RefuseUsage("unknown option " + *option);
      }
    }
    left = reader.rest();
    if (left.empty()) break;
    request.positional.push_back(left.front());
    left.erase(left.begin());
  }
  if (request.values.empty()) request.values.emplace_back(kDefaultEntitlement, kTrue);
  return request;
}

}  // namespace

std::vector<std::string> EntitlementDirectories() {
  std::vector<std::string> directories;
  std::string_view list = HALVEC_ENTITLEMENT_DIRECTORIES;
  while (!list.empty()) {
    const std::size_t end = std::min(list.find(':'), list.size());
    if (end > 0) directories.emplace_back(list.substr(0, end));
    list.remove_prefix(std::min(end + 1, list.size()));
  }
  return directories;
}

std::string EntitlementPropertyList(const std::string& executable, const std::string& user,
                                    const EntitlementValues& values) {
  std::string text =
      "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n<dict>\n";
  const auto add = [&text](const auto&... parts) { (text.append(parts), ...); };
  const char* kind = IsNumber(user) ? "integer>" : "string>";
  add("  <key>Executable</key>\n  <string>", XmlText(executable), "</string>\n");
  add("  <key>User</key>\n  <", kind, XmlText(user), "</", kind, "\n");
  add("  <key>Entitlements</key>\n  <dict>\n");
  for (const auto& [name, value] : values) {
    add("    <key>", XmlText(name), "</key>\n    ", value, "\n");
  }
  add("  </dict>\n</dict>\n</plist>\n");
  return text;
}

std::string EntitlementFileName(const std::string& executable) {
  std::string name;
  for (const char c : executable.substr(executable.starts_with('/') ? 1 : 0)) {
    if (c == '%') {
      name += "%25";
    } else if (c == '/') {
      name += "%2F";
    } else {
      name += c;
    }
  }
  return name + ".plist";
}

void RequireEntitleable(const std::string& path) {
  const auto refuse = [&path](const std::string& item, const char* reason) {
    std::string text = path;
    text.append(" cannot be entitled: ").append(item).append(reason);
    throw Failure(text.append("; `handset install` puts a copy where it can be"));
  };
  if (!path.starts_with('/')) refuse(path, " is not an absolute path");
  for (std::size_t end = 0; end != std::string::npos;) {
    end = path.find('/', end + 1);
    const std::string item = path.substr(0, end);
    struct stat facts {};
    if (lstat(item.c_str(), &facts) != 0) throw Failure::FromErrno(item);
    if (S_ISLNK(facts.st_mode)) refuse(item, " is a symbolic link");
    if (facts.st_uid != 0) refuse(item, " is not root's");
    if ((facts.st_mode & (S_IWGRP | S_IWOTH)) != 0) refuse(item, " is writable by others");
    const bool isLast = end == std::string::npos;
    if (isLast && (!S_ISREG(facts.st_mode) || (facts.st_mode & 0111U) == 0)) {
      refuse(item, " is not an executable file");
    }
  }
}

void Entitle(const std::vector<std::string>& arguments) {
  const EntitleRequest request = ParseEntitle(arguments);
  if (request.positional.size() != 2) RefuseUsage("entitle needs an executable and a user");
  const std::string& executable = request.positional[0];
  const std::string& user = request.positional[1];
  if (request.isChecked) {
    RequireEntitleable(executable);
    static_cast<void>(RequireUser(user));  // Only whether there is one matters here.
  }
  ReplaceFile(EntitlementDirectories().front() + "/" + EntitlementFileName(executable),
              EntitlementPropertyList(executable, user, request.values), 0644);
}

void Install(const std::vector<std::string>& arguments) {
  if (arguments.empty() || arguments.size() > 2) RefuseUsage("install needs a file and a name");
  const std::string name = arguments.size() == 2 ? arguments[1] : LastComponent(arguments[0]);
  if (name.empty() || name.find('/') != std::string::npos) {
    RefuseUsage("install needs a name without a slash");
  }
  const platform::FileDescriptor source = OpenExecutable(arguments[0], "install");
  const std::string path = std::string(kInstallDirectory) + "/" + name;
  CopyExecutable(source.get(), path);
  std::printf("%s\n", path.c_str());
}

}  // namespace handset
