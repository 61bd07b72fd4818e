// SPDX-License-Identifier: Apache-2.0
//
// Small whole-file steps of the tool. One thread, no lock.
#pragma once

#include <sys/types.h>

#include <string>
#include <string_view>

#include "Helper/Platform/FileDescriptor.h"

namespace handset {

/// The whole of the file at `path`; throws Failure where it cannot be read.
[[nodiscard]] std::string ReadWholeFile(const std::string& path);

/// Writes all of `bytes`; false with errno set where the descriptor does not take them.
[[nodiscard]] bool WriteAll(int descriptor, std::string_view bytes);

/// Replaces the file at `path` in one step by `bytes`, root's, with `mode`; throws Failure.
void ReplaceFile(const std::string& path, std::string_view bytes, mode_t mode);

/// Copies what `source` holds from its start to `path`, which becomes root's, mode 0755, replacing
/// what was there; throws Failure.
void CopyExecutable(int source, const std::string& path);

/// Creates the directory and those above it that are missing, root's, mode 0755; throws Failure
/// where something else stands there.
void MakeDirectories(const std::string& path);

/// Opens an executable regular file for reading; throws Failure, with `what` naming its role,
/// where `path` is none.
[[nodiscard]] platform::FileDescriptor OpenExecutable(const std::string& path,
                                                      const std::string& what);

/// The last component of `path`.
[[nodiscard]] std::string LastComponent(const std::string& path);

}  // namespace handset
