// SPDX-License-Identifier: MIT
// The kernels of the including source's instruction set, as a table.
#pragma once

#include "steady/kernels/kernels.h"
#include "steady/kernels/offsets.h"
#include "steady/kernels/points.h"
#include "steady/kernels/rows.h"
#include "steady/kernels/update.h"

namespace n3ds::steady::N3DS_KERNEL_SET {

constexpr Kernels kKernels = {MakePersonal, FacePoints,        Residuals,
                              LinearRows,   FactorCovariance,  SolveStep,
                              Posterior,    PredictCovariance, UpdateOffsets};

}  // namespace n3ds::steady::N3DS_KERNEL_SET
