// SPDX-License-Identifier: Apache-2.0
//
// The journal's sender against a socket made by the test: the bytes of a line. One thread, and a
// queue's.
#include "Helper/Platform/Linux/SystemLogJournal.h"
#include "Helper/Platform/UnixSocketAddress.h"

#include <gtest/gtest.h>
#include <sys/socket.h>

#include <filesystem>

#include "Helper/Platform/CurrentWork.h"
#include "Helper/Platform/WorkQueue.h"

namespace {

using platform::LogPriority;

class Journal : public testing::Test {
 protected:
  void SetUp() override {
    std::string name = (std::filesystem::temp_directory_path() / "journal-XXXXXX").string();
    ASSERT_NE(::mkdtemp(name.data()), nullptr);
    folder = name;
    daemon.reset(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    const platform::UnixSocketAddress address(path());
    ASSERT_EQ(::bind(daemon.get(), address.get(), address.size()), 0);
  }
  void TearDown() override { std::filesystem::remove_all(folder); }

  [[nodiscard]] std::string path() const { return (folder / "socket").string(); }

  [[nodiscard]] std::string take() const {
    std::string line(1 << 20, '\0');
    const ssize_t length = ::recv(daemon.get(), line.data(), line.size(), MSG_DONTWAIT);
    line.resize(length < 0 ? 0 : static_cast<std::size_t>(length));
    return line;
  }

  std::filesystem::path folder;
  platform::FileDescriptor daemon;
};

using namespace std::string_literals;
const std::string kHead = "SYSLOG_FACILITY=3\nSYSLOG_IDENTIFIER=HalvecMobileHelper\n";

TEST_F(Journal, ReceivesTheTextUnchangedLineEndsIncluded) {
  platform::SystemLogJournal log(path());
  log.write(LogPriority::kError, "one \n\ntwo \n");
  EXPECT_EQ(take(), "PRIORITY=3\n" + kHead + "MESSAGE\n\x0b\0\0\0\0\0\0\0one \n\ntwo \n\n"s);
}

TEST_F(Journal, LearnsWhichRequestOfWhomALineBelongsTo) {
  platform::SystemLogJournal log(path());
  platform::CurrentWork& work = platform::WorkOfThisThread();
  work = {.queue = nullptr, .requestId = 8683563, .process = 77, .user = 501};
  log.write(LogPriority::kNotice, "x");
  work = {};
  EXPECT_EQ(take(), "PRIORITY=5\n" + kHead +
                        "HALVEC_REQUEST=8683563\nHALVEC_CALLER_PID=77\nHALVEC_CALLER_UID=501\n"
                        "MESSAGE\n\x01\0\0\0\0\0\0\0x\n"s);
}

TEST_F(Journal, LearnsWhichQueueALineComesFrom) {
  platform::SystemLogJournal log(path());
  platform::WorkQueue queue("test.queue");
  queue.sync([&] { log.write(LogPriority::kInfo, ""); });
  EXPECT_EQ(take(),
            "PRIORITY=6\n" + kHead + "HALVEC_QUEUE=test.queue\nMESSAGE\n\0\0\0\0\0\0\0\0\n"s);
}

TEST_F(Journal, ReceivesTheBeginningOfATextThatIsTooLong) {
  platform::SystemLogJournal log(path());
  log.write(LogPriority::kError, std::string(1 << 20, 'x'));
  const std::string line = take();
  const std::string head = "PRIORITY=3\n" + kHead + "MESSAGE\n\0\0\x01\0\0\0\0\0"s;
  EXPECT_EQ(line.substr(0, head.size()), head);
  EXPECT_EQ(line.size(), head.size() + (1 << 16) + 1);
}

}  // namespace
