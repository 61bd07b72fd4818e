// SPDX-License-Identifier: Apache-2.0
//
// What every caller-security provider must do, run on the fake and on the entitlement files; and
// what the files alone must refuse.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <csignal>
#include <filesystem>
#include <fstream>

#include "Helper/Platform/Linux/EntitlementFiles.h"
#include "Helper/Platform/ProcessIdentity.h"
#include "Tests/Fakes/FakeCallerSecurity.h"

namespace {

using namespace platform;
namespace fs = std::filesystem;

wire::AuditToken TokenOf(pid_t process, uid_t user) {
  wire::AuditToken token;
  token.words[1] = user;
  token.words[5] = static_cast<std::uint32_t>(process);
  token.words[7] = ProcessVersion(OpenPidfd(process).get(), process);
  return token;
}

/// A folder that only root can write to, with a program in it; empty where the test is not root.
class TrustedFolder {
 public:
  TrustedFolder() {
    if (::geteuid() != 0) return;
    std::array<char, 64> path{"/run/entitlement-test-XXXXXX"};
    if (!::mkdtemp(path.data())) return;
    path_ = path.data();
    fs::permissions(path_, fs::perms(0755));
    fs::create_directory(path_ / "list");
    fs::copy_file("/bin/sleep", program());
  }
  ~TrustedFolder() {
    if (!path_.empty()) fs::remove_all(path_);
  }
  [[nodiscard]] bool usable() const { return !path_.empty(); }
  [[nodiscard]] fs::path list() const { return path_ / "list"; }
  [[nodiscard]] fs::path program() const { return path_ / "program"; }
  void write(const std::string& name, const std::string& executable, const std::string& user,
             const std::string& entitlements) const {
    std::ofstream(list() / name) << "<plist version=\"1.0\"><dict><key>Executable</key><string>"
                                 << executable << "</string><key>User</key>" << user
                                 << "<key>Entitlements</key><dict>" << entitlements
                                 << "</dict></dict></plist>";
  }

 private:
  fs::path path_;
};

/// The program, running as `user`.
class Running {
 public:
  Running(const fs::path& program, uid_t user) {
    int ready[2];
    if (::pipe2(ready, O_CLOEXEC) != 0) ADD_FAILURE() << "pipe failed";
    process_ = ::fork();
    if (process_ == 0) {
      if (::setgid(user) != 0 || ::setuid(user) != 0) ::_exit(1);
      ::execl(program.c_str(), "program", "1000", nullptr);
      ::_exit(1);
    }
    ::close(ready[1]);
    char byte = 0;
    (void)!::read(ready[0], &byte, 1);  // ends when exec has closed the other side
    ::close(ready[0]);
  }
  ~Running() {
    ::kill(process_, SIGKILL);
    ::waitpid(process_, nullptr, 0);
  }
  [[nodiscard]] pid_t process() const { return process_; }

