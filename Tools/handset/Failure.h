// SPDX-License-Identifier: Apache-2.0
//
// What a step of the tool throws when it cannot be done. Thrown and caught inside this folder:
// the program's main function turns it into one line of text and an exit status. No thread, no
// lock.
#pragma once

#include <cerrno>
#include <stdexcept>
#include <string>
#include <system_error>

namespace handset {

/// Exit statuses of the tool itself; everything else is the command's own status.
inline constexpr int kStatusUsage = 2;
inline constexpr int kStatusTimedOut = 124;       ///< A wait ended without its event.
inline constexpr int kStatusFailed = 125;         ///< The handset could not be set up or asked.
inline constexpr int kStatusNotExecutable = 126;  ///< The command is there but does not start.
inline constexpr int kStatusNotFound = 127;       ///< There is no such command inside.

class Failure : public std::runtime_error {
 public:
  explicit Failure(const std::string& text, int status = kStatusFailed)
      : std::runtime_error(text), status_(status) {}

  /// "`doing`: text of the error number".
  static Failure FromErrno(const std::string& doing, int error = errno) {
    return Failure(doing + ": " + std::generic_category().message(error));
  }

  /// The exit status that the program ends with.
  [[nodiscard]] int status() const noexcept { return status_; }

 private:
  int status_;
};

}  // namespace handset
