// SPDX-License-Identifier: Apache-2.0
#include "Benchmarks/Daemon/PrivateSystem.h"

#include <sched.h>
#include <sys/mount.h>
#include <sys/stat.h>

#include <cerrno>
#include <filesystem>
#include <fstream>

#include "Benchmarks/Support/Measure.h"
#include "Helper/Shared/Interface/Connect.h"

namespace bench {
namespace {

void MountAt(const char* source, const std::string& target, const char* type, unsigned long flags,
             const char* options) {
  Check(::mount(source, target.c_str(), type, flags, options), target.c_str());
}

/// An empty /dev with the few devices that the programs open, so that /dev/log can be made there.
void ReplaceDevices() {
  const std::string old = "/run/dev";
  Check(::mkdir(old.c_str(), S_IRWXU), "mkdir");
  MountAt("/dev", old, nullptr, MS_BIND | MS_REC, nullptr);
  MountAt("benchmark", "/dev", "tmpfs", MS_NOEXEC, "mode=0755");
  for (const char* name : {"/null", "/zero", "/random", "/urandom"}) {
    std::ofstream(std::string("/dev") + name).close();
    MountAt((old + name).c_str(), std::string("/dev") + name, nullptr, MS_BIND, nullptr);
  }
}

void Entitle(const std::string& program) {
  const std::string folder = "/etc/halvec/entitlements.d";
  std::filesystem::create_directories(folder);
  std::ofstream(folder + "/benchmark.plist")
      << "<?xml version=\"1.0\" encoding=\"UTF-8\"?><plist version=\"1.0\"><dict>"
         "<key>Executable</key><string>"
      << program
      << "</string><key>User</key><string>root</string><key>Entitlements</key><dict><key>"
      << wire::kRequiredEntitlement << "</key><true/></dict></dict></plist>\n";
}

}  // namespace

void EnterPrivateSystem(const std::string& home, const std::string& program,
                        const std::string& helper, const std::string& trivial) {
  namespace files = std::filesystem;
  Check(::unshare(CLONE_NEWNS), "unshare (root is needed)");
  MountAt("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr);
  // The programs may lie in a folder that the mounts below cover.
  MountAt("benchmark", "/run", "tmpfs", 0, "mode=0755");
  const files::path folder = kProgramFolder;
  for (const char* name : {"", "/upper", "/work"})
    files::create_directories(folder.native() + name);
  files::copy_file(program, folder / "DaemonBenchmark");
  files::copy_file(helper, folder / "HalvecMobileHelper");
  files::copy_file(trivial, folder / "TrivialServer");
  MountAt("benchmark", "/etc", "overlay", 0,
          "lowerdir=/etc,upperdir=/run/halvec-benchmark/upper,"
          "workdir=/run/halvec-benchmark/work");
  MountAt(home.c_str(), "/root", nullptr, MS_BIND, nullptr);
  // Every handset has this user; a machine without it would ask every source of users there is.
  std::ofstream("/etc/passwd", std::ios::app) << "mobile:x:501:501::/var/mobile:/bin/false\n";
  ReplaceDevices();
  Entitle(folder / "DaemonBenchmark");
}

}  // namespace bench
