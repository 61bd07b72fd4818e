// SPDX-License-Identifier: Apache-2.0
//
// Each answer by itself; the table of them stands at the end. One thread, no lock.
#include "Tools/handset/HelperQuestions.h"

#include <signal.h>

#include <algorithm>
#include <memory>
#include <optional>
#include <string>

#include "Tools/handset/Failure.h"
#include "Tools/handset/Options.h"
#include "Tools/handset/SignalName.h"

namespace handset {
namespace {

using Words = Control::Words;

std::string StatusJson(const LauncherStatus& status, std::size_t logLines) {
  const auto boolean = [](bool value) { return std::string(value ? "true" : "false"); };
  std::string json = "{\"running\":" + boolean(status.running.has_value());
  json += ",\"pid\":" + (status.running ? std::to_string(*status.running) : "null");
  json += ",\"starts\":" + std::to_string(status.starts);
  json += ",\"exits\":" + std::to_string(status.exits);
  json += ",\"stopped\":" + boolean(status.isStopped);
  json += ",\"message_queued\":" + boolean(status.isMessageQueued);
  json += ",\"log_lines\":" + std::to_string(logLines) + ",\"last_exit\":";
  if (!status.last) return json + "null}\n";
  return json + "{\"pid\":" + std::to_string(status.last->pid) +
         ",\"code\":" + std::to_string(status.last->code) +
         ",\"signal\":" + std::to_string(status.last->signal) +
         ",\"lived_ms\":" + std::to_string(status.last->lived.count()) + "}}\n";
}

std::string StatusLines(const LauncherStatus& status, std::size_t logLines) {
  std::string text = status.running ? "running as process " + std::to_string(*status.running)
                                    : std::string("not running");
  if (status.isStopped) text += ", stopped after a crash loop";
  text += "\nstarts: " + std::to_string(status.starts) + "\n";
  if (status.last) text += "last instance: " + Describe(*status.last) + "\n";
  text += "log lines: " + std::to_string(logLines) + "\n";
  return text;
}

void AnswerStatus(Question& question, const Words& words, const Launcher& launcher,
                  const SystemLogCapture& capture) {
  bool isJson = false;
  OptionReader reader(words);
  while (const auto option = reader.nextOption()) {
    if (*option != "--json") RefuseUsage("unknown option " + *option);
    isJson = true;
  }
  const std::size_t logLines = capture.entries().size();
  const LauncherStatus status = launcher.status();
  question.say(isJson ? StatusJson(status, logLines) : StatusLines(status, logLines));
  question.finish();
}

void AnswerKill(Question& question, const Words& words, const Launcher& launcher) {
  const std::optional<int> signal = words.empty() ? SIGTERM : SignalNumber(words.front());
  if (!signal) RefuseUsage("unknown signal " + words.front());
  if (!launcher.signalHelper(*signal)) throw Failure("no helper runs", 1);
  question.finish();
}

void AnswerStart(Question& question, Launcher& launcher) {
  if (!launcher.startNow()) throw Failure("a helper runs already", 1);
  question.finish();
}

void WaitForStart(Question& question, const Words& words, const Launcher& launcher) {
  std::optional<int> limit;
  std::optional<unsigned> starts;
  OptionReader reader(words);
  while (const auto option = reader.nextOption()) {
    if (*option == "--timeout") {
      limit = Milliseconds(reader.value());
    } else if (*option == "--starts") {
      starts = WholeNumber(reader.value());
    } else {
      RefuseUsage("unknown option " + *option);
    }
  }
  question.wait(limit, [&launcher, starts](Question& asked) {
    const LauncherStatus status = launcher.status();
    if (starts ? status.starts < *starts : !status.running) return;
    if (status.running) asked.say(std::to_string(*status.running) + "\n");
    asked.finish();
  });
}

void WaitForExit(Question& question, const Words& words, const Launcher& launcher) {
  std::optional<int> limit;
  const LauncherStatus now = launcher.status();
  // The instance that runs now, or else the last one, or else the first one to come.
  unsigned exits = std::max(1U, now.exits + (now.running ? 1U : 0U));
  OptionReader reader(words);
  while (const auto option = reader.nextOption()) {
    if (*option == "--timeout") {
      limit = Milliseconds(reader.value());
    } else if (*option == "--exits") {
      exits = WholeNumber(reader.value());
    } else {
      RefuseUsage("unknown option " + *option);
    }
  }
  question.wait(limit, [&launcher, exits](Question& asked) {
    const LauncherStatus status = launcher.status();
    if (status.exits < exits) return;
    if (status.last) asked.say(Describe(*status.last) + "\n");
    asked.finish();
  });
}

enum class LogForm { kLines, kJson, kRaw };

std::string Render(const LogEntry& entry, LogForm form) {
  if (form == LogForm::kJson) return LogEntryJson(entry);
  if (form == LogForm::kRaw) return entry.raw + '\n';
  return LogEntryLine(entry);
}

void WaitForLog(Question& question, const Words& words, const SystemLogCapture& capture) {
  std::optional<int> limit;
  LogForm form = LogForm::kLines;
  // Shared, because the function that keeps it is copied while it runs.
  const auto next = std::make_shared<std::size_t>(0);
  std::optional<std::string> until;
  OptionReader reader(words);
  while (const auto option = reader.nextOption()) {
    if (*option == "--timeout") {
      limit = Milliseconds(reader.value());
    } else if (*option == "--follow-until") {
      until = reader.value();
    } else if (*option == "--skip") {
      *next = WholeNumber(reader.value());
    } else if (*option == "--json") {
      form = LogForm::kJson;
    } else if (*option == "--raw") {
      form = LogForm::kRaw;
    } else {
      RefuseUsage("unknown option " + *option);
    }
  }
  question.wait(limit, [&capture, form, until, next](Question& asked) {
    const auto& entries = capture.entries();
    while (*next < entries.size()) {
      const LogEntry& entry = entries[(*next)++];
      asked.say(Render(entry, form));
      if (until && entry.text.find(*until) != std::string::npos) {
        asked.finish();
        return;
      }
    }
    if (!until) asked.finish();
  });
}

}  // namespace

void AnswerAboutHelper(Control& control, Launcher& launcher, SystemLogCapture& capture) {
  control.on("status", [&](Question& question, const Words& words) {
    AnswerStatus(question, words, launcher, capture);
  });
  control.on("kill", [&](Question& question, const Words& words) {
    AnswerKill(question, words, launcher);
  });
  control.on("start-helper",
             [&](Question& question, const Words&) { AnswerStart(question, launcher); });
  control.on("wait-start", [&](Question& question, const Words& words) {
    WaitForStart(question, words, launcher);
  });
  control.on("wait-exit", [&](Question& question, const Words& words) {
    WaitForExit(question, words, launcher);
  });
  control.on("log",
             [&](Question& question, const Words& words) { WaitForLog(question, words, capture); });
}

}  // namespace handset
