// SPDX-License-Identifier: MIT
// A table for the terminal (columns lined up) or as CSV.
#pragma once

#include <cstddef>
#include <ostream>
#include <string>
#include <vector>

namespace n3ds::tool {

class TextTable {
 public:
  // The first column is text and lined up to the left, the others are numbers.
  explicit TextTable(std::vector<std::string> head);
  // `row` has as many cells as the head.
  void AddRow(std::vector<std::string> row);
  void Print(std::ostream& out) const;
  // The same with the given columns alone, by their number.
  void Print(std::ostream& out, const std::vector<std::size_t>& columns) const;
  void PrintCsv(std::ostream& out) const;

 private:
  std::vector<std::vector<std::string>> rows_;  // the head first
};

// A number with a fixed count of decimals.
std::string Decimal(double value, int decimals);

}  // namespace n3ds::tool
