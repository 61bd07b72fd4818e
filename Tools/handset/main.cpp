// SPDX-License-Identifier: Apache-2.0
//
// The command line of the simulated handset. One thread, no lock.
#include <unistd.h>

#include <cstdio>
#include <exception>
#include <string>
#include <vector>

#include "Tools/handset/Control.h"
#include "Tools/handset/Entitlements.h"
#include "Tools/handset/Failure.h"
#include "Tools/handset/Namespaces.h"
#include "Tools/handset/Options.h"
#include "Tools/handset/Process.h"
#include "Tools/handset/Session.h"
#include "Tools/handset/UserDatabase.h"
#include "Tools/handset/World.h"

namespace handset {
namespace {

constexpr const char* kUsage = R"(usage: handset run [OPTION]... [--] COMMAND [ARGUMENT]...
       handset check

Runs COMMAND in a simulated handset, in which the helper starts on demand, and
ends with COMMAND's exit status. Needs root; leaves nothing behind.

  --helper PATH       the helper to run (default: the one built beside this tool,
                      else the one that is installed)
  --verbose           show log lines and helper starts on standard error
  --log FILE          append the system log to FILE, one JSON object per line
  --events FILE       append helper starts and exits to FILE, likewise
  --user NAME         run COMMAND as this user (default: root)
  --env-as USER       give COMMAND a clean environment of this user
  --state DIR         keep the mobile user's home, preferences, voicemail tokens
                      and services' data in DIR
  --bind SRC[:DST]    show SRC of the host, writable, at DST (default: as SRC)
  --install SRC[:NAME]  copy an executable to /usr/libexec/halvec/NAME
  --web DIR           serve DIR by https, where only this handset trusts the server
  --web-host NAME     the server's name (default: the LASD manifest's host); may be repeated
  --no-network        leave the links to the world out
  --no-telephony      leave the stand-in telephony daemon out
  --queue N           datagrams that a named port queues (default: the kernel's)

Inside:
  handset status [--json]
  handset wait-start [--starts N] [--timeout SECONDS]
  handset wait-exit [--exits N] [--timeout SECONDS]
  handset log [--follow-until TEXT] [--skip N] [--timeout SECONDS] [--json|--raw]
  handset kill [SIGNAL]
  handset start-helper
  handset as [--without-group] USER [--] COMMAND [ARGUMENT]...
  handset install SRC [NAME]
  handset telephony log [--json] [--skip N] [--count N] [--timeout SECONDS]
  handset telephony start|stop|pause|resume|notify
  handset telephony answer DOMAIN CODE
  handset network counters [--json] [INTERFACE]
  handset network down|up|remove|add INTERFACE
  handset capture start INTERFACE
  handset capture show [--protocol NAME] [--skip N] [--count N] [--timeout SECONDS]
      [--json] [INTERFACE]
  handset tower reply on|off
  handset tower send HEX
  handset web log [--skip N] [--count N] [--timeout SECONDS]
  handset web start|stop
  handset web dns on|off
  handset world [--] COMMAND [ARGUMENT]...
  handset entitle EXECUTABLE USER [--name NAME] [--value FRAGMENT]... [--unchecked]

Exit statuses of its own: 2 usage, 124 timed out, 125 no handset, 126 and 127
COMMAND does not start or is not there.
)";

int Run(const std::vector<std::string>& arguments) {
  RunOptions options = ParseRunOptions(arguments);
  if (const auto reason = WhyNoHandset()) throw Failure(*reason);
  if (options.helper.empty()) options.helper = DefaultHelper();
  return RunInNamespaces([&options] { return Session(options).run(); });
}

int Check() {
  const auto reason = WhyNoHandset();
  if (!reason) return 0;
  std::printf("%s\n", reason->c_str());
  return 1;
}

[[noreturn]] void As(const std::vector<std::string>& arguments) {
  PortGroup portGroup = PortGroup::kMember;
  OptionReader reader(arguments);
  while (const auto option = reader.nextOption()) {
    if (*option != "--without-group") RefuseUsage("unknown option " + *option);
    portGroup = PortGroup::kStranger;
  }
  std::vector<std::string> command = reader.rest();
  if (command.empty()) RefuseUsage("as needs a user");
  const User user = RequireUser(command.front());
  command.erase(command.begin());
  if (!command.empty() && command.front() == "--") command.erase(command.begin());
  if (command.empty()) RefuseUsage("as needs a command");
  const Environment environment = EnvironmentOf(user, InheritedEnvironment());
  BecomeUser(user, portGroup);
  BecomeProgram(command, environment);
}

[[noreturn]] void InWorld(const std::vector<std::string>& arguments) {
  OptionReader reader(arguments);
  while (const auto option = reader.nextOption()) RefuseUsage("unknown option " + *option);
  const std::vector<std::string> command = reader.rest();
  if (command.empty()) RefuseUsage("world needs a command");
  EnterWorld();
  BecomeProgram(command, InheritedEnvironment());
}

int Main(const std::vector<std::string>& words) {
  if (words.empty()) RefuseUsage("a command is needed");
  const std::string& verb = words.front();
  const std::vector<std::string> rest(words.begin() + 1, words.end());
  if (verb == "--help" || verb == "help") {
    std::printf("%s", kUsage);
    return 0;
  }
  if (verb == "run") return Run(rest);
  if (verb == "check") return Check();
  if (verb == "as") As(rest);
  if (verb == "world") InWorld(rest);
  if (verb == "install") {
    Install(rest);
    return 0;
  }
  if (verb == "entitle") {
    Entitle(rest);
    return 0;
  }
  return AskHandset(words);
}

}  // namespace
}  // namespace handset

int main(int argc, char** argv) {
  try {
    return handset::Main(std::vector<std::string>(argv + 1, argv + argc));
  } catch (const handset::Failure& failure) {
    static_cast<void>(std::fprintf(stderr, "handset: %s\n", failure.what()));
    return failure.status();
  } catch (const std::exception& error) {
    static_cast<void>(std::fprintf(stderr, "handset: %s\n", error.what()));
    return handset::kStatusFailed;
  }
}
