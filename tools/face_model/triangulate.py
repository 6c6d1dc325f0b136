# SPDX-License-Identifier: MIT
"""Delaunay triangulation in the plane that keeps given edges, and flips by shape in space."""

from collections.abc import Collection

import numpy as np
from scipy.spatial import Delaunay

from arithmetic import dot, length


def signed_areas(plane: np.ndarray, triangles: np.ndarray) -> np.ndarray:
    """Areas of triangles in the plane, positive when counter-clockwise."""
    a, b, c = (plane[triangles[:, k]] for k in range(3))
    return 0.5 * ((b - a)[:, 0] * (c - a)[:, 1] - (b - a)[:, 1] * (c - a)[:, 0])


def edge_owners(triangles: np.ndarray) -> dict[tuple[int, int], list[int]]:
    """Undirected edge -> list of the triangles beside it."""
    owners = {}
    for index, t in enumerate(np.asarray(triangles).tolist()):
        for k in range(3):
            a, b = t[k], t[(k + 1) % 3]
            owners.setdefault((min(a, b), max(a, b)), []).append(index)
    return owners


def boundary_edges(triangles: np.ndarray) -> list[tuple[int, int]]:
    """Directed edges (a, b) with the surface on their left."""
    t = np.asarray(triangles)
    directed = {(int(a), int(b)) for k in range(3) for a, b in t[:, [k, (k + 1) % 3]]}
    return sorted(e for e in directed if (e[1], e[0]) not in directed)


def boundary_rings(triangles: np.ndarray) -> list[list[int]]:
    """The closed rings of vertices that the boundary edges make."""
    after = dict(boundary_edges(triangles))
    rings = []
    while after:
        ring, v = [], min(after)
        while v in after:
            ring.append(v)
            v = after.pop(v)
        rings.append(ring)
    return rings


def _cross(o, a, b):
    return (a[0] - o[0]) * (b[1] - o[1]) - (a[1] - o[1]) * (b[0] - o[0])


def _crosses(p, q, r, s):
    return _cross(p, q, r) * _cross(p, q, s) < 0 and _cross(r, s, p) * _cross(r, s, q) < 0


def _flip(t, u, edge):
    """The two triangles after the flip of the edge between t and u."""
    apex = next(v for v in t if v not in edge)
    other = next(v for v in u if v not in edge)
    k = t.index(apex)
    left, right = t[(k + 1) % 3], t[(k + 2) % 3]
    return (apex, left, other), (apex, other, right)


def with_edges(plane: np.ndarray, edges: list[tuple[int, int]]) -> np.ndarray:
    """Triangles (counter-clockwise) over all points that contain every edge of `edges`."""
    triangles = Delaunay(plane).simplices
    turned = signed_areas(plane, triangles) < 0
    triangles[turned] = triangles[turned][:, ::-1]
    triangles = [tuple(t) for t in triangles.tolist()]
    wanted = [(min(a, b), max(a, b)) for a, b in edges]
    owners = edge_owners(triangles)
    for goal in wanted:
        p, q = plane[goal[0]], plane[goal[1]]
        for _ in range(1000):
            if goal in owners:
                break
            flipped = False
            for edge in sorted(owners):
                if set(edge) & set(goal) or not _crosses(p, q, plane[edge[0]], plane[edge[1]]):
                    continue
                pair = _flip(*(triangles[f] for f in owners[edge]), edge)
                if (signed_areas(plane, np.array(pair)) <= 1e-9).any():
                    continue
                new = tuple(sorted(set(pair[0]) & set(pair[1])))
                still = _crosses(p, q, plane[new[0]], plane[new[1]])
                if still and flipped:
                    continue
                triangles[owners[edge][0]], triangles[owners[edge][1]] = pair
                owners = edge_owners(triangles)
                flipped = True
                break
            if not flipped:
                raise ValueError(f"edge {goal} cannot be made")
    return np.array(triangles)


def _blunt(points, triangles, faces, edges):
    """Marks the edges whose two facing angles sum to more than pi: the sine of the sum is negative.

    A sum that is pi but for rounding, as in a rectangle, does not count.
    """
    corners = triangles[faces]  # (edges, 2, 3)
    apex = corners.sum(axis=2) - edges.sum(axis=1)[:, None]
    a = points[edges[:, 0]][:, None] - points[apex]
    b = points[edges[:, 1]][:, None] - points[apex]
    if points.shape[1] == 2:
        sine = np.abs(a[..., 0] * b[..., 1] - a[..., 1] * b[..., 0])
    else:
        sine = length(np.cross(a, b))
    cosine = dot(a, b)
    size = np.sqrt(sine**2 + cosine**2).prod(axis=1)
    return sine[:, 0] * cosine[:, 1] + cosine[:, 0] * sine[:, 1] < -1e-6 * size


def flip_by_shape(points: np.ndarray, plane: np.ndarray, triangles: np.ndarray,
                  keep: Collection[tuple[int, int]] = frozenset()) -> np.ndarray:
    """Flips edges until the two angles facing each edge, measured on `points`, sum below pi.

    Edges in `keep` (ascending pairs) stay, and no flip turns a triangle over in the plane.
    """
    triangles = np.array(triangles)
    for _ in range(50):
        owners = edge_owners(triangles)
        inner = [edge for edge in sorted(owners) if len(owners[edge]) == 2 and edge not in keep]
        faces = np.array([owners[edge] for edge in inner])
        blunt = _blunt(points, triangles, faces, np.array(inner))
        touched, flips = set(), 0
        for edge in (inner[k] for k in np.flatnonzero(blunt)):
            if touched.intersection(owners[edge]):
                continue
            one, other = (triangles[f].tolist() for f in owners[edge])
            tips = sorted(v for v in one + other if v not in edge)
            if tuple(tips) in owners:
                continue
            pair = _flip(one, other, edge)
            if (signed_areas(plane, np.array(pair)) <= 1e-3).any():
                continue
            triangles[owners[edge]] = pair
            touched.update(owners[edge])
            flips += 1
        if not flips:
            break
    return triangles
