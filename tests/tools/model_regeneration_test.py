#!/usr/bin/env python3
"""Makes the face model anew and compares it with data/: SOURCE_FOLDER SCRATCH_FOLDER.

Numbers and meshes have to be the same bit for bit, pictures dot for dot. Ends with status 77 where
numpy and scipy are missing, which ctest counts as skipped.
"""

import shutil
import subprocess
import sys
from pathlib import Path

SKIPPED = 77
MODEL = ["face_model.bin", "triangles.inc", "texture_coordinates.inc", "expression_names.inc"]
OBJECTS = ["face.obj", "head_occluder.obj"]
PICTURES = ["face_template.png", "template/mask_area.png", "template/wireframe.png",
            "template/feature_lines.png", "template/landmark_numbers.png"]


def is_there(*modules):
    try:
        for module in modules:
            __import__(module)
        return True
    except ImportError as error:
        print(f"skipped: {error}")
        return False


def same_picture(one, other):
    from PIL import Image
    a, b = (Image.open(path).convert("RGBA") for path in (one, other))
    return a.size == b.size and a.tobytes() == b.tobytes()


def main():
    source, scratch = (Path(argument) for argument in sys.argv[1:3])
    if not is_there("numpy", "scipy"):
        return SKIPPED
    shutil.rmtree(scratch, ignore_errors=True)
    tools = source / "tools" / "face_model"
    subprocess.run([sys.executable, tools / "generate.py", "--out", scratch], check=True)
    wrong = [name for name in MODEL
             if (scratch / name).read_bytes() != (source / "data" / name).read_bytes()]
    if is_there("PIL"):
        subprocess.run([sys.executable, tools / "artists.py", "--data", scratch], check=True)
        wrong += [name for name in OBJECTS
                  if (scratch / name).read_bytes() != (source / "data" / name).read_bytes()]
        wrong += [name for name in PICTURES
                  if not same_picture(scratch / name, source / "data" / name)]
    for name in wrong:
        print(f"data/{name} is not what tools/face_model makes")
    return 1 if wrong else 0


if __name__ == "__main__":
    sys.exit(main())
