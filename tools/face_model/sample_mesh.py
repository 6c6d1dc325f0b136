# SPDX-License-Identifier: MIT
"""Joins the measured points of one half of the face to triangles and spreads them out flat.

Only the half at image left (x <= 0) is worked on; the other half is its mirror image.
"""

import numpy as np

from arithmetic import length
from flatten import symmetric_dirichlet
from measurements import Measurements
from nostril import rim_ids
from triangulate import flip_by_shape, signed_areas, with_edges

# Seen from here, inside the head, nearly every measured point shows its front.
CENTRE = np.array([0.0, 15.0, 10.0])
PLANE_SCALE = 95.0  # mm a radian, about the radius of the front of the face

# The rims hide behind the lips: they are drawn up or down into the open mouth (mm).
RIM_LIFT = {93: 1.5, 362: 1.5, 94: 1.2, 367: 0.0, 365: -1.0, 364: 1.0}
MOUTH_RING = [89, 361, 88, 364, 87, 365, 367, 94, 362, 93]  # middle, corner, middle
EYE_RING = list(range(39, 51))
JAW_OPENING = 0.2  # the flat mouth stands a little open, so that its two rims do not touch
LONGEST_EDGE = 27.0  # mm; longer edges bridge notches of the outline


def _project(points):
    offset = points - CENTRE
    angle = np.arccos(offset[:, 2] / length(offset))
    turn = np.arctan2(offset[:, 1], offset[:, 0])
    return PLANE_SCALE * np.column_stack([angle * np.cos(turn), angle * np.sin(turn)])


def build(data: Measurements) -> tuple[np.ndarray, np.ndarray, np.ndarray]:
    """Returns (ids, flat, triangles) of the half: point ids, flat places in mm, triangles."""
    ids = np.flatnonzero(
        (data.points[:, 0] < 1e-6) & ~np.isin(data.region, ("pupil", "left_out")))
    where = {int(p): k for k, p in enumerate(ids)}
    posed = (data.points + JAW_OPENING * data.expression[0])[ids]
    plane = _project(posed)
    # the hollow of the nostril hides behind its rim: it is laid inside the rim
    nostril = [where[p] for p in rim_ids(data)]
    rim = plane[nostril]
    hollow = np.flatnonzero(data.region[ids] == "nostril_hollow")
    plane[hollow[:-1]] = rim.mean(axis=0) + 0.55 * (rim[::2] - rim.mean(axis=0))
    plane[hollow[-1]] = rim.mean(axis=0)
    for point, lift in RIM_LIFT.items():
        plane[where[point], 1] += lift
    middle = data.mirror[ids] == ids
    plane[middle, 0] = 0.0

    mouth = [where[p] for p in MOUTH_RING]
    eye = [where[p] for p in EYE_RING]
    rings = list(zip(mouth, mouth[1:])) + list(zip(eye, eye[1:] + eye[:1]))
    rings += list(zip(nostril, nostril[1:] + nostril[:1]))
    triangles = with_edges(plane, rings)

    def in_hole(t):
        return set(mouth).issuperset(t) or set(eye).issuperset(t)

    def short(t):
        edges = [length(posed[t[k]] - posed[t[k - 1]]) for k in range(3)]
        return max(edges) < LONGEST_EDGE and abs(signed_areas(plane, np.array([t]))[0]) > 0.05

    fill = np.array([t for t in triangles.tolist() if in_hole(t)])
    triangles = np.array([t for t in triangles.tolist() if not in_hole(t) and short(t)])
    triangles = flip_by_shape(posed, plane, triangles, {(min(e), max(e)) for e in rings})
    # Eyes and mouth keep the opening they have in the first layout: their fill is stretched along.
    reference = np.concatenate([posed[triangles], np.pad(plane, ((0, 0), (0, 1)))[fill]])
    flat = symmetric_dirichlet(
        reference, plane, np.concatenate([triangles, fill]), np.flatnonzero(middle))
    return ids, flat, triangles
