// SPDX-License-Identifier: MIT
#include "model/check_report.h"

#include <algorithm>
#include <iomanip>

#include "eval/text_table.h"

namespace n3ds::tool {

void CheckReport::Check(const std::string& name, const std::string& value, bool passed,
                        const std::string& limit) {
  sections_.back().lines.push_back({name, value, limit, passed});
}

void CheckReport::Below(const std::string& name, double value, int decimals, double limit) {
  Check(name, Decimal(value, decimals), value < limit, "< " + Decimal(limit, decimals));
}

void CheckReport::Equal(const std::string& name, std::size_t value, std::size_t wanted) {
  Check(name, std::to_string(value), value == wanted, "= " + std::to_string(wanted));
}

std::size_t CheckReport::checks() const {
  std::size_t count = 0;
  for (const Part& section : sections_) count += section.lines.size();
  return count;
}

std::vector<CheckLine> CheckReport::failures() const {
  std::vector<CheckLine> failed;
  for (const Part& section : sections_) {
    std::copy_if(section.lines.begin(), section.lines.end(), std::back_inserter(failed),
                 [](const CheckLine& line) { return !line.passed; });
  }
  return failed;
}

void CheckReport::Print(std::ostream& out) const {
  std::size_t name_width = 0;
  std::size_t value_width = 0;
  for (const Part& section : sections_) {
    for (const CheckLine& line : section.lines) {
      name_width = std::max(name_width, line.name.size());
      value_width = std::max(value_width, line.value.size());
    }
  }
  const char* gap = "";
  for (const Part& section : sections_) {
    out << gap << section.title << '\n';
    gap = "\n";
    for (const CheckLine& line : section.lines) {
      out << (line.passed ? "  ok    " : "  FAIL  ") << std::left
          << std::setw(static_cast<int>(name_width)) << line.name << "  " << std::right
          << std::setw(static_cast<int>(value_width)) << line.value;
      if (!line.limit.empty()) out << "  " << line.limit;
      out << '\n';
    }
  }
}

}  // namespace n3ds::tool
