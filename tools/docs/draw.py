# SPDX-License-Identifier: MIT
"""Draws the pictures of docs/coordinates.md into docs/coordinates/.

Needs Debian's python3-numpy, python3-pil and fonts-dejavu-core:

    /usr/bin/python3 tools/docs/draw.py

The pictures depend on data/face_statistics alone; a second run gives the same bytes.
"""

import argparse
from pathlib import Path

import frame_pictures
import landmark_pictures
import orientation_pictures

FOLDER = Path(__file__).resolve().parents[2] / "docs" / "coordinates"


def main():
    argparse.ArgumentParser(description=__doc__.splitlines()[0]).parse_args()
    FOLDER.mkdir(parents=True, exist_ok=True)
    frame_pictures.draw_pixel(FOLDER)
    frame_pictures.draw_camera(FOLDER)
    frame_pictures.draw_head(FOLDER)
    landmark_pictures.draw_101(FOLDER)
    landmark_pictures.draw_165(FOLDER)
    orientation_pictures.draw(FOLDER)


if __name__ == "__main__":
    main()
