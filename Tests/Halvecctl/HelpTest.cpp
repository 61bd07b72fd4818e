// SPDX-License-Identifier: Apache-2.0
//
// What halvecctl does without a helper: help, version, the catalogue, wrong command lines.
#include <gtest/gtest.h>

#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "Tests/Halvecctl/Program.h"

namespace {

using program::Outcome;
using program::RunProgram;

std::string Golden(const std::string& name) {
  std::ifstream file(std::string(HALVECCTL_GOLDEN) + "/" + name);
  EXPECT_TRUE(file.good()) << name;
  std::ostringstream content;
  content << file.rdbuf();
  return content.str();
}

TEST(HalvecctlList, PrintsTheCatalogueAsRecorded) {
  const Outcome outcome = RunProgram({"list"});
  EXPECT_EQ(outcome.exitCode, 0);
  EXPECT_EQ(outcome.output, Golden("list.txt"));
  EXPECT_EQ(outcome.errors, "");
}

TEST(HalvecctlList, PrintsTheCatalogueAsJson) {
  const Outcome outcome = RunProgram({"list", "--json"});
  EXPECT_EQ(outcome.exitCode, 0);
  EXPECT_EQ(outcome.output, Golden("list.json"));
}

TEST(HalvecctlList, TakesGlobalOptionsBeforeTheCommandToo) {
  EXPECT_EQ(RunProgram({"--json", "list"}).output, Golden("list.json"));
}

TEST(HalvecctlHelp, NamesEveryCommandAndExitCode) {
  const Outcome outcome = RunProgram({"--help"});
  EXPECT_EQ(outcome.exitCode, 0);
  for (const char* text : {"list ", "preference ", "bundle ", "path ", "plist ", "file ",
                           "crash-logs ", "lasd ", "voicemail ", "heartbeat ", "radio-log ",
                           "call ", "status ", "monitor ", "--timeout", "  6  there is none"}) {
    EXPECT_NE(outcome.output.find(text), std::string::npos) << text;
  }
}

TEST(HalvecctlHelp, ExistsForEveryCommand) {
  for (const char* command :
       {"list", "preference", "bundle", "path", "plist", "file", "crash-logs", "lasd", "voicemail",
        "heartbeat", "radio-log", "call", "status", "monitor"}) {
    const Outcome outcome = RunProgram({command, "--help"});
    EXPECT_EQ(outcome.exitCode, 0);
    EXPECT_EQ(outcome.output.find("Usage: halvecctl " + std::string(command)), 0U);
    EXPECT_EQ(outcome.errors, "");
  }
}

TEST(HalvecctlVersion, IsOneLine) {
  const Outcome outcome = RunProgram({"--version"});
  EXPECT_EQ(outcome.exitCode, 0);
  EXPECT_EQ(outcome.output, "halvecctl " HALVECCTL_VERSION "\n");
}

struct WrongUse {
  std::vector<std::string> arguments;
  const char* reason;  // part of what is printed
};

TEST(HalvecctlUsage, ErrorsAreOneSentenceAndExitWithTwo) {
  const std::vector<WrongUse> cases{
      {{}, "no command"},
      {{"frobnicate"}, "unknown command 'frobnicate'"},
      {{"list", "extra"}, "expected no arguments, got 1 argument"},
      {{"list", "--frob"}, "unknown option --frob"},
      {{"list", "--json", "--json"}, "option --json is given twice"},
      {{"--timeout"}, "option --timeout needs a value"},
      {{"--timeout", "soon", "list"}, "'soon' is not a number of seconds"},
      {{"--timeout", "-1", "list"}, "'-1' is not a number of seconds"},
      {{"--timeout", "nan", "list"}, "'nan' is not a number of seconds"},
      {{"call"}, "no request"},
      {{"call", "Frobnicate"}, "unknown request 'Frobnicate'"},
      {{"call", "8683572"}, "unknown request '8683572'"},
      {{"call", "SetVoicemailToken"}, "expected TOKEN, got 0 arguments"},
      {{"call", "CreateSymlink", "a", "b", "c"}, "expected TARGET LINK-PATH, got 3 arguments"},
      {{"call", "TriggerHeartbeat", "2147483648"}, "from -2147483648 to 2147483647"},
      {{"call", "TriggerHeartbeat", "1x"}, "'1x' is not an integer"},
      {{"call", "TriggerHeartbeat", ""}, "'' is not an integer"},
      {{"call", "TriggerDatabaseUpdate", "-1"}, "'-1' is not an integer from 0 to 4294967295"},
      {{"call", "RequestCountryCodeFromLocation", "1,5", "2"}, "'1,5' is not a number"},
      {{"call", "SetPreferenceValue", "d", "k", "text"}, "neither @FILE nor -"},
      {{"call", "SetPreferenceValue", "d", "k", "@/nonexistent"}, "cannot open /nonexistent"},
      {{"call", "SetPreferenceValue", "d", "k", "@/"}, "cannot read /"},
      {{"bundle"}, "expected link, unlink, move or extract"},
      {{"bundle", "mend"}, "unknown action 'mend'"},
      {{"bundle", "link", "target"}, "expected TARGET LINK-PATH, got 1 argument"},
      {{"bundle", "link", "t", "p", "--unchecked", "--domain", "d"}, "exclude one another"},
      {{"bundle", "unlink"}, "expected PATH, got 0 arguments"},
      {{"bundle", "unlink", "p", "--unchecked"}, "unknown option --unchecked"},
      {{"path"}, "expected explain"},
      {{"path", "walk"}, "unknown action 'walk'"},
      {{"path", "explain"}, "expected PATH, got 0 arguments"},
      {{"path", "explain", std::string(1024, 'x')}, "longer than a request carries"},
      {{"plist"}, "expected show"},
      {{"plist", "hide"}, "unknown action 'hide'"},
      {{"plist", "show"}, "expected PATH, got 0 arguments"},
      {{"bundle", "move", "s", "d"}, "expected SOURCE DESTINATION-DIRECTORY NAME, got 2"},
      {{"bundle", "extract", "a"}, "expected ARCHIVE DESTINATION, got 1 argument"},
      {{"file"}, "expected copy"},
      {{"file", "link"}, "unknown action 'link'"},
      {{"file", "copy", "s", "d"}, "DESTINATION-DIRECTORY FILE-NAME, got 2 arguments"},
      {{"crash-logs"}, "expected copy"},
      {{"crash-logs", "move"}, "unknown action 'move'"},
      {{"crash-logs", "copy"}, "expected SOURCE, got 0 arguments"},
      {{"voicemail"}, "expected token, subscribed or reset"},
      {{"voicemail", "listen"}, "unknown action 'listen'"},
      {{"voicemail", "subscribed", "now"}, "expected no arguments, got 1 argument"},
      {{"voicemail", "reset", "now"}, "expected no arguments, got 1 argument"},
      {{"voicemail", "token"}, "expected get, set or clear"},
      {{"voicemail", "token", "mint"}, "unknown action 'token mint'"},
      {{"voicemail", "token", "set"}, "expected TOKEN, got 0 arguments"},
      {{"voicemail", "token", "set", "a", "b"}, "expected TOKEN, got 2 arguments"},
      {{"voicemail", "token", "get", "key"}, "expected no arguments, got 1 argument"},
      {{"voicemail", "token", "get", "--key"}, "option --key needs a value"},
      {{"heartbeat"}, "expected start or stop"},
      {{"heartbeat", "on"}, "unknown action 'on'"},
      {{"heartbeat", "start", "twice"}, "expected no arguments, got 1 argument"},
      {{"radio-log"}, "expected on or off"},
      {{"radio-log", "start"}, "unknown action 'start'"},
      {{"lasd"}, "expected update or status"},
      {{"lasd", "downgrade"}, "unknown action 'downgrade'"},
      {{"lasd", "status", "gsm"}, "expected no arguments, got 1 argument"},
      {{"lasd", "update", "gsm"}, "expected no arguments, got 1 argument"},
      {{"lasd", "update", "--types", "gsm,5g"}, "'5g' is none of gsm, umts, cdma, lte and scdma"},
      {{"lasd", "update", "--types", ""}, "'' is none of"},
      {{"lasd", "update", "--types", "gsm,"}, "'' is none of"},
      {{"lasd", "update", "--within", "5"}, "--within is for --wait"},
      {{"lasd", "update", "--wait", "--within", "-1"}, "'-1' is not a number of seconds"},
      {{"preference"}, "expected set, get or remove"},
      {{"preference", "list"}, "unknown action 'list'"},
      {{"preference", "set", "d", "k"}, "expected DOMAIN KEY VALUE, got 2 arguments"},
      {{"preference", "set", "d", "k", "v", "--plist", "-"}, "expected DOMAIN KEY --plist FILE"},
      {{"preference", "set", "d", "k", "1", "--real", "--integer"}, "more than one type"},
      {{"preference", "set", "d", "k", "yes", "--boolean"}, "neither true nor false"},
      {{"preference", "set", "d", "k", "9e", "--integer"}, "from -9223372036854775808 to 1844674"},
      {{"preference", "set", "d", "k", "\x01"}, "no property-list form"},
      {{"preference", "get", "d"}, "expected DOMAIN KEY, got 1 argument"},
      {{"preference", "get", "d", "k", "--xml", "--json"}, "exclude one another"},
      {{"preference", "get", "d", "k", "--string"}, "unknown option --string"},
      {{"preference", "remove", "d"}, "expected DOMAIN KEY, got 1 argument"},
      {{"call", "CopyCountryCode", "--service", ""}, "an argument is not usable"},
  };
  for (const WrongUse& use : cases) {
    const Outcome outcome = RunProgram(use.arguments);
    EXPECT_EQ(outcome.exitCode, 2) << use.reason;
    EXPECT_EQ(outcome.output, "") << use.reason;
    EXPECT_EQ(outcome.errors.find("halvecctl: "), 0U) << outcome.errors;
    EXPECT_NE(outcome.errors.find(use.reason), std::string::npos)
        << outcome.errors << " lacks " << use.reason;
    EXPECT_EQ(outcome.errors.find('\n'), outcome.errors.size() - 1) << "one line";
  }
}

TEST(HalvecctlUsage, RefusesAFileThatIsNoPropertyList) {
  // One byte would mean removal if it were sent.
  for (const char* content : {"", "x", "<plist>"}) {
    const Outcome outcome = RunProgram({"preference", "set", "d", "k", "--plist", "-"}, content);
    EXPECT_EQ(outcome.exitCode, 2);
    EXPECT_NE(outcome.errors.find("standard input is not a property list: "), std::string::npos)
        << outcome.errors;
  }
}

TEST(HalvecctlUsage, RefusesMoreThanARequestCarries) {
  const Outcome outcome = RunProgram({"call", "SetPreferenceValue", "d", "k", "-"},
                                     std::string(16 * 1024 * 1024 + 1, 'x'));
  EXPECT_EQ(outcome.exitCode, 2);
  EXPECT_NE(outcome.errors.find("standard input is longer than 16 MiB"), std::string::npos);
}

TEST(HalvecctlOutput, ThatCannotBeWrittenIsAFailure) {
  const Outcome outcome = program::RunOnFullOutput({"list"});
  EXPECT_EQ(outcome.exitCode, 7);
  EXPECT_EQ(outcome.errors, "halvecctl: cannot write to standard output\n");
}

}  // namespace
