// SPDX-License-Identifier: MIT
#include "eval/text_table.h"

#include <algorithm>
#include <cstddef>
#include <cstdio>
#include <numeric>
#include <utility>

namespace n3ds::tool {

TextTable::TextTable(std::vector<std::string> head) { rows_.push_back(std::move(head)); }

void TextTable::AddRow(std::vector<std::string> row) { rows_.push_back(std::move(row)); }

void TextTable::Print(std::ostream& out) const {
  std::vector<std::size_t> all(rows_.front().size());
  std::iota(all.begin(), all.end(), std::size_t{0});
  Print(out, all);
}

void TextTable::Print(std::ostream& out, const std::vector<std::size_t>& columns) const {
  std::vector<std::size_t> widths(rows_.front().size(), 0);
  for (const auto& row : rows_) {
    for (const std::size_t c : columns) widths[c] = std::max(widths[c], row[c].size());
  }
  for (const auto& row : rows_) {
    std::string line;
    for (const std::size_t c : columns) {
      const std::string blanks(widths[c] - row[c].size(), ' ');
      line += c == 0 ? row[c] + blanks : "  " + blanks + row[c];
    }
    out << line << '\n';
  }
}

void TextTable::PrintCsv(std::ostream& out) const {
  for (const auto& row : rows_) {
    for (std::size_t c = 0; c < row.size(); ++c) {
      const bool quoted = row[c].find_first_of(",\"\n") != std::string::npos;
      out << (c == 0 ? "" : ",");
      if (!quoted) {
        out << row[c];
        continue;
      }
      out << '"';
      for (const char letter : row[c]) out << (letter == '"' ? "\"\"" : std::string(1, letter));
      out << '"';
    }
    out << '\n';
  }
}

std::string Decimal(double value, int decimals) {
  char text[64];
  std::snprintf(text, sizeof text, "%.*f", decimals, value);
  return text;
}

}  // namespace n3ds::tool
