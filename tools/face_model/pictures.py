#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""Draws the pictures of docs/face-model.md: python3 tools/face_model/pictures.py"""

import argparse

import numpy as np

import measurements
import tables
from render import draw, row, save, turned
from shipped import Model

FOLDER = measurements.DATA.parent / "docs" / "face-model"
CENTRE = np.array([0.0, -5.0, 50.0])


def view(model, points, yaw=0.0, pitch=0.0, size=220, **options):
    return draw(turned(points - CENTRE, yaw, pitch), model.triangles, size=size, centre=(0, 0),
                **options)


def main():
    argparse.ArgumentParser(description=__doc__.splitlines()[0]).parse_args()
    FOLDER.mkdir(parents=True, exist_ok=True)
    model = Model(measurements.DATA)
    views = [view(model, model.mean, y, p, 360, wires=w)
             for y, p, w in ((0, 0, False), (40, 0, False), (88, 0, False), (0, 0, True))]
    save(FOLDER / "mean.png", row(views), 64)
    rows = [row([view(model, model.mean + s * 2.5 * model.identity[k], y)
                 for s in (-1, 1) for y in (0, 40)]) for k in range(6)]
    save(FOLDER / "identity.png", np.concatenate(rows), 64)
    faces = [np.concatenate([view(model, model.mean + move, y, span=245.0) for y in (0, 45)])
             for move in model.expression]
    rows = [row(faces[k:k + 5]) for k in range(0, 20, 5)]
    save(FOLDER / "expressions.png", np.concatenate(rows), 64)
    colours = np.full((len(model.mean), 3), [224.0, 188.0, 166.0])
    colours[tables.contour_candidates()] = [60.0, 120.0, 220.0]
    for vertex in tables.landmark_vertices().values():
        colours[vertex] = [220.0, 30.0, 30.0]
    views = [view(model, model.mean, y, p, 400, wires=True, colours=colours)
             for y, p in ((0, 0), (50, 0), (0, 45))]
    save(FOLDER / "candidates.png", row(views), 64)


if __name__ == "__main__":
    main()
