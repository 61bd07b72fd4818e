// SPDX-License-Identifier: Apache-2.0
//
// Runs a shell script inside a handset with the real helper and an entitled client, `client`.
#pragma once

#include <string>
#include <vector>

#include "Tests/Handset/HandsetRun.h"

namespace process_tests {

using handset_tests::Outcome;

class ProcessSuite : public handset_tests::HandsetSuite {
 protected:
  /// Runs `script` as root; `client` and `halvecctl` are entitled when root runs them.
  static Outcome run(const std::string& script, const std::vector<std::string>& options = {}) {
    std::vector<std::string> arguments{HANDSET,     "run",
                                       "--helper",  HELPER,
                                       "--install", CLIENT ":client",
                                       "--install", HALVECCTL ":halvecctl",
                                       "--install", HELPER ":helper"};
    arguments.insert(arguments.end(), options.begin(), options.end());
    arguments.insert(arguments.end(),
                     {"--", "sh", "-c",
                      "handset entitle /usr/libexec/halvec/client root >/dev/null\n"
                      "handset entitle /usr/libexec/halvec/halvecctl root >/dev/null\n" +
                          script});
    return handset_tests::RunProgram(arguments);
  }
};

}  // namespace process_tests
