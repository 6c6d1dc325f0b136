#!/usr/bin/env bash
# Draws the pictures of README.md with n3ds, in 256 colours to keep the repository small.
#   tools/docs/sticker_pictures.sh     after ./demo, which builds n3ds and fetches the photo
set -euo pipefail
cd "$(dirname "$0")/../.."

pictures=docs/pictures
large=$(mktemp --suffix=.png)
trap 'rm -f "$large"' EXIT
mkdir -p "$pictures"

# draw NAME TRACK OPTION...
draw() {
  build/release/n3ds render "examples/tracks/$2.track.jsonl" --out "$large" "${@:3}"
  ffmpeg -v error -y -i "$large" -lavfi "split[a][b];[a]palettegen[p];[b][p]paletteuse=dither=sierra2_4a" \
    "$pictures/$1.png"
}

draw yaw_sweep synthetic_yaw_sweep --contact-sheet 9 --size 300x300
draw five_cross synthetic_five_cross --contact-sheet 4 --size 480x270
draw real_two_people real_two_people --contact-sheet 4 --size 400x225
# The photo is NASA's, in the public domain.
draw astronaut photo_astronaut --image out/photos/astronaut.png --size 400x400 --draw hat,glasses
