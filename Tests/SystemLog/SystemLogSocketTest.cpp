// SPDX-License-Identifier: Apache-2.0
//
// The system log's sender against a log daemon's socket made by the test: the bytes of a line, and
// what happens when the daemon does not read, goes away or comes back. One thread.
#include "Helper/Platform/Linux/SystemLogSocket.h"
#include "Helper/Platform/UnixSocketAddress.h"

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <unistd.h>

#include <ctime>
#include <filesystem>
#include <optional>
#include <utility>

#include "Tests/Fakes/FakeSystemLog.h"

namespace {

using platform::FileDescriptor;
using platform::LogPriority;
using platform::SystemLogSocket;
namespace fs = std::filesystem;

// The local time as a line carries it.
std::string Stamp() {
  const std::time_t now = std::time(nullptr);
  std::tm local{};
  ::localtime_r(&now, &local);
  char text[32];
  return {text, std::strftime(text, sizeof text, "%b %e %H:%M:%S", &local)};
}

class SystemLogSocketTest : public testing::Test {
 protected:
  void SetUp() override {
    std::string name = (fs::temp_directory_path() / "system-log-XXXXXX").string();
    ASSERT_NE(::mkdtemp(name.data()), nullptr);
    folder_ = name;
    path = folder_ / "log";
  }
  void TearDown() override {
    std::error_code ignored;
    fs::remove_all(folder_, ignored);
  }

  // A log daemon that listens under `path`.
  [[nodiscard]] FileDescriptor daemon() const {
    FileDescriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    const platform::UnixSocketAddress address(path.string());
    fs::remove(path);
    EXPECT_EQ(::bind(socket.get(), address.get(), address.size()), 0);
    return socket;
  }

  // The next line that has arrived; none when there is none.
  [[nodiscard]] static std::optional<std::string> take(const FileDescriptor& daemon) {
    std::string line(1 << 20, '\0');
    const ssize_t length = ::recv(daemon.get(), line.data(), line.size(), MSG_DONTWAIT);
    if (length < 0) return std::nullopt;
    line.resize(static_cast<std::size_t>(length));
    return line;
  }

  // What stands behind the time stamp and the process id.
  [[nodiscard]] static std::string textOf(const std::optional<std::string>& line) {
    return line ? line->substr(line->find(": ") + 2) : "no line";
  }

  fs::path path;

 private:
  fs::path folder_;
};

TEST_F(SystemLogSocketTest, SendsPriorityTimeNameAndProcess) {
  const FileDescriptor log = daemon();
  SystemLogSocket sender(path);
  const std::string before = Stamp();
  sender.write(LogPriority::kError, "VM_ALLOCATE 12l (mhs1)\n");
  sender.write(LogPriority::kNotice, "");
  sender.write(LogPriority::kInfo, "  blanks  ");
  const std::string after = Stamp();
  const std::string sent = " HalvecMobileHelper[" + std::to_string(::getpid()) + "]: ";
  for (const auto& [priority, text] : {std::pair{"<27>", "VM_ALLOCATE 12l (mhs1)\n"},
                                       std::pair{"<29>", ""}, std::pair{"<30>", "  blanks  "}}) {
    const std::string line = take(log).value_or("no line");
    const std::string rest = sent + text;
    EXPECT_TRUE(line == std::string(priority).append(before).append(rest) ||
                line == std::string(priority).append(after).append(rest))
        << line;
  }
  EXPECT_FALSE(take(log));
}

TEST_F(SystemLogSocketTest, SendsLongTextsWholeAndTheLongestCut) {
  const FileDescriptor log = daemon();
  SystemLogSocket sender(path);
  const std::string text(100'000, 'x');
  sender.write(LogPriority::kError, text);
  EXPECT_EQ(textOf(take(log)), text);
  std::string longer;
  longer.resize(10'000'000, 'y');
  sender.write(LogPriority::kError, longer);
  EXPECT_EQ(textOf(take(log)), std::string(65'536, 'y'));
}

TEST_F(SystemLogSocketTest, LosesLinesWithoutADaemonAndFindsItWhenItComes) {
  SystemLogSocket sender(path);
  sender.write(LogPriority::kError, "lost");
  const FileDescriptor log = daemon();
  sender.write(LogPriority::kError, "found");
  EXPECT_EQ(textOf(take(log)), "found");
}

TEST_F(SystemLogSocketTest, FindsARestartedDaemonWithoutLosingALine) {
  SystemLogSocket sender(path);
  FileDescriptor log = daemon();
  sender.write(LogPriority::kError, "first");
  EXPECT_EQ(textOf(take(log)), "first");
  log.reset();
  log = daemon();
  sender.write(LogPriority::kError, "second");
  EXPECT_EQ(textOf(take(log)), "second");
}

TEST_F(SystemLogSocketTest, DropsLinesWhileTheDaemonDoesNotReadAndGoesOnAfterwards) {
  const FileDescriptor log = daemon();
  SystemLogSocket sender(path);
  // Far more than any queue holds; a sender that waited for each would not come to an end.
  constexpr int kLines = 20'000;
  for (int i = 0; i < kLines; ++i) sender.write(LogPriority::kError, std::to_string(i));
  int arrived = 0;
  while (const auto line = take(log)) EXPECT_EQ(textOf(line), std::to_string(arrived++));
  EXPECT_GT(arrived, 0);
  EXPECT_LT(arrived, kLines);
  sender.write(LogPriority::kError, "read again");
  EXPECT_EQ(textOf(take(log)), "read again");
}

TEST(Log, FormatsTextsOfAnyLength) {
  fakes::FakeSystemLog log;
  const platform::ScopedReplacement<platform::SystemLog> replacement(log);
  platform::Log(LogPriority::kError, "VM_ALLOCATE %ul (mhs1)\n", 12U);
  platform::Log(LogPriority::kNotice, "plain");
  const auto lines = log.takeLines();
  ASSERT_EQ(lines.size(), 2U);
  EXPECT_EQ(lines[0],
            (fakes::FakeSystemLog::Line{LogPriority::kError, "VM_ALLOCATE 12l (mhs1)\n"}));
  EXPECT_EQ(lines[1], (fakes::FakeSystemLog::Line{LogPriority::kNotice, "plain"}));
  for (const std::size_t length : {0, 1, 510, 511, 512, 513, 1024, 100'000}) {
    const std::string text(length, 'x');
    platform::Log(LogPriority::kInfo, "%s", text.c_str());
    EXPECT_EQ(log.takeLines().at(0).second, text);
  }
}

}  // namespace
