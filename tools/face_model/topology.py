# SPDX-License-Identifier: MIT
"""Lays out the vertices and triangles of the half face and mirrors them to the whole mesh.

The counts are fixed: 1812 vertices and 3456 triangles with the two eyes and the mouth open leave
172 edges on the boundary, 86 a half.
"""

from collections.abc import Callable
from dataclasses import dataclass, field, replace

import numpy as np

from arithmetic import Nearest, interpolated, length, settled
from domain import BORDER_EDGES, CURVE_STEPS, Domain
from relax import spread, spread_on_surface
from sample_mesh import EYE_RING, MOUTH_RING
from surface import Surface
from triangulate import with_edges

VERTICES, TRIANGLES, BOUNDARY_EDGES = 1812, 3456, 172
MIDDLE_VERTICES = 72  # on the midline; even, like the number of vertices
SEED = 1812

# Wanted edge length (mm): (name of the feature, at the feature, growth a millimetre of distance)
GROWTH = {"eye": (2.2, 0.16), "lips": (2.2, 0.14), "nose": (2.1, 0.14), "brow": (5.5, 0.2)}
SIDE_LENGTH = 5.9  # cheeks and jaw, where the outline of a turned head runs
FOREHEAD_LENGTH = 11.0
NECK_LENGTH = 11.0
LIP_LINE = [75, 76, 77, 78, 84, 85, 86]
NOSE_POINTS = [66, 67, 68, 100, 120, 109, 104, 298, 307, 311, 314, 308, 295, 299, 309, 289, 292]
BROW_POINTS = list(range(19, 29))
LEAST_DISTANCE = 3.6  # mm between the vertices along outlines and other fixed ones
LID_RING = 24  # vertices round the eye; they come first
# Neighbours in the mouth's ring that are far apart.
WIDE_MOUTH_STEPS = {(88, 364), (364, 87), (87, 365)}
INNER_POINTS = (list(range(0, 9)) + list(range(19, 29))
                + [63, 64, 65, 66, 67, 68, 75, 76, 77, 85, 86])


@dataclass
class HalfMesh:
    """Vertices of the half face; `named` gives the vertex of each measured point that is one."""

    flat: np.ndarray
    triangles: np.ndarray
    middle: np.ndarray  # vertices on the midline
    fixed: np.ndarray  # vertices that keep their place
    named: dict[int, int]  # measured point -> vertex
    patch: dict[int, int]  # 0..4 -> vertex
    lid_middle: int  # the vertex above the pupil on the upper lid's rim
    border: list[int]  # vertices along the outer border, top to bottom
    keep: frozenset[tuple[int, int]]  # edges that stay
    wall: np.ndarray  # dense places along them
    sizing: Callable[[np.ndarray], np.ndarray]  # wanted edge lengths at flat places
    rows: list[tuple]  # (row, vertex) of the vertices along outlines


def _spaced(line, count, weight=None):
    """`count` + 1 places along a polyline, both ends included, denser where weight is small."""
    step = length(np.diff(line, axis=0))
    if weight is not None:
        step = step / weight[:-1]
    along = np.concatenate([[0.0], np.cumsum(step)])
    wanted = np.linspace(0, along[-1], count + 1)
    return interpolated(wanted, along, line)


def _border_places(dom):
    """Places along the border, from the top of the midline to its bottom, and their rows.

    Before the ear, where outlines of turned heads run on the border, they lie where the rows for
    outlines meet it; above and below them the edges are even.
    """
    line = dom.border
    along = np.concatenate([[0.0], np.cumsum(length(np.diff(line, axis=0)))])
    stops = [along_border for _, along_border in dom.stops]
    rest = BORDER_EDGES - (len(stops) - 1)
    above = int(round(rest * stops[0] / (stops[0] + along[-1] - stops[-1])))
    places = np.concatenate([np.linspace(0.0, stops[0], above + 1)[:-1], stops,
                             np.linspace(stops[-1], along[-1], rest - above + 1)[1:]])
    rows = {above + k: row for k, (row, _) in enumerate(dom.stops)}
    return interpolated(places, along, line), rows


class Sizing:
    """Wanted edge length at a flat place."""

    def __init__(self, dom: Domain):
        def points(ids):
            return np.array([dom.place(p) for p in ids])

        self.features = {
            "eye": Nearest(dom.eye),
            "lips": Nearest(np.concatenate([dom.mouth, points(LIP_LINE)])),
            "nose": Nearest(points(NOSE_POINTS)),
            "brow": Nearest(points(BROW_POINTS)),
        }
        self.patch = Nearest(np.array([dom.patch[k] for k in range(5)]))

    def __call__(self, places: np.ndarray) -> np.ndarray:
        size = np.full(len(places), np.inf)
        for name, (start, growth) in GROWTH.items():
            size = np.minimum(size, start + growth * self.features[name](places)[0])
        # forehead and neck are coarse, cheeks and jaw finer
        up = np.clip((places[:, 1] - 22.0) / 25.0, 0.0, 1.0)
        size = np.minimum(size, SIDE_LENGTH + (FOREHEAD_LENGTH - SIDE_LENGTH) * up)
        down = np.clip((-112.0 - places[:, 1]) / 25.0, 0.0, 1.0)
        size = np.maximum(size, SIDE_LENGTH + (NECK_LENGTH - SIDE_LENGTH) * down)
        near = self.patch(places)[0]
        return np.maximum(size, 9.5 - 0.35 * near)


