// SPDX-License-Identifier: MIT
// A face's mesh as one matrix-vector product in Eigen.
#pragma once

#include <cstdint>
#include <memory>

namespace n3ds::bench {

// The model as a matrix of floats, a column each for the mean shape, the 16 identity and 20
// expression vectors and the pairs of both that take part in a mesh; 1812 vertices, x, y, z.
class EigenMesh {
 public:
  EigenMesh(const int16_t* mean, const int16_t* identity, const int16_t* expression,
            const int16_t* tensor);
  ~EigenMesh();

  // shape: 3 x 1812 floats, mm.
  void Build(const float* identity_coef, const float* expression_coef, float* shape) const;

 private:
  struct Matrix;
  std::unique_ptr<Matrix> matrix_;
};

}  // namespace n3ds::bench
