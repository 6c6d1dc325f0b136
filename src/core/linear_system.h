// SPDX-License-Identifier: MIT
// A linear least-squares problem while it is being built.
#pragma once

#include <algorithm>
#include <cstddef>

#include "norvale_3d_sticker_core.h"
#include "platform/scratch_array.h"

namespace n3ds {

// rows x kColumns coefficients and a right-hand side, with values that are not set. False without
// memory.
template <int kColumns>
class LinearSystem {
 public:
  LinearSystem(MHandle memory, int rows)
      : memory_(memory),
        rows_(rows),
        coefficients_(memory, static_cast<size_t>(rows) * kColumns),
        right_side_(memory, static_cast<size_t>(rows)) {}

  explicit operator bool() const { return coefficients_ && right_side_; }

  float* Row(int row) const { return coefficients_.get() + static_cast<ptrdiff_t>(row) * kColumns; }
  float& RightSide(int row) const { return right_side_.get()[row]; }

  // Sets rows `to` and `to` + 1 to what rows `from` and `from` + 1 say.
  void CopyTwoRows(int from, int to) const {
    std::copy_n(Row(from), 2 * kColumns, Row(to));
    std::copy_n(right_side_.get() + from, 2, right_side_.get() + to);
  }

  // Sets one row per coefficient, from `first` on, that pulls it toward zero (ridge).
  void SetRidge(int first, float weight) const {
    float* rows = Row(first);
    std::fill_n(rows, kColumns * kColumns, 0.0f);
    std::fill_n(right_side_.get() + first, kColumns, 0.0f);
    for (int k = 0; k < kColumns; ++k) rows[k * kColumns + k] = weight;
  }

  // A singular system leaves the solution as it was.
  void Solve(float* solution) const {
    SolveLinearAxb(memory_, coefficients_.get(), rows_, kColumns, solution, right_side_.get());
  }

 private:
  MHandle memory_;
  int rows_;
  ScratchArray<float> coefficients_;
  ScratchArray<float> right_side_;
};

}  // namespace n3ds
