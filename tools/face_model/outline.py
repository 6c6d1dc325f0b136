# SPDX-License-Identifier: MIT
"""Rows of vertices on cheeks and jaw along which the outline landmarks wander.

When the head turns, the outline landmark of a row slides along it, from before the ear towards the
cheek. With vertices on the very rows, a landmark finds its row again, and the height of the outline
keeps telling about the nod of the head; on an even mesh it would slide along the outline and tell
nothing. Two further rows lie between each two, so that no part of an outline is far from a vertex.
"""

from collections.abc import Callable

import numpy as np

from arithmetic import dot, interpolated, length

# Landmark, and the ends of its row at image left on the mean head (mm): before the ear, on the
# cheek.
ROWS = [
    (0, (-76.5, 21.0, 15.0), (-54.0, 20.0, 70.0)),
    (1, (-75.0, 3.5, 15.0), (-46.0, 3.0, 78.0)),
    (2, (-73.5, -13.5, 15.0), (-40.0, -13.0, 84.0)),
    (3, (-71.0, -31.0, 16.0), (-36.0, -28.5, 85.0)),
    (4, (-67.0, -49.0, 18.0), (-34.0, -42.5, 85.0)),
    (5, (-59.0, -64.5, 32.0), (-34.0, -56.0, 83.0)),
    (6, (-47.5, -78.0, 51.0), (-36.0, -68.0, 78.0)),
    (7, (-34.0, -84.0, 70.0), (-30.0, -80.5, 79.0)),
]
# Further rows, as shares of the way to the next: in even steps.
BETWEEN = (0.34, 0.66)
LAST_AT_BORDER = 5.0  # lower rows end on the jaw, away from the border
COLUMN = 6.2  # mm between the vertices of a row


def _resampled(line, places):
    """Points of a polyline at shares of its length."""
    step = length(np.diff(line, axis=0))
    along = np.concatenate([[0.0], np.cumsum(step)]) / step.sum()
    return interpolated(places, along, line)


def _lines(flat_of, place_of):
    """All rows as (row, polyline from before the ear to the cheek); whole rows are landmarks'."""
    lines = []
    for landmark, near, far in ROWS:
        ends = flat_of(np.array([near, far]))
        lines.append(np.array([ends[0], place_of(landmark), ends[1]]))
    even = np.linspace(0.0, 1.0, 41)
    out = []
    for k, line in enumerate(lines):
        out.append((float(k), line))
        if k + 1 < len(lines):
            for share in BETWEEN:
                out.append((k + share, (1 - share) * _resampled(line, even)
                            + share * _resampled(lines[k + 1], even)))
    return out


def rows(flat_of: Callable, place_of: Callable) -> list[tuple[float, np.ndarray]]:
    """Vertices along the rows as (row, flat place), the landmarks themselves left out.

    `flat_of` maps places in space to flat ones, `place_of` gives a landmark's flat place.
    """
    out = []
    for row, line in _lines(flat_of, place_of):
        if row == int(row):
            for end in (line[0], line[2]):
                count = max(1, int(round(length(end - line[1]) / COLUMN)))
                shares = np.arange(1, count + 1) / count
                out += [(row, line[1] + s * (end - line[1])) for s in shares]
            continue
        count = max(1, int(round(length(np.diff(line, axis=0)).sum() / COLUMN)))
        shift = 0.75 if row - int(row) < 0.5 else 0.25
        out += [(row, p) for p in _resampled(line, (np.arange(count) + shift) / count)]
    return out


def border_stops(flat_of: Callable, place_of: Callable,
                 border: np.ndarray) -> list[tuple[float, float]]:
    """Where the rows before the ear, carried on, meet the border: (row, length along it)."""
    along = np.concatenate([[0.0], np.cumsum(length(np.diff(border, axis=0)))])
    out = []
    for row, line in _lines(flat_of, place_of):
        if row > LAST_AT_BORDER:
            break
        way = line[0] - line[1]
        side = dot(border - line[0], np.array([-way[1], way[0]]))
        ahead = dot(border - line[0], way) > 0
        k = int(np.flatnonzero((side[:-1] * side[1:] <= 0) & ahead[:-1])[0])
        share = side[k] / (side[k] - side[k + 1])
        out.append((row, along[k] + share * (along[k + 1] - along[k])))
    return out
