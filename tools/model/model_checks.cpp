// SPDX-License-Identifier: MIT
#include "model/model_checks.h"

namespace n3ds::tool {

CheckReport CheckModel(const FaceModelFile& model, double identity_unit) {
  CheckReport report;
  CheckForm(model, report);
  CheckSymmetry(model, report);
  CheckShape(model, identity_unit, report);
  CheckInteraction(model, identity_unit, report);
  CheckTexture(model, report);
  return report;
}

}  // namespace n3ds::tool
