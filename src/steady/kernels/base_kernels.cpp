// SPDX-License-Identifier: MIT
#define N3DS_KERNEL_SET base_kernels
#include "steady/kernels/kernel_set.h"

namespace n3ds::steady {

#if N3DS_SIMD_AVX2
namespace avx2_kernels {
const Kernels& Table();
}
#endif

const Kernels& BaseKernels() { return base_kernels::kKernels; }

const Kernels& BestKernels() {
#if N3DS_SIMD_AVX2
  if (HasAvx2()) return avx2_kernels::Table();
#endif
  return BaseKernels();
}

}  // namespace n3ds::steady
