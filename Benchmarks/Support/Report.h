// SPDX-License-Identifier: Apache-2.0
//
// Collects figures and prints them: a table for people, JSON for programs. One thread.
#pragma once

#include <optional>
#include <string>
#include <vector>

namespace bench {

/// One line of a table. A ratio compares with the line named in the table's heading.
struct Figure {
  std::string name;
  double value = 0;
  std::optional<double> ratio;
  std::optional<double> goal;  // the most that `ratio`, or without one `value`, should be
};

struct Table {
  std::string title;
  std::string unit;  // of `value`
  std::vector<Figure> figures;
  std::vector<std::string> notes;
};

class Report {
 public:
  /// With `json`, nothing is printed before print(); else each table as soon as it is added.
  explicit Report(bool json) : json_(json) {}

  void add(Table table);
  /// Prints the JSON form, where it was asked for.
  void finish() const;

 private:
  const bool json_;
  std::vector<Table> tables_;
};

}  // namespace bench
