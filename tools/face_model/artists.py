#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""Writes what artists need from the model in data/: python3 tools/face_model/artists.py

data/face.obj           mean face with texture coordinates, upright head frame, mm
data/head_occluder.obj  a closed head-shaped shell to hide the far parts of hats and glasses
data/face_template.png  the texture's layers in one picture, 2048 x 2048
data/template/*.png     the layers: mask_area, feature_lines, wireframe, landmark_numbers
"""

import argparse
from pathlib import Path

import numpy as np
from PIL import Image, ImageDraw

import measurements
import tables
from arithmetic import length
from shipped import Model
from triangulate import boundary_edges, boundary_rings, edge_owners

SIZE = 2048
# Chains of landmarks that outline the features.
FEATURES = [
    list(range(19, 29)) + [19], list(range(29, 39)) + [29],
    list(range(39, 51)) + [39], list(range(51, 63)) + [51],
    [97, 98, 99, 100], list(range(63, 75)),
    list(range(75, 87)) + [75], list(range(87, 95)) + [87],
]
# The occluder: the face pulled back a little, and a skull behind it (centre and half axes, mm).
SKULL_CENTRE = np.array([0.0, 34.0, -14.0])
SKULL_AXES = np.array([72.0, 92.0, 84.0])
PULL = 0.985


def write_obj(path, comment, points, triangles, texture=None):
    with open(path, "w", newline="\n") as file:
        file.write(f"# {comment}\n")
        for p in points:
            file.write("v {:.3f} {:.3f} {:.3f}\n".format(*p))
        if texture is not None:
            for u, v in texture:
                file.write(f"vt {u:.6f} {1.0 - v:.6f}\n")
        for t in triangles + 1:
            corner = "{0}/{0}" if texture is not None else "{0}"
            file.write("f " + " ".join(corner.format(k) for k in t) + "\n")


def skull(rings=24, sectors=40):
    """An ellipsoid for the part of the head that the mask leaves out."""
    points, triangles = [], []
    for r in range(rings + 1):
        polar = np.pi * r / rings
        for s in range(sectors):
            turn = 2 * np.pi * s / sectors
            unit = [np.sin(polar) * np.sin(turn), np.cos(polar), np.sin(polar) * np.cos(turn)]
            points.append(SKULL_CENTRE + SKULL_AXES * unit)
    for r in range(rings):
        for s in range(sectors):
            a, b = r * sectors + s, r * sectors + (s + 1) % sectors
            c, d = a + sectors, b + sectors
            triangles += [(a, c, b), (b, c, d)]
    points, triangles = np.array(points), np.array(triangles)
    a, b, c = (points[triangles[:, k]] for k in range(3))
    return points, triangles[length(np.cross(b - a, c - a)) > 1e-6]


def occluder(model):
    """The face without its holes, pulled back, and the skull."""
    caps, extra = [], []
    for ring in boundary_rings(model.triangles):
        if len(ring) < 50:  # an eye or the mouth
            centre = len(model.mean) + len(extra)
            extra.append(model.mean[ring].mean(axis=0))
            caps += [(b, a, centre) for a, b in zip(ring, ring[1:] + ring[:1])]
    points = np.concatenate([model.mean, np.array(extra)])
    points = SKULL_CENTRE * [0, 1, 0] + PULL * (points - SKULL_CENTRE * [0, 1, 0])
    face = np.concatenate([model.triangles, np.array(caps)])
    back, shell = skull()
    return np.concatenate([points, back]), np.concatenate([face, shell + len(points)])


def layer():
    image = Image.new("RGBA", (SIZE, SIZE), (0, 0, 0, 0))
    return image, ImageDraw.Draw(image)


def layers(model):
    place = [tuple(p) for p in model.texture * SIZE]
    vertices = tables.landmark_vertices()
    out = {}
    image, draw = layer()
    for t in model.triangles.tolist():
        draw.polygon([place[v] for v in t], fill=(226, 190, 168, 255))
    out["mask_area"] = image
    image, draw = layer()
    for a, b in sorted(edge_owners(model.triangles)):
        draw.line([place[a], place[b]], fill=(70, 90, 150, 255), width=1)
    out["wireframe"] = image
    image, draw = layer()
    for chain in FEATURES:
        draw.line([place[vertices[k]] for k in chain], fill=(170, 40, 40, 255), width=4)
    for a, b in boundary_edges(model.triangles):
        draw.line([place[a], place[b]], fill=(90, 20, 20, 255), width=4)
    out["feature_lines"] = image
    image, draw = layer()
    for landmark, vertex in sorted(vertices.items()):
        x, y = place[vertex]
        draw.ellipse([x - 4, y - 4, x + 4, y + 4], fill=(20, 110, 40, 255))
        draw.text((x + 6, y - 12), str(landmark), fill=(10, 70, 20, 255))
    out["landmark_numbers"] = image
    return out


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("--data", type=Path, default=measurements.DATA,
                        help="folder with the model, to which the files are added")
    data = parser.parse_args().data
    model = Model(data)
    write_obj(data / "face.obj", "Mean face, upright head frame: x image right, y up, z out; mm.",
              model.mean, model.triangles, model.texture)
    points, triangles = occluder(model)
    write_obj(data / "head_occluder.obj", "Head occluder, same frame as face.obj.",
              points, triangles)
    folder = data / "template"
    folder.mkdir(exist_ok=True)
    whole = Image.new("RGBA", (SIZE, SIZE), (255, 255, 255, 255))
    made = layers(model)
    for name in ("mask_area", "wireframe", "feature_lines", "landmark_numbers"):
        whole.alpha_composite(made[name])
        made[name].quantize(16, method=Image.Quantize.FASTOCTREE).save(
            folder / f"{name}.png", optimize=True)
    whole.convert("RGB").quantize(32, dither=Image.Dither.NONE).save(
        data / "face_template.png", optimize=True)


if __name__ == "__main__":
    main()
