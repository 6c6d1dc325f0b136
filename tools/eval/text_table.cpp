// SPDX-License-Identifier: MIT
#include "eval/text_table.h"

#include <algorithm>
#include <cstddef>
#include <cstdio>
#include <utility>

namespace n3ds::tool {

TextTable::TextTable(std::vector<std::string> head) { rows_.push_back(std::move(head)); }

void TextTable::AddRow(std::vector<std::string> row) { rows_.push_back(std::move(row)); }

void TextTable::Print(std::ostream& out) const {
  std::vector<std::size_t> widths(rows_.front().size(), 0);
  for (const auto& row : rows_) {
    for (std::size_t c = 0; c < row.size(); ++c) widths[c] = std::max(widths[c], row[c].size());
  }
  for (const auto& row : rows_) {
    std::string line = row[0] + std::string(widths[0] - row[0].size(), ' ');
    for (std::size_t c = 1; c < row.size(); ++c) {
      line += std::string(widths[c] - row[c].size() + 2, ' ') + row[c];
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
