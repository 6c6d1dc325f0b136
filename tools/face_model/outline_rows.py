#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""Makes data/outline_rows.inc and data/outline_normals.inc: where outline landmarks may lie.

A detector's outline landmark lies where the face ends in the image. On the head it slides along a
line across the cheek as the head turns, each landmark along a line of its own, roughly level, round
the chin towards its middle. Every line is cut into 17 places at equal distances on the skin of the
mean face, from the ear or the jaw's edge towards the cheek; a place is three vertices of a triangle
and their shares.
"""

import argparse
import pathlib
import re

import numpy as np

ROOT = pathlib.Path(__file__).resolve().parents[2]
PLACES = 17
VERTICES = 1812
OUTLINE = 19
CHIN = 9

# The mean face is pitched against an upright head by 20 degrees; lines are laid out upright.
COSINE, SINE = 0.9397, 0.342

# Ends of the lines, mm on the upright head, x to the image right, y up, z out of the face: behind
# the landmark's own vertex and in front of it. Landmarks 0 to 7, image left; the right side mirrors
# them.
ENDS = {
    0: ((-76.5, 21, 15), (-54, 20, 70)),
    1: ((-75, 3.5, 15), (-46, 3, 78)),
    2: ((-73.5, -13.5, 15), (-40, -13, 84)),
    3: ((-71, -31, 16), (-36, -28.5, 85)),
    4: ((-67, -49, 18), (-34, -42.5, 85)),
    5: ((-59, -64.5, 32), (-34, -56, 83)),
    6: ((-47.5, -78, 51), (-36, -68, 78)),
    7: ((-34, -84, 70), (-30, -80.5, 79)),
}

# Below this point outlines run radially about it, above it level.
RADIAL_CENTRE = np.array([0.0, -22.0, 48.0])


def numbers(path):
    """All integers of an .inc file without its comments."""
    text = re.sub(r"//.*", "", path.read_text())
    return np.array([int(word) for word in re.findall(r"-?\d+", text)])


def upright_mean(data):
    raw = (data / "face_model.bin").read_bytes()
    mean = np.frombuffer(raw, "<i2", 3 * VERTICES, 12).reshape(-1, 3) / 256.0
    tilt = np.array([[1, 0, 0], [0, COSINE, SINE], [0, -SINE, COSINE]])
    return mean @ tilt


class Surface:
    """Nearest points of the mesh."""

    def __init__(self, points, triangles):
        self.points, self.triangles = points, triangles

    def nearest(self, point):
        """Triangle and barycentric shares of the place nearest to a point."""
        a, b, c = (self.points[self.triangles[:, i]] for i in range(3))
        ab, ac, ap = b - a, c - a, point - a
        d00, d01, d11 = (ab * ab).sum(1), (ab * ac).sum(1), (ac * ac).sum(1)
        d20, d21 = (ap * ab).sum(1), (ap * ac).sum(1)
        area = d00 * d11 - d01 * d01
        v, w = (d11 * d20 - d01 * d21) / area, (d00 * d21 - d01 * d20) / area
        shares = np.stack([1 - v - w, v, w], 1)
        foot = a + ab * v[:, None] + ac * w[:, None]
        inside = (shares >= 0).all(1)
        distance = np.where(inside, np.linalg.norm(foot - point, axis=1), np.inf)
        for i, j in ((0, 1), (1, 2), (2, 0)):
            start, end = self.points[self.triangles[:, i]], self.points[self.triangles[:, j]]
            edge = end - start
            t = np.clip(((point - start) * edge).sum(1) / (edge * edge).sum(1), 0, 1)
            length = np.linalg.norm(start + edge * t[:, None] - point, axis=1)
            on_edge = np.zeros_like(shares)
            on_edge[:, i], on_edge[:, j] = 1 - t, t
            nearer = length < distance
            distance = np.where(nearer, length, distance)
            shares = np.where(nearer[:, None], on_edge, shares)
        # On a shared edge the first triangle, whatever the last bits say.
        best = int(np.argmin(np.round(distance, 6)))
        return self.triangles[best], shares[best]


def ends_of(landmark, point):
    if landmark in ENDS:
        return (np.array(end) for end in ENDS[landmark])
    # Under the chin: from below the jaw up to the front, straight through the landmark.
    out = point[:2] - RADIAL_CENTRE[:2]
    out /= np.linalg.norm(out)
    below = point + np.array([-2 * out[0], 4 - 2 * out[1], -26.0])
    front = point + np.array([-9 * out[0], -9 * out[1], 4.0])
    return below, front


def row_of(landmark, surface, vertex):
    """The row's places and the way out of the face."""
    point = surface.points[vertex]
    behind, front = ends_of(landmark, point)
    line = [behind + (point - behind) * t for t in np.linspace(0, 1, 60)]
    line += [point + (front - point) * t for t in np.linspace(0, 1, 60)[1:]]
    places = [surface.nearest(p) for p in line]
    on_skin = np.array([shares @ surface.points[triangle] for triangle, shares in places])
    along = np.concatenate([[0], np.cumsum(np.linalg.norm(np.diff(on_skin, axis=0), axis=1))])
    chosen = [int(np.argmin(np.round(abs(along - s), 6)))
              for s in np.linspace(0, along[-1], PLACES)]
    out = np.array([-1.0, 0.0])
    if point[1] <= RADIAL_CENTRE[1]:
        out = point[:2] - RADIAL_CENTRE[:2]
        out /= np.linalg.norm(out)
    return [places[k] for k in chosen], out


