// SPDX-License-Identifier: MIT
#include "eigen_product.h"

#include <Eigen/Core>

namespace n3ds::bench {
namespace {

using Matrix = Eigen::Matrix<float, Eigen::Dynamic, Eigen::Dynamic, Eigen::RowMajor>;
using ConstMap = Eigen::Map<const Matrix>;
using Map = Eigen::Map<Matrix>;

}  // namespace

void EigenProduct(float* C, const float* A, const float* B, int m, int k, int n) {
  if (n == 1) {
    Eigen::Map<Eigen::VectorXf>(C, m).noalias() =
        ConstMap(A, m, k) * Eigen::Map<const Eigen::VectorXf>(B, k);
  } else {
    Map(C, m, n).noalias() = ConstMap(A, m, k) * ConstMap(B, k, n);
  }
}

}  // namespace n3ds::bench
