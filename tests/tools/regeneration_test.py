#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""Makes what scripts have made anew and compares it with the tree.

The model is in data/, the assets are in examples/assets/. Numbers and meshes have to be the same bit
for bit, pictures dot for dot. Ends with status 77 where a library is missing, which ctest counts as
skipped.
"""

import argparse
import shutil
import subprocess
import sys
from pathlib import Path

SKIPPED = 77
MODEL = ["face_model.bin", "triangles.inc", "texture_coordinates.inc", "expression_names.inc"]
OBJECTS = ["face.obj", "head_occluder.obj"]
TEMPLATE = ["face_template.png", "template/mask_area.png", "template/wireframe.png",
            "template/feature_lines.png", "template/landmark_numbers.png"]
STICKERS = ["glasses.obj", "glasses.mtl", "hat.obj", "hat.mtl"]
MASKS = ["mask_carnival.png", "mask_tiger.png", "mask_gold.png"]


def is_there(*modules):
    try:
        for module in modules:
            __import__(module)
        return True
    except ImportError as error:
        print(f"skipped: {error}")
        return False


def is_same(one, other):
    if one.suffix != ".png":
        return one.read_bytes() == other.read_bytes()
    from PIL import Image
    a, b = (Image.open(path).convert("RGBA") for path in (one, other))
    return a.size == b.size and a.tobytes() == b.tobytes()


def run(script, *arguments):
    subprocess.run([sys.executable, script, *arguments], check=True)


def make_model(tools, scratch):
    """Folder of the originals, and the names of what was made."""
    run(tools / "face_model" / "generate.py", "--out", scratch)
    if not is_there("PIL"):
        return "data", MODEL
    run(tools / "face_model" / "artists.py", "--data", scratch)
    return "data", MODEL + OBJECTS + TEMPLATE


def make_assets(tools, scratch):
    run(tools / "assets" / "make_sticker_assets.py", "--out", scratch)
    if not is_there("PIL"):
        return "examples/assets", STICKERS
    run(tools / "assets" / "make_mask_textures.py", "--out", scratch)
    return "examples/assets", STICKERS + MASKS


def main():
    makers = {"model": make_model, "assets": make_assets}
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("source", type=Path, help="root of the project")
    parser.add_argument("scratch", type=Path, help="folder to write to, emptied first")
    parser.add_argument("what", choices=makers)
    arguments = parser.parse_args()
    source, scratch, make = arguments.source, arguments.scratch, makers[arguments.what]
    if not is_there("numpy", "scipy"):
        return SKIPPED
    shutil.rmtree(scratch, ignore_errors=True)
    scratch.mkdir(parents=True)
    folder, names = make(source / "tools", scratch)
    wrong = [name for name in names if not is_same(scratch / name, source / folder / name)]
    for name in wrong:
        print(f"{folder}/{name} is not what its script makes")
    return 1 if wrong else 0


if __name__ == "__main__":
    sys.exit(main())
