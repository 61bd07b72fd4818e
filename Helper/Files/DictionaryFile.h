// SPDX-License-Identifier: Apache-2.0
//
// Reads a dictionary from a property-list file that a client named. Any thread; no state.
#pragma once

#include <optional>

#include "Helper/Platform/PropertyList.h"

/// The dictionary that the file at `path`, a C string, holds as its outermost value, in XML or
/// binary form; none when it holds anything else, is no regular file, has more than 16 MiB, or
/// cannot be read. Kept: the path is ASCII; one with any other byte names no file.
[[nodiscard]] std::optional<platform::PropertyList> CreateDictionaryFromFile(const char* path);
