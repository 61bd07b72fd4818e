// SPDX-License-Identifier: Apache-2.0
//
// One thread, no lock.
#include "Tools/handset/TelephonyQuestions.h"

#include <cstdint>
#include <optional>
#include <string>

#include "Tools/handset/ListAnswer.h"
#include "Tools/handset/Options.h"

namespace handset {
namespace {

using Words = Control::Words;

void AnswerLog(Question& question, const Words& words, const Telephony& telephony) {
  ListOptions list;
  bool isJson = false;
  OptionReader reader(words);
  while (const auto option = reader.nextOption()) {
    if (*option == "--json") {
      isJson = true;
    } else if (!list.take(*option, reader)) {
      RefuseUsage("unknown option " + *option);
    }
  }
  AnswerWithList(question, list,
                 [&telephony, isJson](std::size_t index) -> std::optional<std::string> {
                   if (index >= telephony.entries().size()) return std::nullopt;
                   const TelephonyEntry& entry = telephony.entries()[index];
                   return isJson ? TelephonyEntryJson(entry) : TelephonyEntryLine(entry);
                 });
}

std::int32_t Integer(const std::string& text) {
  const bool isNegative = text.starts_with('-');
  const std::int64_t value = WholeNumber(text.substr(isNegative ? 1 : 0));
  return static_cast<std::int32_t>(isNegative ? -value : value);
}

void SetAnswer(const Words& words, Telephony& telephony) {
  if (words.size() != 2) RefuseUsage("telephony answer needs a domain and a code");
  telephony.answerWith(Integer(words[0]), Integer(words[1]));
}

void Order(const std::string& verb, const Words& words, Telephony& telephony) {
  if (verb == "start") {
    telephony.start();
  } else if (verb == "stop") {
    telephony.stop();
  } else if (verb == "pause") {
    telephony.pause();
  } else if (verb == "resume") {
    telephony.resume();
  } else if (verb == "notify") {
    telephony.notify();
  } else if (verb == "answer") {
    SetAnswer(words, telephony);
  } else {
    RefuseUsage("unknown command telephony " + verb);
  }
}

}  // namespace

void AnswerAboutTelephony(Control& control, Telephony& telephony) {
  control.on("telephony", [&telephony](Question& question, const Words& words) {
    if (words.empty()) RefuseUsage("telephony needs a command");
    const Words rest(words.begin() + 1, words.end());
    if (words.front() == "log") {
      AnswerLog(question, rest, telephony);
      return;
    }
    Order(words.front(), rest, telephony);
    question.finish();
  });
}

}  // namespace handset
