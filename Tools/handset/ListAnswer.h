// SPDX-License-Identifier: Apache-2.0
//
// The answer to every "show what came so far, or wait until there is more": one list that grows at
// its end. One thread, no lock.
#pragma once

#include <cstddef>
#include <functional>
#include <optional>
#include <string>

#include "Tools/handset/Options.h"
#include "Tools/handset/Question.h"

namespace handset {

struct ListOptions {
  std::size_t skip = 0;              ///< So many entries from the start are left out.
  std::optional<std::size_t> count;  ///< Wait for so many behind them; none: what is there now.
  std::optional<int> milliseconds;   ///< The wait's limit; none: for ever.

  /// Takes --skip, --count and --timeout; false for any other option. Throws Failure where a value
  /// is missing or none.
  [[nodiscard]] bool take(const std::string& option, OptionReader& reader);
};

/// Entry number `index` as text; nothing at the end of the list.
using ListEntry = std::function<std::optional<std::string>(std::size_t index)>;

/// Says the entries that the options ask for, each as it comes, and finishes. With a count, exactly
/// so many are said; where the limit is over before, those that came.
void AnswerWithList(Question& question, const ListOptions& options, const ListEntry& entry);

}  // namespace handset
