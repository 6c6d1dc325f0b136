// SPDX-License-Identifier: MIT
// Compiled for AVX2 and run only where there is one. Nothing that other sources share may be
// instantiated here: the linker would be free to give everyone the AVX2 copy.
#define N3DS_KERNEL_SET avx2_kernels
#include "steady/kernels/kernel_set.h"

namespace n3ds::steady::avx2_kernels {

const Kernels& Table();
const Kernels& Table() { return kKernels; }

}  // namespace n3ds::steady::avx2_kernels
