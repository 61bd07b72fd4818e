// SPDX-License-Identifier: Apache-2.0
//
// One thread, no lock.
#include "Tools/handset/ListAnswer.h"

#include <memory>

namespace handset {

bool ListOptions::take(const std::string& option, OptionReader& reader) {
  if (option == "--skip") {
    skip = WholeNumber(reader.value());
  } else if (option == "--count") {
    count = WholeNumber(reader.value());
  } else if (option == "--timeout") {
    milliseconds = Milliseconds(reader.value());
  } else {
    return false;
  }
  return true;
}

void AnswerWithList(Question& question, const ListOptions& options, const ListEntry& entry) {
  // Shared, because the step that keeps it is copied while it runs.
  const auto next = std::make_shared<std::size_t>(options.skip);
  question.wait(options.milliseconds, [options, entry, next](Question& asked) {
    const auto isComplete = [&] { return options.count && *next - options.skip >= *options.count; };
    while (!isComplete()) {
      const std::optional<std::string> text = entry(*next);
      if (!text) break;
      asked.say(*text);
      ++*next;
    }
    if (!options.count || isComplete()) asked.finish();
  });
}

}  // namespace handset
