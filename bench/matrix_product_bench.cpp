// SPDX-License-Identifier: MIT
// The float matrix product at the sizes of the fits, beside Eigen. Every run is checked against the
// product in double; the counter `error` is the largest difference, relative to the sum of the
// terms' magnitudes.
#include <benchmark/benchmark.h>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <vector>

#include "eigen_product.h"
#include "norvale_3d_sticker_core.h"
#include "platform/matrix_product.h"
#include "support/random.h"

namespace {

struct Operands {
  int m, k, n;
  std::vector<float> A, B, C;

  explicit Operands(const benchmark::State& state)
      : m(static_cast<int>(state.range(0))),
        k(static_cast<int>(state.range(1))),
        n(static_cast<int>(state.range(2))),
        A(static_cast<size_t>(m) * k),
        B(static_cast<size_t>(k) * n),
        C(static_cast<size_t>(m) * n) {
    n3ds::testing::Random random(7);
    for (float& a : A) a = random.Float(-1.0f, 1.0f);
    for (float& b : B) b = random.Float(-1.0f, 1.0f);
  }

  double Error() const {
    double worst = 0.0;
    for (int i = 0; i < m; ++i) {
      for (int j = 0; j < n; ++j) {
        double sum = 0.0;
        double magnitude = 0.0;
        for (int p = 0; p < k; ++p) {
          const double term = double{A[i * k + p]} * B[p * n + j];
          sum += term;
          magnitude += std::abs(term);
        }
        worst = std::max(worst, std::abs(sum - C[i * n + j]) / magnitude);
      }
    }
    return worst;
  }
};

template <typename Multiply>
void Run(benchmark::State& state, Multiply multiply) {
  Operands operands(state);
  for (auto _ : state) {
    multiply(operands.C.data(), operands.A.data(), operands.B.data(), operands.m, operands.k,
             operands.n);
    benchmark::ClobberMemory();
  }
  const double error = operands.Error();
  if (!(error < 1e-6)) state.SkipWithError("wrong product");
  state.counters["error"] = error;
}

void Engine(benchmark::State& state) { Run(state, mcvMatrixMulMatrixRowMajor_f32); }
void EnginePortable(benchmark::State& state) { Run(state, n3ds::MultiplyPortable); }
void Eigen(benchmark::State& state) { Run(state, n3ds::bench::EigenProduct); }

// Normal matrices and right-hand sides of the pose, identity and expression fits.
void FitSizes(benchmark::internal::Benchmark* benchmark) {
  for (const int columns : {0, 1}) {
    benchmark->Args({7, 190, columns == 0 ? 7 : 1});
    benchmark->Args({16, 266, columns == 0 ? 16 : 1});
    benchmark->Args({20, 210, columns == 0 ? 20 : 1});
  }
}

BENCHMARK(Engine)->Apply(FitSizes);
BENCHMARK(Eigen)->Apply(FitSizes);
BENCHMARK(EnginePortable)->Apply(FitSizes);

}  // namespace

int main(int argc, char** argv) {
#if defined(__x86_64__)
  if (n3ds::SimdMatrixProduct() == nullptr) {
    std::fprintf(stderr, "The Eigen part is compiled for AVX2 and FMA, which are missing here.\n");
    return 1;
  }
#endif
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
  benchmark::RunSpecifiedBenchmarks();
  return 0;
}
