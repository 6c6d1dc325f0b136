# SPDX-License-Identifier: MIT
"""Delaunay triangulation in the plane that keeps given edges, and flips by shape in space."""

import numpy as np
from scipy.spatial import Delaunay


def signed_areas(plane, triangles):
    a, b, c = (plane[triangles[:, k]] for k in range(3))
    return 0.5 * ((b - a)[:, 0] * (c - a)[:, 1] - (b - a)[:, 1] * (c - a)[:, 0])


def edge_owners(triangles):
    """Undirected edge -> list of the triangles beside it."""
    owners = {}
    for index, t in enumerate(np.asarray(triangles).tolist()):
        for k in range(3):
            a, b = t[k], t[(k + 1) % 3]
            owners.setdefault((min(a, b), max(a, b)), []).append(index)
    return owners


def boundary_edges(triangles):
    """Directed edges (a, b) with the surface on their left."""
    t = np.asarray(triangles)
    directed = {(int(a), int(b)) for k in range(3) for a, b in t[:, [k, (k + 1) % 3]]}
    return sorted(e for e in directed if (e[1], e[0]) not in directed)


def boundary_rings(triangles):
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


def _flip(triangles, faces, edge):
    """The two triangles after the flip, or None if the quadrilateral is not convex."""
    t, u = triangles[faces[0]], triangles[faces[1]]
    apex = next(v for v in t if v not in edge)
    other = next(v for v in u if v not in edge)
    k = t.index(apex)
    left, right = t[(k + 1) % 3], t[(k + 2) % 3]
    return (apex, left, other), (apex, other, right)


def with_edges(plane, edges):
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
                pair = _flip(triangles, owners[edge], edge)
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
                raise ValueError(f"edge {goal} cannot be had")
    return np.array(triangles)


def _angle(points, triangle, edge):
    apex = next(v for v in triangle if v not in edge)
    a, b = points[edge[0]] - points[apex], points[edge[1]] - points[apex]
    return np.arctan2(np.linalg.norm(np.cross(a, b)), a @ b), apex


def flip_by_shape(points, plane, triangles, keep=frozenset()):
    """Flips edges until the two angles facing each edge, measured on `points`, sum below pi.

    Edges in `keep` (ascending pairs) stay, and no flip turns a triangle over in the plane.
    """
    triangles = [tuple(t) for t in np.asarray(triangles).tolist()]
    for _ in range(50):
        owners = edge_owners(triangles)
        touched, flips = set(), 0
        for edge in sorted(owners):
            faces = owners[edge]
            if len(faces) != 2 or edge in keep or touched.intersection(faces):
                continue
            angle_0, apex_0 = _angle(points, triangles[faces[0]], edge)
            angle_1, apex_1 = _angle(points, triangles[faces[1]], edge)
            if angle_0 + angle_1 <= np.pi + 1e-6:
                continue
            if (min(apex_0, apex_1), max(apex_0, apex_1)) in owners:
                continue
            pair = _flip(triangles, faces, edge)
            if (signed_areas(plane, np.array(pair)) <= 1e-3).any():
                continue
            triangles[faces[0]], triangles[faces[1]] = pair
            touched.update(faces)
            flips += 1
        if not flips:
            break
    return np.array(triangles)
