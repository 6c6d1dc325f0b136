# SPDX-License-Identifier: MIT
"""The nostril, which the measured points leave open: a rim and a shallow hollow of our own.

The measured points inside the cavity lie up to 15 mm deep; a mask wants a hollow that looks dark
and never turns inside out, so they are left out of the surface.
"""

from dataclasses import replace

import numpy as np

from measurements import Measurements

LEFT_OUT = (275, 276, 285, 297, 303)  # at image left; their mirror images go with them

# Round the rim from its front end over the wing and the sill back along the septum: measured
# points by their number, places of our own in mm.
RIM = [
    (-6.8, -15.4, 111.6),
    (-9.9, -15.2, 109.8),
    (-12.8, -15.7, 106.2),
    307,
    311,
    (-11.6, -20.6, 99.4),
    314,
    (-6.0, -20.0, 103.4),
    308,
    (-5.0, -16.6, 109.2),
]
INNER_RING_SHARE = 0.58  # size of the ring half way down, against the rim
INNER_RING_DEPTH = 3.5
DEPTH = 5.5
INWARDS = np.array([0.0, 0.93, -0.37])


def _own_points(points):
    rim = np.array([points[p] if isinstance(p, int) else p for p in RIM])
    middle = rim.mean(axis=0)
    ring = middle + INNER_RING_SHARE * (rim[::2] - middle) + INNER_RING_DEPTH * INWARDS
    places = [p for p in RIM if not isinstance(p, int)]
    return np.vstack([places, ring, middle + DEPTH * INWARDS]), len(places)


def rim_ids(data: Measurements) -> list[int]:
    """Numbers of the points round the rim at image left, in order."""
    own = iter(np.flatnonzero(data.region == "nostril_rim"))
    return [p if isinstance(p, int) else int(next(own)) for p in RIM]


def with_nostrils(data: Measurements) -> Measurements:
    """The measurements with the points of the nostrils appended, image left first.

    The new points have no normals and no modes (zero); `measured` tells them apart.
    """
    left, on_rim = _own_points(data.points)
    count, old = len(left), len(data.points)
    points = np.vstack([left, left * [-1.0, 1.0, 1.0]])
    region = np.array(["nostril_rim"] * on_rim + ["nostril_hollow"] * (count - on_rim))
    hidden = np.isin(np.arange(old), LEFT_OUT + tuple(data.mirror[list(LEFT_OUT)]))

    def padded(modes):
        return np.concatenate([modes, np.zeros((len(modes), 2 * count, 3))], axis=1)

    return replace(
        data,
        points=np.vstack([data.points, points]),
        normals=np.vstack([data.normals, np.zeros((2 * count, 3))]),
        region=np.concatenate([np.where(hidden, "left_out", data.region), region, region]),
        landmark=np.concatenate([data.landmark, np.full(2 * count, -1)]),
        mirror=np.concatenate(
            [data.mirror, old + count + np.arange(count), old + np.arange(count)]),
        identity=padded(data.identity),
        expression=padded(data.expression),
        measured=np.concatenate([np.ones(old, bool), np.zeros(2 * count, bool)]),
    )
