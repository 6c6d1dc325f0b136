// SPDX-License-Identifier: MIT
// What the checks of a face model found.
#pragma once

#include <cstddef>
#include <ostream>
#include <string>
#include <vector>

namespace n3ds::tool {

struct CheckLine {
  std::string name;
  std::string value;  // empty for a plain yes or no
  std::string limit;  // empty for a figure that is only reported
  bool passed = true;
};

class CheckReport {
 public:
  void Section(const std::string& title) { sections_.push_back({title, {}}); }
  // A figure that is good or bad as it is.
  void Check(const std::string& name, const std::string& value, bool passed,
             const std::string& limit = "");
  // Figures with a limit they have to stay under, or that is the only good value.
  void Below(const std::string& name, double value, int decimals, double limit);
  void Equal(const std::string& name, std::size_t value, std::size_t wanted);
  // A figure for information.
  void Figure(const std::string& name, const std::string& value) { Check(name, value, true); }

  std::size_t checks() const;
  std::vector<CheckLine> failures() const;
  void Print(std::ostream& out) const;

 private:
  struct Part {
    std::string title;
    std::vector<CheckLine> lines;
  };
  std::vector<Part> sections_;
};

}  // namespace n3ds::tool
