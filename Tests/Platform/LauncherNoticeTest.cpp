// SPDX-License-Identifier: Apache-2.0
//
// The readiness message, against a launcher's socket of the test's own.
#include "Helper/Platform/Linux/LauncherNotice.h"

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstddef>
#include <cstdlib>
#include <string>

#include "Helper/Platform/FileDescriptor.h"

namespace platform {
namespace {

/// A launcher that listens at `name` and has said so in NOTIFY_SOCKET.
class Launcher {
 public:
  explicit Launcher(const std::string& name) : socket_(::socket(AF_UNIX, SOCK_DGRAM, 0)) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    name.copy(static_cast<char*>(address.sun_path), name.size());
    if (name.front() == '@') address.sun_path[0] = '\0';
    EXPECT_EQ(::bind(socket_.get(), reinterpret_cast<const sockaddr*>(&address),
                     static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + name.size())),
              0);
    ::setenv("NOTIFY_SOCKET", name.c_str(), 1);
  }
  ~Launcher() { ::unsetenv("NOTIFY_SOCKET"); }
  Launcher(const Launcher&) = delete;
  Launcher& operator=(const Launcher&) = delete;

  /// The next message; empty when there is none.
  [[nodiscard]] std::string heard() const {
    std::string text(64, '\0');
    const ssize_t count = ::recv(socket_.get(), text.data(), text.size(), MSG_DONTWAIT);
    text.resize(count > 0 ? static_cast<std::size_t>(count) : 0);
    return text;
  }

 private:
  FileDescriptor socket_;
};

TEST(LauncherNotice, IsOneMessageToTheSocketWhosePathTheLauncherNames) {
  const std::string path = testing::TempDir() + "notice-" + std::to_string(::getpid());
  const Launcher launcher(path);
  TellLauncherReady();
  EXPECT_EQ(launcher.heard(), "READY=1");
  EXPECT_EQ(launcher.heard(), "");
  ::unlink(path.c_str());
}

TEST(LauncherNotice, ReachesAnAbstractSocket) {
  const Launcher launcher("@halvec-notice-" + std::to_string(::getpid()));
  TellLauncherReady();
  EXPECT_EQ(launcher.heard(), "READY=1");
}

TEST(LauncherNotice, GoesNowhereWithoutALauncherOrWithANameThatIsNone) {
  const Launcher launcher("@halvec-notice-" + std::to_string(::getpid()));
  ::unsetenv("NOTIFY_SOCKET");
  TellLauncherReady();
  for (const std::string& name :
       {std::string(), std::string("/"), std::string("vsock:2:1"), "/" + std::string(200, 'x')}) {
    ::setenv("NOTIFY_SOCKET", name.c_str(), 1);
    TellLauncherReady();
  }
  EXPECT_EQ(launcher.heard(), "");
}

}  // namespace
}  // namespace platform
