# SPDX-License-Identifier: MIT
"""The flat half face on which the mesh is laid out, and its place in the texture.

Flat coordinates are millimetres, x right and y up, the half at image left (x <= 0); texture
coordinates run from 0 to 1 with v downwards.
"""

from dataclasses import dataclass, field

import numpy as np
from scipy.optimize import brentq
from scipy.spatial import ConvexHull

import nostril
import outline
import sample_mesh
from arithmetic import length, settled
from measurements import Measurements

# The rectangle of the texture that the face fills, and its midline. Fixed: part of the file
# format, for masks are painted in this layout.
U_MIDDLE = 0.499946
U_LEFT = 0.016646
V_TOP, V_BOTTOM = 0.002930, 0.997054
# The texture keeps the middle of the face in true proportion and narrows the sides.
MIDDLE_PROPORTION = 0.95

# Texture places of the vertices 0 to 2, before the ear at image left; fixed, too. Vertex 1 has
# exactly the neighbours 0, 2, 4 and 3.
FIRST_TEXTURE = {0: (0.069524, 0.281949), 1: (0.081158, 0.319456), 2: (0.038178, 0.318155)}
# Flat places (mm) of the two others, below them and inside the border.
PATCH_FLAT = {3: (-102.5, 17.0), 4: (-110.0, 4.0)}

BORDER_CENTRE_Y = -30.0
BORDER_MARGIN = 2.5
BORDER_EDGES = 50  # of the half face; with 24 round the eye and 12 along the mouth 86 of 172
BORDER_TERMS = 12
CURVE_STEPS = 24  # places of a dense curve from one of its points to the next


@dataclass
class Layout:
    """Maps flat places to texture coordinates: v by a straight line, u by an odd cubic."""

    left: float
    top: float
    bottom: float

    def __post_init__(self):
        self.v_scale = (V_BOTTOM - V_TOP) / (self.top - self.bottom)
        self.u_scale = MIDDLE_PROPORTION * self.v_scale
        half = U_MIDDLE - U_LEFT
        self.u_bend = (self.u_scale * -self.left - half) / self._cube(-self.left)

    @staticmethod
    def _cube(x):
        return x * x * x  # the same bits everywhere, unlike x**3

    def u_of(self, x: np.ndarray) -> np.ndarray:
        return U_MIDDLE + self.u_scale * x - self.u_bend * self._cube(x)

    def texture(self, flat: np.ndarray) -> np.ndarray:
        """Texture coordinates (n, 2) of flat places (n, 2)."""
        return np.column_stack([
            self.u_of(flat[:, 0]), V_TOP + (self.top - flat[:, 1]) * self.v_scale])

    def flat(self, u: float, v: float) -> np.ndarray:
        """The flat place of one pair of texture coordinates."""
        x = brentq(lambda t: self.u_of(t) - u, self.left, -self.left, xtol=1e-12)
        return np.array([x, self.top - (v - V_TOP) / self.v_scale])


@dataclass
class Domain:
    """What the mesh of the half face has to respect."""

    layout: Layout
    ids: np.ndarray  # measured points of the half
    flat: np.ndarray  # their flat places
    triangles: np.ndarray  # coarse triangles over them
    border: np.ndarray  # dense polyline, from the top of the midline to its bottom
    eye: np.ndarray  # dense closed polyline through the lid rims
    mouth: np.ndarray  # dense polyline from the middle of the upper rim to that of the lower
    nostril: np.ndarray  # places round the rim of the nostril
    patch: dict[int, np.ndarray]  # flat places of the vertices 0 to 4

    points: np.ndarray  # the measured points of the half in space
    # Vertices for outlines as (row, flat place), and where their rows meet the border as (row,
    # length along it).
    rows: list[tuple] = field(default_factory=list)
    stops: list[tuple] = field(default_factory=list)

    def place(self, point: int) -> np.ndarray:
        """Flat place of a measured point of the half."""
        return self.flat[np.flatnonzero(self.ids == point)[0]]

    def flat_of(self, places: np.ndarray) -> np.ndarray:
        """Flat places (n, 2) of places in space (n, 3): on the nearest of the coarse triangles."""
        out = []
        a, b, c = (self.points[self.triangles[:, k]] for k in range(3))
        for p in places:
            near = np.argsort(length((a + b + c) / 3.0 - p), kind="stable")[:12]
            best = None
            for t in near:
                edges = np.column_stack([b[t] - a[t], c[t] - a[t]])
                w = np.linalg.lstsq(edges, p - a[t], rcond=None)[0]
                outside = max(0.0, -w[0], -w[1], w.sum() - 1.0)
                distance = length(edges @ w - (p - a[t])) + 30.0 * outside
                if best is None or distance < best[0] - 1e-9:
                    w = np.array([1.0 - w.sum(), *w])
                    best = (distance, w @ self.flat[self.triangles[t]])
            out.append(best[1])
        return settled(out, 4, doubt=1e-10)


