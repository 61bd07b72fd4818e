// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Environment.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <string>
#include <utility>
#include <vector>

namespace {

using Entries = std::vector<std::string>;

/// What is left of an environment of these entries.
Entries Left(Entries entries) {
  std::vector<char*> pointers;
  for (std::string& entry : entries) pointers.push_back(entry.data());
  pointers.push_back(nullptr);
  char** const own = std::exchange(environ, pointers.data());
  platform::ForgetEnvironment();
  Entries left;
  for (char** each = environ; *each; ++each) left.emplace_back(*each);
  environ = own;
  return left;
}

TEST(Environment, KeepsWhatALauncherHandsOver) {
  const Entries handedOver{"LISTEN_PID=1", "LISTEN_FDS=", "LISTEN_FDNAMES=a:b", "NOTIFY_SOCKET=@x"};
  EXPECT_EQ(Left(handedOver), handedOver);
}

TEST(Environment, ForgetsEverythingElse) {
  EXPECT_EQ(Left({"SSLKEYLOGFILE=/tmp/keys", "LISTEN_PID=1", "LISTEN_PIDS=1", "LISTEN_PID",
                  "MY_NOTIFY_SOCKET=@x", "", "=", "PATH=/bin", "NOTIFY_SOCKET=@y", "LANG=C"}),
            (Entries{"LISTEN_PID=1", "NOTIFY_SOCKET=@y"}));
  EXPECT_EQ(Left({"SSLKEYLOGFILE=/tmp/keys"}), Entries{});
}

TEST(Environment, MayBeMissingOrEmpty) {
  EXPECT_EQ(Left({}), Entries{});
  char** const own = std::exchange(environ, nullptr);
  platform::ForgetEnvironment();
  EXPECT_EQ(environ, nullptr);
  environ = own;
}

}  // namespace
