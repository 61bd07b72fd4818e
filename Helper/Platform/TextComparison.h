// SPDX-License-Identifier: Apache-2.0
//
// Comparison of text as people read it. Any thread; the letters' table of the system is opened by
// the first text that needs it.
#pragma once

#include <string_view>

namespace platform {

/// Whether two UTF-8 texts (without NUL) are equal when case is ignored and every run of the digits
/// 0 to 9 counts by its value: "1.0.A" equals "1.0.a", "7" equals "007", "1.10" differs from "1.1".
/// A run may have any length. Letters are matched one by one, in any script, through the upper and
/// lower case that the system's C.UTF-8 locale gives them: "σ" and "ς" match, "ß" and "SS" do not.
/// Nothing is normalised: a letter with a combining accent differs from the accented letter.
/// Without that locale only the letters a to z are matched. What is not UTF-8 equals nothing but
/// the same bytes.
[[nodiscard]] bool EqualIgnoringCaseWithNumbers(std::string_view left, std::string_view right);

}  // namespace platform
