# SPDX-License-Identifier: MIT
"""The mean face of data/face_statistics as the pictures show it."""

import csv
from pathlib import Path

import numpy as np

STATISTICS = Path(__file__).resolve().parents[2] / "data" / "face_statistics"

# Runs of the landmark layout; the rings are closed.
OUTLINE = list(range(0, 19))
BROWS = [list(range(19, 29)), list(range(29, 39))]
EYES = [list(range(39, 51)), list(range(51, 63))]
NOSE = list(range(63, 75))
OUTER_LIP = list(range(75, 87))
INNER_LIP = list(range(87, 95))
PUPILS = [95, 96]
RIDGE = list(range(97, 101))
RINGS = [*EYES, OUTER_LIP, INNER_LIP]

MIRROR_RUNS = [  # first, last, sum of a pair
    (0, 18, 18), (19, 24, 53), (29, 34, 53), (25, 28, 63), (35, 38, 63), (39, 45, 96), (51, 57, 96),
    (46, 50, 108), (58, 62, 108), (63, 74, 137), (75, 81, 156), (82, 86, 168), (87, 91, 178),
    (92, 94, 186), (95, 96, 191)]


def mirrored(landmark):
    """The number of the mirrored landmark of the 101-point layout."""
    for first, last, total in MIRROR_RUNS:
        if first <= landmark <= last:
            return total - landmark
    return landmark


def _rows(name):
    with open(STATISTICS / name, newline="", encoding="utf-8") as file:
        return list(csv.DictReader(file))


def points(**expressions):
    """Positions of all measured points in the upright head frame, mm; rows 0 to 100 are the
    landmarks. Expressions are added at the given intensities."""
    base = np.array([[float(row[axis]) for axis in "xyz"] for row in _rows("points.csv")])
    if expressions:
        modes = _rows("expression_modes.csv")
        for name, intensity in expressions.items():
            base += intensity * np.array(
                [[float(row[f"{name}_{axis}"]) for axis in "xyz"] for row in modes])
    return base


def further_points(landmarks):
    """The 64 further points of the 165-point layout, from the 101 base points."""
    out = [landmarks[95], landmarks[96]]
    out += [(landmarks[k] + landmarks[k + 1]) / 2 for k in range(18)]
    for ring in RINGS:
        out += [(landmarks[a] + landmarks[b]) / 2 for a, b in zip(ring, ring[1:] + ring[:1])]
    return np.array(out)


def profile(all_points):
    """The midline from the hairline to the neck, as points (z, y)."""
    middle = all_points[np.abs(all_points[:, 0]) < 0.01]
    order = np.argsort(-middle[:, 1], kind="stable")
    return middle[order][:, [2, 1]]


def curve(through, closed=False, steps=10):
    """A smooth line through points (centripetal Catmull-Rom)."""
    p = np.asarray(through, float)
    if closed:
        p = np.concatenate([p[-1:], p, p[:2]])
    else:
        p = np.concatenate([2 * p[:1] - p[1:2], p, 2 * p[-1:] - p[-2:-1]])
    out = []
    for q in (p[k:k + 4] for k in range(len(p) - 3)):
        knots = np.concatenate([[0], np.cumsum(np.linalg.norm(np.diff(q, axis=0), axis=1) ** 0.5)])
        if np.any(np.diff(knots) == 0):
            out.append(q[1])
            continue
        for t in np.linspace(knots[1], knots[2], steps, endpoint=False):
            def mix(a, b, low, high):
                return ((high - t) * a + (t - low) * b) / (high - low)
            first = [mix(q[i], q[i + 1], knots[i], knots[i + 1]) for i in range(3)]
            second = [mix(first[i], first[i + 1], knots[i], knots[i + 2]) for i in range(2)]
            out.append(mix(second[0], second[1], knots[1], knots[2]))
    if not closed:
        out.append(p[-2])
    return [tuple(v) for v in out]
