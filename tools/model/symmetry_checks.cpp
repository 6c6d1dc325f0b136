// SPDX-License-Identifier: MIT
#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <optional>
#include <set>
#include <string>

#include "mesh/face_tables.h"
#include "model/model_checks.h"

namespace n3ds::tool {
namespace {

constexpr double kMiddle = 0.499946;  // u of the line about which the texture is symmetric
constexpr double kNear = 2e-6;        // the table has six decimals

using Mirror = std::vector<std::size_t>;  // the mirrored vertex of each vertex

std::optional<Mirror> MirrorByTexture() {
  const std::vector<Place>& texture = FaceTexture();
  Mirror mirror;
  std::set<std::size_t> taken;
  for (const Place& place : texture) {
    const auto found = std::find_if(texture.begin(), texture.end(), [&](const Place& other) {
      return std::abs(2 * kMiddle - place[0] - other[0]) < kNear &&
             std::abs(place[1] - other[1]) < kNear;
    });
    if (found == texture.end()) return std::nullopt;
    mirror.push_back(static_cast<std::size_t>(found - texture.begin()));
    taken.insert(mirror.back());
  }
  if (taken.size() != texture.size()) return std::nullopt;
  return mirror;
}

// The triangle with its smallest vertex first.
Triangle Turned(Triangle t) {
  std::rotate(t.begin(), std::min_element(t.begin(), t.end()), t.end());
  return t;
}

bool AreTrianglesSymmetric(const Mirror& mirror) {
  std::set<Triangle> plain;
  std::set<Triangle> mirrored;
  for (const Triangle& t : FaceTriangles()) {
    plain.insert(Turned(t));
    mirrored.insert(Turned({mirror[t[2]], mirror[t[1]], mirror[t[0]]}));
  }
  return plain == mirrored;
}

bool IsSetSymmetric(const std::vector<std::size_t>& vertices, const Mirror& mirror) {
  const std::set<std::size_t> all(vertices.begin(), vertices.end());
  return std::all_of(all.begin(), all.end(),
                     [&](std::size_t v) { return all.count(mirror[v]) > 0; });
}

struct Partner {
  std::size_t number;
  int sign;
};

// The expression that is the mirror image, and the sign with which it is: left and right change
// places, and a movement to the side changes its direction.
Partner PartnerOf(std::size_t expression) {
  const auto ends_with = [&](const std::string& name, const std::string& ending) {
    return name.size() > ending.size() &&
           name.compare(name.size() - ending.size(), ending.size(), ending) == 0;
  };
  std::string name = ExpressionNames()[expression];
  if (ends_with(name, "_side")) return {expression, -1};
  if (ends_with(name, "_L")) {
    name.back() = 'R';
  } else if (ends_with(name, "_R")) {
    name.back() = 'L';
  }
  return {ExpressionByName(name), 1};
}

// The largest difference between a shape and `sign` times the mirror image of its partner, in the
// file's numbers. Pitching does not mix x with the others, so it may stay as it is.
template <typename Integer>
int Asymmetry(const Integer* shape, const Integer* partner, int sign, const Mirror& mirror) {
  int largest = 0;
  for (std::size_t v = 0; v < kModelVertices; ++v) {
    for (std::size_t k = 0; k < 3; ++k) {
      const int image = (k == 0 ? -sign : sign) * int{partner[3 * mirror[v] + k]};
      largest = std::max(largest, std::abs(int{shape[3 * v + k]} - image));
    }
  }
  return largest;
}

void CheckShapes(const FaceModelFile& model, const Mirror& mirror, CheckReport& report) {
  int identity = 0;
  for (std::size_t i = 0; i < kModelIdentities; ++i) {
    const std::int16_t* shape = &model.identity[i * kModelCoordinates];
    identity = std::max(identity, Asymmetry(shape, shape, 1, mirror));
  }
  int expression = 0;
  int interaction = 0;
  for (std::size_t e = 0; e < kModelExpressions; ++e) {
    const Partner partner = PartnerOf(e);
    expression =
        std::max(expression, Asymmetry(&model.expression[e * kModelCoordinates],
                                       &model.expression[partner.number * kModelCoordinates],
                                       partner.sign, mirror));
    for (std::size_t i = 0; i < kModelIdentities; ++i) {
      const auto block = [&](std::size_t number) {
        return &model.interaction[(i * kModelExpressions + number) * kModelCoordinates];
      };
      interaction =
          std::max(interaction, Asymmetry(block(e), block(partner.number), partner.sign, mirror));
    }
  }
  const int mean = Asymmetry(model.mean.data(), model.mean.data(), 1, mirror);
  const auto equal = [&](const char* name, int value) {
    report.Equal(name, static_cast<std::size_t>(value), 0);
  };
  equal("mean against its mirror image, 1/256 mm", mean);
  equal("identity modes, 1/256 mm", identity);
  equal("expressions against their partners, 1/256 mm", expression);
  equal("interaction, steps", interaction);
}

}  // namespace

void CheckSymmetry(const FaceModelFile& model, CheckReport& report) {
  report.Section("Symmetry");
  const std::optional<Mirror> mirror = MirrorByTexture();
  report.Check("every vertex has a mirror image in the texture", "", mirror.has_value());
  if (!mirror) return;
  report.Check("the triangles are their own mirror image", "", AreTrianglesSymmetric(*mirror));
  report.Check("so are the contour candidates", "", IsSetSymmetric(ContourCandidates(), *mirror));
  report.Check("so are the landmarks' vertices", "", IsSetSymmetric(LandmarkVertices(), *mirror));
  CheckShapes(model, *mirror, report);
}

}  // namespace n3ds::tool
