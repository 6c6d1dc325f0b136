// SPDX-License-Identifier: MIT
#include "eigen_mesh.h"

#include <Eigen/Core>
#include <vector>

#include "core/model_tables.h"

namespace n3ds::bench {

namespace {

struct Pair {
  int identity, expression;
};

// Those of even index sum, and all of the last identity.
std::vector<Pair> Pairs() {
  std::vector<Pair> pairs;
  for (int k = 0; k < kIdentityCount; ++k) {
    for (int j = 0; j < kExpressionCount; ++j) {
      if ((k + j) % 2 == 0 || k == kIdentityCount - 1) pairs.push_back({k, j});
    }
  }
  return pairs;
}

}  // namespace

struct EigenMesh::Matrix {
  std::vector<Pair> pairs = Pairs();
  Eigen::MatrixXf columns;
  mutable Eigen::VectorXf weights;
};

EigenMesh::EigenMesh(const int16_t* mean, const int16_t* identity, const int16_t* expression,
                     const int16_t* tensor)
    : matrix_(std::make_unique<Matrix>()) {
  const auto width =
      static_cast<Eigen::Index>(1 + kIdentityCount + kExpressionCount + matrix_->pairs.size());
  matrix_->columns.resize(kShapeSize, width);
  matrix_->weights.resize(width);
  Eigen::Index column = 0;
  const auto add = [&](const int16_t* vectors, int k) {
    using Words = Eigen::Matrix<int16_t, Eigen::Dynamic, 1>;
    const int16_t* vector = vectors + static_cast<ptrdiff_t>(k) * kShapeSize;
    matrix_->columns.col(column++) =
        Eigen::Map<const Words>(vector, kShapeSize).cast<float>() / 256.0f;
  };
  add(mean, 0);
  for (int k = 0; k < kIdentityCount; ++k) add(identity, k);
  for (int j = 0; j < kExpressionCount; ++j) add(expression, j);
  for (const Pair& p : matrix_->pairs) add(tensor, p.identity * kExpressionCount + p.expression);
}

EigenMesh::~EigenMesh() = default;

void EigenMesh::Build(const float* identity_coef, const float* expression_coef,
                      float* shape) const {
  Eigen::VectorXf& w = matrix_->weights;
  Eigen::Index at = 0;
  w[at++] = 1.0f;
  for (int k = 0; k < kIdentityCount; ++k) w[at++] = identity_coef[k];
  for (int j = 0; j < kExpressionCount; ++j) w[at++] = expression_coef[j];
  for (const Pair& p : matrix_->pairs) {
    w[at++] = identity_coef[p.identity] * expression_coef[p.expression];
  }
  Eigen::Map<Eigen::VectorXf>(shape, kShapeSize).noalias() = matrix_->columns * w;
}

}  // namespace n3ds::bench