def write(path, what, lines):
    path.write_text("// SPDX-License-Identifier: MIT\n// " + what +
                    "\n// Made by tools/face_model/outline_rows.py.\n" + "".join(lines))


def main():
    parser = argparse.ArgumentParser(description=__doc__.split("\n", maxsplit=1)[0])
    parser.add_argument("--data", type=pathlib.Path, default=ROOT / "data",
                        help="folder of the face model and its tables (default: data)")
    parser.add_argument("--out", type=pathlib.Path, default=ROOT / "data",
                        help="folder that receives the two files (default: data)")
    arguments = parser.parse_args()
    points = upright_mean(arguments.data)
    triangles = numbers(arguments.data / "triangles.inc").reshape(-1, 3)
    vertices = numbers(arguments.data / "default_contour_vertex_indices.inc")
    surface = Surface(points, triangles)
    mirrored = [int(np.argmin(np.round(((points * [-1, 1, 1] - p) ** 2).sum(1), 6)))
                for p in points]

    rows, normals = [], []
    for landmark in range(CHIN + 1):
        row, out = row_of(landmark, surface, vertices[landmark])
        rows.append(row)
        normals.append(out)
    for landmark in range(CHIN - 1, -1, -1):
        rows.append([([mirrored[v] for v in triangle], shares)
                     for triangle, shares in rows[landmark]])
        normals.append(normals[landmark] * [-1, 1])

    lines = []
    for landmark, row in enumerate(rows):
        lines.append(f"// landmark {landmark}\n{{\n")
        for triangle, shares in row:
            a, b = (round(float(share) + 0.0, 4) for share in shares[:2])
            c = round(1 - a - b, 4) + 0.0
            lines.append("{{%d, %d, %d}, {%.4ff, %.4ff, %.4ff}},\n" % (*triangle, a, b, c))
        lines.append("},\n")
    write(arguments.out / "outline_rows.inc",
          "Places of each outline landmark on the mesh: three vertices and their shares.", lines)
    write(arguments.out / "outline_normals.inc",
          "The way out of an upright frontal face at each outline landmark: x right, y up.",
          ["{%.4ff, %.4ff},\n" % tuple(out + 0.0) for out in normals])


if __name__ == "__main__":
    main()
