#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""Cuts the landmark tracks of examples/tracks out of longer recordings, and examples/one_face.txt.

    tools/assets/make_example_tracks.py SYNTHETIC_FOLDER REAL_FOLDER [--out FOLDER]

The folders hold the whole tracks named below. They are not in the repository: they are longer
recordings, of synthetic faces and of what a detector found in the pictures that THIRD_PARTY.md
names. The script is kept to show how the examples were cut from them.

A cut keeps every `step`th frame, numbers the frames anew from 0, rounds the truth to six digits and
drops the true 3-D points. Two tracks are turned and mirrored as a phone's cameras would deliver
them.
"""

import argparse
import json
import pathlib

# name of the example: folder, track, first frame, end, step, degree, mirror
CUTS = {
    "synthetic_natural": ("synthetic", "s01_natural_101", 60, 140, 1, 0, 0),
    "synthetic_talk_165": ("synthetic", "s02_talk_expressions_165", 70, 130, 1, 0, 0),
    "synthetic_yaw_sweep": ("synthetic", "s03_yaw_sweep_exact", 0, 100, 1, 0, 0),
    "synthetic_three": ("synthetic", "s04_three", 64, 104, 1, 0, 0),
    "synthetic_five_cross": ("synthetic", "s05_five_cross", 186, 236, 1, 0, 0),
    "synthetic_mirror_portrait": ("synthetic", "s06_mirror_portrait", 240, 300, 1, 0, 1),
    "real_expressions": ("real", "expressions_a", 450, 530, 1, 0, 0),
    "real_two_people": ("real", "two_people_turning_x2", 0, 56, 1, 0, 0),
    "real_head_move_90": ("real", "head_move_a_x2", 30, 100, 1, 90, 0),
    "real_man_270_mirror": ("real", "man_turning", 0, 62, 2, 270, 1),
    "photo_astronaut": ("real", "photo_astronaut", 0, 1, 1, 0, 0),
    "photo_group_2": ("real", "photo_group_2", 0, 1, 1, 0, 0),
    "photo_group_3": ("real", "photo_group_3", 0, 1, 1, 0, 0),
    "photo_group_5": ("real", "photo_group_5", 0, 1, 1, 0, 0),
    "photo_portrait": ("real", "photo_portrait_a", 0, 1, 1, 0, 0),
}

# Runs of the layout that mirroring reverses: landmark k from first to last, or the partner of such
# a landmark, changes places with total - k.
MIRROR_RUNS = [(0, 18, 18), (19, 24, 53), (25, 28, 63), (39, 45, 96), (46, 50, 108), (63, 74, 137),
               (75, 81, 156), (82, 86, 168), (87, 91, 178), (92, 94, 186), (95, 96, 191)]


def partner(k):
    for first, last, total in MIRROR_RUNS:
        if first <= k <= last or first <= total - k <= last:
            return total - k
    return k


def delivered(points, width, height, degree, mirror):
    """From the upright picture of width x height to the picture as delivered."""
    pairs = list(zip(points[::2], points[1::2]))
    if mirror:
        if len(pairs) != 101:
            raise ValueError("mirroring is written for 101 landmarks")
        pairs = [pairs[partner(k)] for k in range(len(pairs))]
    turned = {0: lambda x, y: (x, y), 90: lambda x, y: (y, width - x),
              180: lambda x, y: (width - x, height - y), 270: lambda x, y: (height - y, x)}[degree]
    pairs = [turned(x, y) for x, y in pairs]
    if mirror:
        delivered_width = height if degree in (90, 270) else width
        pairs = [(delivered_width - x, y) for x, y in pairs]
    return [value for pair in pairs for value in pair]


def rounded(value):
    return float(f"{value:.6g}")


def cut(source, first, end, step, degree, mirror):
    lines = source.read_text().splitlines()
    header = json.loads(lines[0])
    frames = [json.loads(line) for line in lines[1 + first:1 + end:step]]
    width, height = header["width"], header["height"]
    header["fps"] = rounded(header["fps"] / step)
    turn = (header["degree"], header["mirror"]) != (degree, mirror)
    if turn:
        if header["degree"] or header["mirror"]:
            raise ValueError(f"{source}: only upright tracks can be turned")
        if degree in (90, 270):
            header["width"], header["height"] = height, width
        header["degree"], header["mirror"] = degree, mirror
    if len(lines) > 2:
        title = header.get("title", "")
        every = f", one in {step}" if step > 1 else ""
        header["title"] = f"{title + ': ' if title else ''}frames {first} to {end - 1}{every}"
    for number, frame in enumerate(frames):
        frame["frame"] = number
        for face in frame["faces"]:
            if turn:
                face["points"] = delivered(face["points"], width, height, degree, mirror)
            if "truth" in face:
                truth = face["truth"]
                face["truth"] = {name: [rounded(v) for v in truth[name]]
                                 for name in ("rotation", "translation")}
    return [header] + frames


def as_plain_numbers(lines, frames):
    """The input of the small example programs: numbers and blanks alone."""
    header = lines[0]
    rows = [f"{header['width']} {header['height']} {header['landmarks']}"]
    for frame in lines[1:1 + frames]:
        rows.append(str(len(frame["faces"])))
        rows += [" ".join(map(str, face["points"])) for face in frame["faces"]]
    return "\n".join(rows) + "\n"


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("synthetic", type=pathlib.Path, help="folder of the whole synthetic tracks")
    parser.add_argument("real", type=pathlib.Path, help="folder of the whole real tracks")
    parser.add_argument("--out", type=pathlib.Path, help="folder to write to",
                        default=pathlib.Path(__file__).resolve().parents[2] / "examples" / "tracks")
    arguments = parser.parse_args()
    folders = {"synthetic": arguments.synthetic, "real": arguments.real}
    out = arguments.out
    out.mkdir(parents=True, exist_ok=True)
    for name, (folder, track, *how) in CUTS.items():
        lines = cut(folders[folder] / f"{track}.track.jsonl", *how)
        text = "".join(json.dumps(line, separators=(",", ":")) + "\n" for line in lines)
        (out / f"{name}.track.jsonl").write_text(text)
        if name == "synthetic_natural":
            (out.parent / "one_face.txt").write_text(as_plain_numbers(lines, 12))


if __name__ == "__main__":
    main()
