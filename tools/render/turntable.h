// SPDX-License-Identifier: MIT
// A face seen from several sides, lit, for looking at models.
#pragma once

#include "render/image.h"
#include "support/vector3.h"

namespace n3ds::tool {

// `views` images of `size` x `size` pixels side by side, from one profile to the other; a single
// one shows the front. The head turns before a camera that stays. Throws Error when the graphics
// system refuses.
Image DrawTurntable(const Points& face, int views, int size);

}  // namespace n3ds::tool
