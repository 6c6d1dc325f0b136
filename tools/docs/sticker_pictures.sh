#!/usr/bin/env bash
# SPDX-License-Identifier: MIT
# Draws the stickers and masks of README.md with n3ds, in 256 colours to keep the repository small.
#   tools/docs/sticker_pictures.sh     after ./demo, which builds n3ds and fetches the photo
set -euo pipefail
cd "$(dirname "$0")/../.."

pictures=docs/pictures
large=$(mktemp --suffix=.png)
trap 'rm -f "$large"' EXIT
mkdir -p "$pictures"

# shrink NAME OPTION...: keeps the large picture as a small one; options of ffmpeg's filters
shrink() {
  ffmpeg -v error -y -i "$large" \
    -lavfi "${2:-null},split[a][b];[a]palettegen[p];[b][p]paletteuse=dither=sierra2_4a" "$pictures/$1.png"
}

# draw NAME TRACK OPTION...
draw() {
  build/release/n3ds render "examples/tracks/$2.track.jsonl" --out "$large" "${@:3}"
  shrink "$1"
}

# mask NAME TEXTURE FORMAT: a mask on the photo through the engine's own warp and blend
mask() {
  build/release/n3ds mask out/photos/astronaut.png examples/tracks/photo_astronaut.track.jsonl \
    --texture "examples/assets/$2.png" --format "$3" --out "$large"
  shrink "$1" crop=240:240:110:0
}

draw yaw_sweep synthetic_yaw_sweep --contact-sheet 9 --size 300x300
draw five_cross synthetic_five_cross --contact-sheet 4 --size 480x270
draw real_two_people real_two_people --contact-sheet 4 --size 400x225
# The photo is NASA's, in the public domain.
draw astronaut photo_astronaut --image out/photos/astronaut.png --size 400x400 --draw hat,glasses
mask mask_bgr24 mask_gold bgr24
mask mask_nv21 mask_tiger nv21
draw mask_talk synthetic_talk_165 --mode mask --texture examples/assets/mask_tiger.png \
  --contact-sheet 12 --closeup --size 160x190
