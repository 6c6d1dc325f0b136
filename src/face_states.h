// SPDX-License-Identifier: MIT
// What a host may ask about the faces of the last frame.
#pragma once

#include "core/tracking_context.h"
#include "norvale_3d_sticker_extensions.h"
#include "steady/tracker.h"

namespace n3ds {

// All members but id, framesTracked and isNew of a face of the classic tracker.
Norvale_3DSticker_Face_State ClassicFaceState(const TrackingContext& context, uint32_t face);

// All members of a face of the steady tracker.
Norvale_3DSticker_Face_State SteadyFaceState(const steady::Model& model, const steady::Face& face);

}  // namespace n3ds