def _inside(polygon, places):
    """Even-odd test of many places against a closed polygon."""
    x, y = places[:, 0], places[:, 1]
    inside = np.zeros(len(places), bool)
    for (ax, ay), (bx, by) in zip(polygon, np.roll(polygon, -1, axis=0)):
        if ay == by:
            continue
        crosses = (ay > y) != (by > y)
        inside ^= crosses & (x < (bx - ax) * (y - ay) / (by - ay) + ax)
    return inside


@dataclass
class _Frame:
    """The vertices that keep their places and the edges between them, as they are laid out."""

    places: list[np.ndarray] = field(default_factory=list)
    edges: list[tuple[int, int]] = field(default_factory=list)
    named: dict[int, int] = field(default_factory=dict)  # measured point -> vertex
    rows: list[tuple] = field(default_factory=list)  # (row, vertex) of those along outlines
    lid_middle: int = -1  # the vertex above the pupil on the upper lid's rim
    mouth: list[int] = field(default_factory=list)  # along the rims of the lips
    outer: list[int] = field(default_factory=list)  # along the border, top to bottom
    middle: list[int] = field(default_factory=list)  # along the midline

    def add(self, place, point=None):
        """A vertex at a flat place; with `point`, the one of that measured point."""
        if point is not None:
            self.named[point] = len(self.places)
        self.places.append(place)
        return len(self.places) - 1

    def vertex(self, dom, point):
        """The vertex of a measured point, added if there is none."""
        return self.named[point] if point in self.named else self.add(dom.place(point), point)

    def join(self, chain, closed=False):
        self.edges.extend(zip(chain, chain[1:] + chain[:1] if closed else chain[1:]))


def _add_openings(frame, dom):
    """The rims of the eye, the mouth and the nostril."""
    between = CURVE_STEPS // 2  # place of a curve half way between two of its points
    # the lid ring: the twelve landmarks and one vertex between each two
    lids = []
    for k, point in enumerate(EYE_RING):
        lids.append(frame.add(dom.place(point), point))
        lids.append(frame.add(dom.eye[CURVE_STEPS * k + between]))
    frame.join(lids, closed=True)
    frame.lid_middle = lids[2 * EYE_RING.index(42) + 1]

    # the mouth: the measured points, and one between where they are far apart
    for k, point in enumerate(MOUTH_RING):
        frame.mouth.append(frame.add(dom.place(point), point))
        if tuple(MOUTH_RING[k:k + 2]) in WIDE_MOUTH_STEPS:
            frame.mouth.append(frame.add(dom.mouth[CURVE_STEPS * k + between]))
    frame.join(frame.mouth)

    frame.join([frame.add(place) for place in dom.nostril], closed=True)


def _add_border(frame, dom):
    """The outer border; its leftmost vertex lies where the border is furthest out."""
    border, rows = _border_places(dom)
    border[np.argmin(border[:, 0])] = dom.border[np.argmin(dom.border[:, 0])]
    frame.outer = [frame.add(place) for place in border]
    frame.rows += [(row, frame.outer[k]) for k, row in rows.items()]
    frame.join(frame.outer)


def _add_middle_line(frame, dom, sizing):
    """From the border to the upper lip, and from the lower lip to the border."""
    stretches = [[frame.outer[0]] + [frame.vertex(dom, p) for p in (97, 98, 99, 100, 78, 89)],
                 [frame.vertex(dom, p) for p in (93, 84, 9)] + [frame.outer[-1]]]
    spans = [np.array([frame.places[v] for v in stretch]) for stretch in stretches]
    for stretch, marks, counts in zip(stretches, spans, _middle_counts(spans, sizing)):
        chain = []
        for k, count in enumerate(counts):
            chain.append(stretch[k])
            dense = np.linspace(marks[k], marks[k + 1], 200)
            chain += [frame.add(p) for p in _spaced(dense, count, sizing(dense))[1:-1]]
        chain.append(stretch[-1])
        frame.join(chain)
        frame.middle += chain


def _frame(dom, sizing):
    frame = _Frame()
    _add_openings(frame, dom)
    _add_border(frame, dom)
    _add_middle_line(frame, dom, sizing)
    return frame


def _middle_counts(spans, sizing):
    """Edges between neighbouring stops so that the midline has its number of vertices."""
    want = []
    for marks in spans:
        for a, b in zip(marks, marks[1:]):
            dense = np.linspace(a, b, 200)
            step = length(b - a) / 199
            want.append((step / sizing(dense)).sum())
    want = np.array(want)
    total = MIDDLE_VERTICES - len(spans)  # edges on the midline
    counts = np.maximum(1, np.floor(want * total / want.sum())).astype(int)
    while counts.sum() < total:
        counts[np.argmax(want * total / want.sum() / counts)] += 1
    split = len(spans[0]) - 1
    return counts[:split].tolist(), counts[split:].tolist()