def _mix(a, b, low, high, t):
    """Between a at t = low and b at t = high."""
    return ((high - t) * a + (t - low) * b) / (high - low)


def _catmull_rom(points, closed):
    """Dense centripetal curve through the points, which are every CURVE_STEPS-th of its places."""
    n = len(points)
    if closed:
        padded = np.concatenate([points[-1:], points, points[:2]])
    else:
        padded = np.concatenate([2 * points[:1] - points[1:2], points,
                                 2 * points[-1:] - points[-2:-1]])
    out = []
    for k in range(n if closed else n - 1):
        p = padded[k:k + 4]
        knots = np.concatenate([[0.0], np.cumsum(np.sqrt(length(np.diff(p, axis=0))))])
        for s in range(CURVE_STEPS):
            t = knots[1] + (knots[2] - knots[1]) * s / CURVE_STEPS
            first = [_mix(p[i], p[i + 1], knots[i], knots[i + 1], t) for i in range(3)]
            second = [_mix(first[i], first[i + 1], knots[i], knots[i + 2], t) for i in range(2)]
            out.append(_mix(second[0], second[1], knots[1], knots[2], t))
    if not closed:
        out.append(points[-1])
    return np.array(out)


def _border(flat):
    """A smooth outline round the measured points, in polar form about the midline."""
    both = np.concatenate([flat, flat * [-1, 1]])
    outer = ConvexHull(both).vertices
    outer = np.sort(outer[outer < len(flat)])
    offset = flat[outer] - [0.0, BORDER_CENTRE_Y]
    radius = length(offset)
    angle = np.arctan2(-offset[:, 0], offset[:, 1])  # 0 up, growing to image left
    basis = np.cos(np.outer(angle, np.arange(BORDER_TERMS)))
    ridge = np.diag(0.002 * np.arange(BORDER_TERMS) ** 3)
    fitted = np.linalg.lstsq(
        np.vstack([basis, ridge]),
        np.concatenate([radius + BORDER_MARGIN, np.zeros(BORDER_TERMS)]), rcond=None)[0]
    turn = np.linspace(0, np.pi, 721)
    r = np.cos(np.outer(turn, np.arange(BORDER_TERMS))) @ fitted
    line = [0.0, BORDER_CENTRE_Y] + np.column_stack([-r * np.sin(turn), r * np.cos(turn)])
    line[[0, -1], 0] = 0.0
    return settled(line, 4, doubt=1e-10), np.min(basis @ fitted - radius)


def build(data: Measurements) -> Domain:
    ids, flat, triangles = sample_mesh.build(data)
    flat = settled(flat, 4, doubt=1e-9)  # what follows hangs on every bit
    border, clearance = _border(flat)
    if clearance < 0.5:
        raise ValueError(f"the border comes within {clearance:.2f} mm of a measured point")
    layout = Layout(border[:, 0].min(), border[:, 1].max(), border[:, 1].min())
    where = {int(p): k for k, p in enumerate(ids)}
    eye = _catmull_rom(flat[[where[p] for p in sample_mesh.EYE_RING]], closed=True)
    mouth = _catmull_rom(flat[[where[p] for p in sample_mesh.MOUTH_RING]], closed=False)
    patch = {k: layout.flat(*uv) for k, uv in FIRST_TEXTURE.items()}
    patch.update({k: np.array(v) for k, v in PATCH_FLAT.items()})
    dom = Domain(layout, ids, flat, triangles, border, eye, mouth,
                 flat[[where[p] for p in nostril.rim_ids(data)]], patch, data.points[ids])
    dom.rows = outline.rows(dom.flat_of, dom.place)
    dom.stops = outline.border_stops(dom.flat_of, dom.place, border)
    return dom
