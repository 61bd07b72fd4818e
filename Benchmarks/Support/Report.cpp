// SPDX-License-Identifier: Apache-2.0
#include "Benchmarks/Support/Report.h"

#include <cstdio>
#include <utility>

namespace bench {
namespace {

std::string Number(const char* format, double value) {
  std::string text(32, '\0');
  const int length = std::snprintf(text.data(), text.size(), format, value);
  text.resize(length > 0 ? static_cast<std::size_t>(length) : 0);
  return text;
}

std::string Quoted(const std::string& text) {
  std::string quoted = "\"";
  for (const char letter : text) {
    if (letter == '"' || letter == '\\') quoted += '\\';
    quoted += letter;
  }
  return quoted + '"';
}

const char* Verdict(const Figure& figure) {
  if (!figure.goal) return "";
  return figure.ratio.value_or(figure.value) <= *figure.goal ? "reached" : "MISSED";
}

void PrintTable(const Table& table) {
  std::printf("\n%s\n", table.title.c_str());
  for (const Figure& figure : table.figures) {
    std::printf("  %-52s %10.2f %-3s %7s %9s  %s\n", figure.name.c_str(), figure.value,
                table.unit.c_str(), figure.ratio ? Number("%.2f x", *figure.ratio).c_str() : "",
                figure.goal ? Number("<= %.2f", *figure.goal).c_str() : "", Verdict(figure));
  }
  for (const std::string& note : table.notes) std::printf("  (%s)\n", note.c_str());
  (void)std::fflush(stdout);
}

std::string JsonOf(const Figure& figure) {
  std::string text = "{\"name\":" + Quoted(figure.name) + Number(",\"value\":%.4f", figure.value);
  if (figure.ratio) text += Number(",\"ratio\":%.4f", *figure.ratio);
  if (figure.goal) text += Number(",\"goal\":%.4f", *figure.goal);
  return text + "}";
}

}  // namespace

void Report::add(Table table) {
  if (!json_) PrintTable(table);
  tables_.push_back(std::move(table));
}

void Report::finish() const {
  if (!json_) return;
  const char* separator = "[";
  for (const Table& table : tables_) {
    std::printf("%s{\"title\":%s,\"unit\":%s,\"figures\":[", separator, Quoted(table.title).c_str(),
                Quoted(table.unit).c_str());
    const char* comma = "";
    for (const Figure& figure : table.figures) {
      std::printf("%s%s", std::exchange(comma, ","), JsonOf(figure).c_str());
    }
    std::printf("],\"notes\":[");
    comma = "";
    for (const std::string& note : table.notes) {
      std::printf("%s%s", std::exchange(comma, ","), Quoted(note).c_str());
    }
    std::printf("]}");
    separator = ",\n";
  }
  std::puts(tables_.empty() ? "[]" : "]");
}

}  // namespace bench
