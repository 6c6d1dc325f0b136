// SPDX-License-Identifier: MIT
// Scores of several tracks as one table, with a last row over all of them.
#pragma once

#include <cstddef>
#include <string>
#include <utility>
#include <vector>

#include "eval/mesh_metrics.h"
#include "eval/metrics.h"
#include "eval/text_table.h"

namespace n3ds::tool {

using NamedScores = std::vector<std::pair<std::string, Score>>;

// `meshes` is empty, or holds a score a track in the same order; then columns for them follow.
TextTable ScoreTable(const NamedScores& scores, const std::vector<MeshScore>& meshes = {});

// The columns that say most, for a terminal of usual width.
std::vector<std::size_t> MainColumns(bool with_meshes);

// What the columns mean, for help texts and below printed tables.
extern const char kScoreTableLegend[];
extern const char kMeshColumnsLegend[];

}  // namespace n3ds::tool
