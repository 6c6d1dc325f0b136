// SPDX-License-Identifier: MIT
// Where the tool's own files are: the face model and the stickers.
#pragma once

#include <string>

namespace n3ds::tool {

// The first that is there of: the folder that the environment variable N3DS_DATA_DIR names,
// ../share/norvale-3d-sticker beside the program, the source tree it was built from. Throws Error
// that lists where it looked.
std::string DefaultModelPath();
// The same for a file of the stickers, in the folder `assets` of the first two places.
std::string StickerPath(const std::string& name);

}  // namespace n3ds::tool
