// SPDX-License-Identifier: Apache-2.0
//
// Runs the handset tool as a child and gathers what it says, for the tests. One thread, no lock.
#pragma once

#include <gtest/gtest.h>
#include <sys/types.h>

#include <string>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"

namespace handset_tests {

struct Outcome {
  int status = -1;  ///< Exit status, 128 + signal where a signal ended the tool.
  std::string output;
  std::string errors;
};

/// A handset that runs while the test does something else.
class RunningHandset {
 public:
  /// Starts `handset run OPTIONS --helper FAKE --install CALLER:caller -- sh -c SCRIPT`. The
  /// script's standard input stays open until finish().
  explicit RunningHandset(const std::string& script, const std::vector<std::string>& options = {});
  RunningHandset(const RunningHandset&) = delete;
  RunningHandset& operator=(const RunningHandset&) = delete;
  ~RunningHandset();

  [[nodiscard]] pid_t pid() const { return pid_; }
  /// Blocks until the script has written a whole line; that line, or "" at the end of its output.
  [[nodiscard]] std::string nextLine();
  /// Writes a line to the script's standard input.
  void say(const std::string& line);
  /// Closes the script's standard input and waits for the end of everything.
  [[nodiscard]] Outcome finish();

 private:
  pid_t pid_ = -1;
  platform::FileDescriptor input_;
  platform::FileDescriptor output_;
  platform::FileDescriptor errors_;
};

/// The same from start to end.
[[nodiscard]] Outcome RunHandset(const std::string& script,
                                 const std::vector<std::string>& options = {});

/// Runs any program to its end.
[[nodiscard]] Outcome RunProgram(const std::vector<std::string>& arguments);

/// A folder of its own, removed at the end of the scope.
class TemporaryFolder {
 public:
  TemporaryFolder();
  TemporaryFolder(const TemporaryFolder&) = delete;
  TemporaryFolder& operator=(const TemporaryFolder&) = delete;
  ~TemporaryFolder();
  [[nodiscard]] const std::string& path() const { return path_; }

 private:
  std::string path_;
};

/// Skips, with the tool's own reason, where no handset can be made.
class HandsetSuite : public testing::Test {
 protected:
  void SetUp() override;
};

}  // namespace handset_tests
