// SPDX-License-Identifier: Apache-2.0
//
// halvecctl file, crash-logs, bundle move and bundle extract: the literal requests they make, and
// what a success flag comes to.
#include <gtest/gtest.h>

#include <string>

#include "Tests/Halvecctl/Answered.h"

namespace {

using fake::Bytes;
using fake::Hex;
using fake::Slot;
using program::Exchange;
using program::RunAnswered;

/// The header of a request and its NDR record, as the transport describes them.
Bytes Head(const char* size, const char* id) {
  return Hex("00000000") + Hex(size) + Hex("000000000000000000000000") + Hex(id) +
         Hex("0000000001000000");
}

/// A reply of code 0 and a success flag.
Bytes FlagReply(const char* id, bool flag) {
  return Hex("00000000 28000000 00000000 00000000 00000000") + Hex(id) +
         Hex("00000000 01000000 00000000") + Hex(flag ? "01000000" : "00000000");
}

TEST(FileCopy, SendsTheTwoDirectoriesAndTheName) {
  const Exchange exchange =
      RunAnswered({"file", "copy", "/from", "/to", "name"}, FlagReply("90808400", true));
  EXPECT_EQ(exchange.outcome.exitCode, 0) << exchange.outcome.errors;
  EXPECT_EQ(exchange.outcome.output, "");
  EXPECT_EQ(exchange.request, Head("20030000", "2c808400") + Slot(256, "/from") + Slot(256, "/to") +
                                  Slot(256, "name"));
}

TEST(FileCopy, FailsWhereTheFlagIsFalse) {
  const Exchange exchange =
      RunAnswered({"file", "copy", "/from", "/to", "name", "--json"}, FlagReply("90808400", false));
  EXPECT_EQ(exchange.outcome.exitCode, 1);
  EXPECT_EQ(exchange.outcome.output, "{\"success\":false}\n");
  EXPECT_EQ(exchange.outcome.errors,
            "halvecctl: the helper could not do it; the system log says why\n");
}

TEST(CrashLogsCopy, SendsTheSource) {
  const Exchange exchange =
      RunAnswered({"crash-logs", "copy", "/crash", "--json"}, FlagReply("91808400", true));
  EXPECT_EQ(exchange.outcome.exitCode, 0) << exchange.outcome.errors;
  EXPECT_EQ(exchange.outcome.output, "{\"success\":true}\n");
  EXPECT_EQ(exchange.request, Head("20010000", "2d808400") + Slot(256, "/crash"));
}

TEST(BundleMove, SendsTheSourceTheDirectoryAndTheName) {
  const Exchange exchange =
      RunAnswered({"bundle", "move", "/from", "/to", "x.bundle"}, FlagReply("92808400", true));
  EXPECT_EQ(exchange.outcome.exitCode, 0) << exchange.outcome.errors;
  EXPECT_EQ(exchange.request, Head("20030000", "2e808400") + Slot(256, "/from") + Slot(256, "/to") +
                                  Slot(256, "x.bundle"));
}

TEST(BundleExtract, SendsTheArchiveAndTheDestination) {
  const Exchange exchange =
      RunAnswered({"bundle", "extract", "/a.tcbk", "/to"}, FlagReply("96808400", true));
  EXPECT_EQ(exchange.outcome.exitCode, 0) << exchange.outcome.errors;
  EXPECT_EQ(exchange.outcome.output, "");
  EXPECT_EQ(exchange.request,
            Head("20020000", "32808400") + Slot(256, "/a.tcbk") + Slot(256, "/to"));
}

TEST(BundleExtract, FailsWhereTheFlagIsFalse) {
  const Exchange exchange =
      RunAnswered({"bundle", "extract", "/a.tcbk", "/to", "--json"}, FlagReply("96808400", false));
  EXPECT_EQ(exchange.outcome.exitCode, 1);
  EXPECT_EQ(exchange.outcome.output, "{\"success\":false}\n");
  EXPECT_EQ(exchange.outcome.errors,
            "halvecctl: the helper could not do it; the system log says why\n");
}

}  // namespace
