// Scores of several tracks as one table, with a last row over all of them.
#pragma once

#include <string>
#include <utility>
#include <vector>

#include "eval/metrics.h"
#include "eval/text_table.h"

namespace n3ds::tool {

using NamedScores = std::vector<std::pair<std::string, Score>>;

TextTable ScoreTable(const NamedScores& scores);

// What the columns mean, for help texts and below printed tables.
extern const char kScoreTableLegend[];

}  // namespace n3ds::tool
