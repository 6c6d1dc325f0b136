# SPDX-License-Identifier: MIT
"""Gives every vertex its number: the tables fix some, neighbours stay near in number."""

import numpy as np
from scipy.optimize import linear_sum_assignment

import tables
from arithmetic import length
from measurements import Measurements
from topology import HalfMesh, Mesh
from triangulate import edge_owners


def _apex(owners, triangles, edge, other_than):
    faces = owners[(min(edge), max(edge))]
    tips = [next(v for v in triangles[f].tolist() if v not in edge) for f in faces]
    return next(v for v in tips if v != other_than)


def known_vertices(data: Measurements, half: HalfMesh, mesh: Mesh,
                   owners: dict[tuple[int, int], list[int]]) -> dict[int, int]:
    """Fixed number -> mesh vertex, before the rest is numbered."""
    known = {}
    for landmark, number in tables.landmark_vertices().items():
        vertex = half.named.get(landmark)
        if vertex is None:
            vertex = int(mesh.mirror[half.named[int(data.mirror[landmark])]])
        known[number] = vertex
    known[tables.upper_lid_middle()] = half.lid_middle
    p = half.patch
    known.update({k: p[k] for k in range(5)})
    known[9] = _apex(owners, mesh.triangles, (p[0], p[3]), p[1])
    known[10] = _apex(owners, mesh.triangles, (known[9], p[3]), p[0])
    return known


def _pair(mesh, mean, owners, taken, near):
    """Two free triangles that share an edge: vertices for the numbers 5, 7, 6 and 8."""
    best = None
    for edge, faces in sorted(owners.items()):
        if len(faces) != 2:
            continue
        t, u = mesh.triangles[faces[0]].tolist(), mesh.triangles[faces[1]].tolist()
        if taken & (set(t) | set(u)):
            continue
        distance = length(mean[list(set(t) | set(u))] - near).sum()
        if best is None or distance < best[0]:
            k = next(k for k in range(3) if t[k] not in edge)
            best = (distance, t[k], t[(k + 1) % 3], t[(k + 2) % 3],
                    next(v for v in u if v not in edge))
    return {5: best[1], 7: best[2], 6: best[3], 8: best[4]}


def number(data: Measurements, half: HalfMesh, mesh: Mesh, mean: np.ndarray,
           candidates: list[int]) -> tuple[np.ndarray, np.ndarray]:
    """Returns (order, triangles): mesh vertex of each number, and the renumbered triangle list."""
    owners = edge_owners(mesh.triangles)
    known = known_vertices(data, half, mesh, owners)
    inside = set(candidates)
    taken = set(known.values()) | inside
    known.update(_pair(mesh, mean, owners, taken, mean[known[9]]))
    if len(set(known.values())) != len(known):
        raise ValueError("two numbers fall on one vertex")

    table = set(tables.contour_candidates().tolist())
    for value, vertex in known.items():
        if (value in table) != (vertex in inside):
            raise ValueError(f"vertex number {value} is on the wrong side of the candidate table")
    order = np.full(len(mean), -1)
    for value, vertex in known.items():
        order[value] = vertex
    marks = np.array(sorted(known))
    target = np.column_stack([
        np.interp(np.arange(len(mean)), marks, mean[order[marks]][:, k]) for k in range(3)])
    used = set(known.values())
    for among_candidates in (True, False):
        numbers = [n for n in range(len(mean)) if order[n] < 0 and (n in table) == among_candidates]
        free = [v for v in range(len(mean)) if v not in used and (v in inside) == among_candidates]
        cost = length(target[numbers][:, None] - mean[free][None])
        rows, columns = linear_sum_assignment(np.round(cost, 3))
        for r, c in zip(rows, columns):
            order[numbers[r]] = free[c]

    place = np.empty(len(order), int)
    place[order] = np.arange(len(order))
    return order, _triangle_order(place[mesh.triangles])


# Fixed: part of the format of the triangle table.
FIRST_ROWS = [(0, 2, 1), (1, 3, 0), (4, 3, 1), (4, 1, 2), (5, 7, 6), (8, 6, 7), (0, 3, 9),
              (9, 3, 10)]


def _triangle_order(triangles):
    """The fixed first rows, then by smallest vertex number, which leads each row."""
    turned = set()
    for t in triangles.tolist():
        k = t.index(min(t))
        turned.add((t[k], t[(k + 1) % 3], t[(k + 2) % 3]))
    for row in FIRST_ROWS:
        k = row.index(min(row))
        turned.remove((row[k], row[(k + 1) % 3], row[(k + 2) % 3]))
    return np.array(FIRST_ROWS + sorted(turned))