def _starting_places(fixed, wall, sizing, inside, count):
    """Random places for the free vertices, as dense as wanted and off the fixed ones."""
    rng = np.random.RandomState(SEED)
    low, high = fixed.min(axis=0), fixed.max(axis=0)
    trial = low + (high - low) * rng.random_sample((60000, 2))
    size = sizing(trial)
    trial = trial[inside(trial) & (rng.random_sample(len(trial)) < (size.min() / size) ** 2)]
    trial = trial[Nearest(np.concatenate([fixed, wall]))(trial)[0] > 0.5 * sizing(trial)]
    if len(trial) < count:
        raise ValueError("too few starting places")
    return trial[:count]


def half_mesh(dom: Domain) -> HalfMesh:
    """Vertices and triangles of the half face, spread by lengths on the flat face."""
    sizing = Sizing(dom)
    frame = _frame(dom, sizing)
    patch = {k: frame.add(dom.patch[k]) for k in range(5)}
    quad = [patch[k] for k in (0, 2, 4, 3)]  # round vertex 1
    frame.join(quad, closed=True)
    for point in INNER_POINTS:
        frame.vertex(dom, point)
    crowd = Nearest(np.array(frame.places))
    for row, place in dom.rows:
        if crowd(place[None])[0] > LEAST_DISTANCE:
            frame.rows.append((row, frame.add(place)))
    fixed = np.array(frame.places)
    fixed[frame.middle, 0] = 0.0

    # the mouth is open towards the midline: close its outline beyond it
    mouth = fixed[frame.mouth]
    lips = np.concatenate([mouth, [[1.0, mouth[-1, 1]], [1.0, mouth[0, 1]]]])
    holes = [fixed[:LID_RING], lips, fixed[quad]]
    outline = fixed[frame.outer]

    def inside(places):
        ok = _inside(outline, places) & (places[:, 0] < -1e-9)
        for hole in holes:
            ok &= ~_inside(hole, places)
        return ok

    wall = np.concatenate([fixed[a] + (fixed[b] - fixed[a]) * np.linspace(0, 1, 24)[:, None]
                           for a, b in frame.edges])
    half = (VERTICES - MIDDLE_VERTICES) // 2 + MIDDLE_VERTICES
    free = _starting_places(fixed, wall, sizing, inside, half - len(fixed))
    # Up to here every bit is certain. Fixed places may lie half way between decimals.
    places = np.concatenate([fixed, free])
    places = np.round(spread(places, len(fixed), sizing, inside, wall), 5)

    triangles = with_edges(places, frame.edges)
    triangles = triangles[inside(places[triangles].mean(axis=1))]
    fan = [(patch[0], patch[2], patch[1]), (patch[1], patch[3], patch[0]),
           (patch[4], patch[3], patch[1]), (patch[4], patch[1], patch[2])]
    triangles = np.concatenate([triangles, fan])
    spokes = [(patch[1], patch[k]) for k in (0, 2, 3, 4)]
    keep = frozenset((min(e), max(e)) for e in frame.edges + spokes)
    return HalfMesh(places, triangles, np.array(sorted(frame.middle)), np.arange(len(fixed)),
                    frame.named, patch, frame.lid_middle, frame.outer, keep, wall, sizing,
                    frame.rows)


@dataclass
class Mesh:
    """The whole face; vertices of the half come first, then the mirror images of the others."""

    flat: np.ndarray
    triangles: np.ndarray
    mirror: np.ndarray  # mirrored vertex of each vertex


def mirrored(half: HalfMesh) -> Mesh:
    flat, triangles = half.flat, half.triangles
    count = len(flat)
    side = np.setdiff1d(np.arange(count), half.middle)
    image = np.arange(count)
    image[side] = count + np.arange(len(side))
    mirror = np.concatenate([image, side])
    whole = np.concatenate([flat, flat[side] * [-1.0, 1.0]])
    return Mesh(whole, np.concatenate([triangles, image[triangles][:, ::-1]]), mirror)


def lid_rims(half: HalfMesh, mesh: Mesh) -> tuple[tuple, tuple]:
    """Upper and lower lid rim of the eye at image left and of that at image right.

    The rims run between the corners; the lower one holds the corners too.
    """
    corner = half.named[45]  # the inner one; the ring starts at the outer one
    upper = list(range(half.named[39] + 1, corner))
    lower = [half.named[39]] + list(range(LID_RING - 1, corner - 1, -1))
    return (upper, lower), (mesh.mirror[upper].tolist(), mesh.mirror[lower].tolist())


def refined(half: HalfMesh, surface: Surface) -> HalfMesh:
    """The half mesh spread anew with the lengths it has on the lifted surface."""
    flat, triangles = spread_on_surface(half, surface)
    # Vertices that rest half way between two places on a wall are half way between decimals, too.
    flat = settled(flat, 5, doubt=1e-10, nudge=-1e-9)
    return replace(half, flat=flat, triangles=triangles)
