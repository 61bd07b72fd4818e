// SPDX-License-Identifier: Apache-2.0
//
// Archives for the tests, made by programs that know nothing of ours. One thread.
#pragma once

#include <string>
#include <vector>

namespace files_test {

/// Runs a program to its end. False when it cannot be run or fails.
[[nodiscard]] bool RunTool(std::vector<std::string> words);

/// Makes an archive at `path` with Python's zipfile module. `script` is Python; it adds items with
/// file(NAME, BYTES, MODE), folder(NAME, MODE), link(NAME, TARGET) and item(NAME, MODE-WITH-TYPE,
/// BYTES), all but the name optional, makes side-cars with sidecar(ATTRIBUTES, FINDER, RESOURCE),
/// and may change what was written with patches[OLD-BYTES] = NEW-BYTES, of the same length.
[[nodiscard]] bool MakeZip(const std::string& path, const std::string& script);

}  // namespace files_test
