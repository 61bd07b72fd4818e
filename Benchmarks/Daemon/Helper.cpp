// SPDX-License-Identifier: Apache-2.0
#include "Benchmarks/Daemon/Helper.h"

#include <fcntl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <filesystem>
#include <fstream>

#include "Helper/Shared/Interface/Connect.h"

namespace bench {
namespace {

/// The number behind `key` in a file of lines "key: number ...".
double FieldOf(const std::string& path, const std::string& key) {
  std::ifstream file(path);
  std::string line;
  while (std::getline(file, line)) {
    if (line.starts_with(key + ":")) return std::stod(line.substr(key.size() + 1));
  }
  return 0;
}

}  // namespace

Child Launch(const std::string& program, const FileDescriptor& service) {
  return Child(-1, [&] {
    Check(::dup2(service.get(), 3), "dup2");
    (void)::fcntl(3, F_SETFD, 0);
    const std::string process = "LISTEN_PID=" + std::to_string(::getpid());
    const std::string names = std::string("LISTEN_FDNAMES=") + wire::kServiceName;
    const std::array<const char*, 4> environment{process.c_str(), "LISTEN_FDS=1", names.c_str(),
                                                 nullptr};
    const std::array<const char*, 2> arguments{program.c_str(), nullptr};
    ::execve(program.c_str(), const_cast<char* const*>(arguments.data()),
             const_cast<char* const*>(environment.data()));
    Fail(program.c_str());
  });
}

Child StartLogDaemon(int processor) {
  const FileDescriptor socket = BindService("/dev/log");
  return Child(processor, [&] {
    std::array<std::byte, 4096> line;
    while (::recv(socket.get(), line.data(), line.size(), 0) >= 0) {
    }
  });
}

double MemoryOf(const Child& process) {
  return FieldOf("/proc/" + std::to_string(process.process()) + "/smaps_rollup", "Pss");
}

double SleepsOf(const Child& process) {
  double sleeps = 0;
  const std::string tasks = "/proc/" + std::to_string(process.process()) + "/task";
  for (const auto& task : std::filesystem::directory_iterator(tasks)) {
    sleeps += FieldOf(task.path() / "status", "voluntary_ctxt_switches");
  }
  return sleeps;
}

}  // namespace bench