 private:
  pid_t process_ = 0;
};

constexpr uid_t kUser = 4711;
constexpr char kValues[] =
    "<key>yes</key><true/><key>no</key><false/><key>text</key><string>true</string>"
    "<key>number</key><integer>1</integer>";

struct Provider {
  virtual ~Provider() = default;
  [[nodiscard]] virtual bool usable() const = 0;
  [[nodiscard]] virtual CallerSecurity& security() = 0;
  [[nodiscard]] virtual wire::AuditToken caller() = 0;
};

struct FakeProvider final : Provider {
  FakeProvider() {
    fake.answer("yes", {.value = PropertyList(true)});
    fake.answer("no", {.value = PropertyList(false)});
    fake.answer("text", {.value = PropertyList("true")});
    fake.answer("number", {.value = PropertyList(1)});
  }
  [[nodiscard]] bool usable() const override { return true; }
  [[nodiscard]] CallerSecurity& security() override { return fake; }
  [[nodiscard]] wire::AuditToken caller() override { return TokenOf(::getpid(), ::getuid()); }
  fakes::FakeCallerSecurity fake;
};

struct FilesProvider final : Provider {
  FilesProvider() {
    if (!folder.usable()) return;
    folder.write("program.plist", folder.program(), "<integer>4711</integer>", kValues);
    running = std::make_unique<Running>(folder.program(), kUser);
  }
  [[nodiscard]] bool usable() const override { return folder.usable(); }
  [[nodiscard]] CallerSecurity& security() override { return files; }
  [[nodiscard]] wire::AuditToken caller() override { return TokenOf(running->process(), kUser); }
  TrustedFolder folder;
  EntitlementFiles files{{folder.list().string()}};
  std::unique_ptr<Running> running;
};

template <class T>
class CallerSecurityContract : public ::testing::Test {
 protected:
  void SetUp() override {
    if (!provider.usable()) GTEST_SKIP() << "needs root: entitlement files are root's";
  }
  EntitlementAnswer ask(std::string_view name) {
    const auto task = provider.security().createTask(provider.caller());
    EXPECT_TRUE(task);
    return task ? task->copyValueForEntitlement(name) : EntitlementAnswer{};
  }
  T provider;
};
using Providers = ::testing::Types<FakeProvider, FilesProvider>;
TYPED_TEST_SUITE(CallerSecurityContract, Providers);

TYPED_TEST(CallerSecurityContract, AnswersTheTypedValue) {
  EXPECT_EQ(this->ask("yes").value, PropertyList(true));
  EXPECT_EQ(this->ask("no").value, PropertyList(false));
  EXPECT_EQ(this->ask("text").value, PropertyList("true"));
  EXPECT_EQ(this->ask("number").value, PropertyList(1));
  EXPECT_FALSE(this->ask("yes").error);
}

TYPED_TEST(CallerSecurityContract, AnswersNoValueForAnEntitlementThatIsNotListed) {
  EXPECT_FALSE(this->ask("other").value);
}

class EntitlementFile : public ::testing::Test {
 protected:
  void SetUp() override {
    if (!folder.usable()) GTEST_SKIP() << "needs root: entitlement files are root's";
    folder.write("program.plist", folder.program(), "<integer>4711</integer>", kValues);
    running = std::make_unique<Running>(folder.program(), kUser);
  }
  /// Whether the running program is found entitled.
  bool entitled(uid_t userAtSend = kUser) {
    const auto task = files.createTask(TokenOf(running->process(), userAtSend));
    if (!task) return false;
    const EntitlementAnswer answer = task->copyValueForEntitlement("yes");
    return !answer.error && answer.value && answer.value->boolean() == true;
  }
  TrustedFolder folder;
  EntitlementFiles files{{folder.list().string()}};
  std::unique_ptr<Running> running;
};

TEST_F(EntitlementFile, EntitlesItsExecutableRunByItsUser) { EXPECT_TRUE(entitled()); }

TEST_F(EntitlementFile, EntitlesNobodyElse) {
  EXPECT_FALSE(entitled(kUser + 1)) << "the user at the moment of sending counts";
  running = std::make_unique<Running>("/bin/sleep", kUser);
  EXPECT_FALSE(entitled());
}

TEST_F(EntitlementFile, MayNameItsUser) {
  folder.write("program.plist", folder.program(), "<string>daemon</string>", kValues);
  running = std::make_unique<Running>(folder.program(), 1);
  EXPECT_TRUE(entitled(1));
  folder.write("program.plist", folder.program(), "<string>no-such-user</string>", kValues);
  EXPECT_FALSE(entitled(1));
}

TEST_F(EntitlementFile, ThatOthersCouldWriteCountsForNothing) {
  const fs::path file = folder.list() / "program.plist";
  fs::permissions(file, fs::perms(0664));
  EXPECT_FALSE(entitled());
  fs::permissions(file, fs::perms(0644));
  EXPECT_TRUE(entitled());
  ASSERT_EQ(::chown(file.c_str(), kUser, 0), 0);
  EXPECT_FALSE(entitled());
  ASSERT_EQ(::chown(file.c_str(), 0, 0), 0);
  fs::permissions(folder.list(), fs::perms(0777));
  EXPECT_FALSE(entitled());
}

TEST_F(EntitlementFile, ForAnExecutableThatOthersCouldReplaceCountsForNothing) {
  fs::permissions(folder.program(), fs::perms(0757));
  EXPECT_FALSE(entitled());
  fs::permissions(folder.program(), fs::perms(0755));
  fs::permissions(folder.program().parent_path(), fs::perms(0757));
  EXPECT_FALSE(entitled());
}

TEST_F(EntitlementFile, ThatIsALinkOrNamesALinkCountsForNothing) {
  const fs::path link = folder.program().parent_path() / "link";
  fs::create_symlink(folder.program(), link);
  folder.write("program.plist", link, "<integer>4711</integer>", kValues);
  EXPECT_FALSE(entitled());
  folder.write("program.plist", folder.program().parent_path() / "list/../program",
               "<integer>4711</integer>", kValues);
  EXPECT_FALSE(entitled());
  folder.write("real", folder.program(), "<integer>4711</integer>", kValues);
  fs::remove(folder.list() / "program.plist");
  fs::create_symlink("real", folder.list() / "program.plist");
  EXPECT_FALSE(entitled());
}

TEST_F(EntitlementFile, ForAnExecutableThatHasBeenReplacedCountsForNothing) {
  fs::rename(folder.program(), folder.program().string() + ".old");
  fs::copy_file("/bin/sleep", folder.program());
  EXPECT_FALSE(entitled()) << "another file runs than the one that the path names now";
}

TEST_F(EntitlementFile, ThatIsBrokenIsPassedOver) {
  std::ofstream(folder.list() / "a.plist") << "no property list";
  std::ofstream(folder.list() / "b.plist") << "<plist version=\"1.0\"><array/></plist>";
  std::ofstream(folder.list() / "c.plist") << "<plist version=\"1.0\"><dict/></plist>";
  ASSERT_EQ(::mkfifo((folder.list() / "d.plist").c_str(), 0644), 0);
  fs::create_directory(folder.list() / "e.plist");
  EXPECT_TRUE(entitled());
}

TEST_F(EntitlementFile, InAnEarlierFolderWins) {
  const TrustedFolder earlier;
  earlier.write("program.plist", folder.program(), "<integer>4711</integer>",
                "<key>yes</key><false/>");
  EntitlementFiles both({earlier.list().string(), folder.list().string()});
  const auto task = both.createTask(TokenOf(running->process(), kUser));
  ASSERT_TRUE(task);
  EXPECT_EQ(task->copyValueForEntitlement("yes").value, PropertyList(false));
}

TEST_F(EntitlementFile, CannotSpeakForAProcessThatHasExited) {
  const wire::AuditToken token = TokenOf(running->process(), kUser);
  const auto task = files.createTask(token);
  ASSERT_TRUE(task);
  ::kill(running->process(), SIGKILL);
  siginfo_t information{};
  ASSERT_EQ(::waitid(P_PID, static_cast<id_t>(running->process()), &information, WEXITED | WNOWAIT),
            0);
  EXPECT_TRUE(task->copyValueForEntitlement("yes").error) << "it ended between the two questions";
  EXPECT_EQ(files.createTask(token), nullptr);
}

TEST_F(EntitlementFile, CannotSpeakForAnotherProcessWithTheSameId) {
  wire::AuditToken token = TokenOf(running->process(), kUser);
  ++token.words[7];
  EXPECT_EQ(files.createTask(token), nullptr);
}

TEST_F(EntitlementFile, CannotSpeakForSendersThatAreNotKnown) {
  EXPECT_EQ(files.createTask(TokenOf(0, kUser)), nullptr);
  EXPECT_EQ(files.createTask(TokenOf(running->process(), 65534)), nullptr);
  EXPECT_EQ(files.createTask(TokenOf(-1, kUser)), nullptr);
}

}  // namespace
