# SPDX-License-Identifier: MIT
"""Smooth fields over a triangle mesh through values given at places on it.

The smoothness is the integral of squared second derivatives, in the hinge form of Bergou et al.,
"A quadratic bending model for inextensible surfaces" (2006): each inner edge counts the kink of the
field over its two triangles, unfolded flat. Straight-line fields cost nothing, also at the borders,
so lids and lips end freely and do not feel each other across the open eye or mouth.
"""

from __future__ import annotations

from dataclasses import dataclass

import numpy as np
import scipy.sparse as sp
from scipy.spatial import cKDTree

from arithmetic import Solver, length
from triangulate import edge_owners


def subdivided(places: np.ndarray, triangles: np.ndarray) -> tuple[np.ndarray, np.ndarray]:
    """Each triangle cut in four; the given vertices keep their numbers."""
    edges = np.unique(np.sort(np.concatenate(
        [triangles[:, [0, 1]], triangles[:, [1, 2]], triangles[:, [2, 0]]]), axis=1), axis=0)
    number = {tuple(e): len(places) + k for k, e in enumerate(edges.tolist())}
    middle = 0.5 * (places[edges[:, 0]] + places[edges[:, 1]])
    out = []
    for a, b, c in triangles.tolist():
        ab, bc, ca = (number[min(e), max(e)] for e in ((a, b), (b, c), (c, a)))
        out += [(a, ab, ca), (ab, b, bc), (ca, bc, c), (ab, bc, ca)]
    return np.concatenate([places, middle]), np.array(out)


def subdivision_matrix(count: int, triangles: np.ndarray) -> sp.csr_matrix:
    """The linear map from vertex values to those of the mesh cut in four."""
    edges = np.unique(np.sort(np.concatenate(
        [triangles[:, [0, 1]], triangles[:, [1, 2]], triangles[:, [2, 0]]]), axis=1), axis=0)
    rows = np.repeat(np.arange(len(edges)), 2)
    half = sp.csr_matrix((np.full(2 * len(edges), 0.5), (rows, edges.ravel())), (len(edges), count))
    return sp.vstack([sp.eye(count), half]).tocsr()


def _cot(points, at, one, two):
    a, b = points[one] - points[at], points[two] - points[at]
    if points.shape[1] == 2:
        cross = np.abs(a[:, 0] * b[:, 1] - a[:, 1] * b[:, 0])
    else:
        cross = length(np.cross(a, b))
    return np.einsum("ij,ij->i", a, b) / np.maximum(cross, 1e-9), 0.5 * cross


def bending(points: np.ndarray, triangles: np.ndarray) -> sp.csc_matrix:
    """The sparse form Q with f' Q f the bending of the field f; lengths are those of `points`."""
    hinges = []
    for edge, faces in sorted(edge_owners(triangles).items()):
        if len(faces) == 2:
            apex = [next(v for v in triangles[f].tolist() if v not in edge) for f in faces]
            hinges.append((*edge, *apex))
    h = np.array(hinges)
    a, b, c, d = h.T
    c01, area_0 = _cot(points, a, b, c)
    c02, area_1 = _cot(points, a, b, d)
    c03, _ = _cot(points, b, a, c)
    c04, _ = _cot(points, b, a, d)
    k = np.stack([c03 + c04, c01 + c02, -c01 - c03, -c02 - c04], axis=1)
    k *= np.sqrt(3.0 / np.maximum(area_0 + area_1, 1e-6))[:, None]
    rows = np.repeat(np.arange(len(h)), 4)
    kink = sp.csr_matrix((k.ravel(), (rows, h.ravel())), (len(h), len(points)))
    return (kink.T @ kink).tocsc()


@dataclass
class Anchors:
    """Places on a mesh: triangle and weights of its corners."""

    triangle: np.ndarray
    weights: np.ndarray

    def part(self, chosen: np.ndarray) -> Anchors:
        return Anchors(self.triangle[chosen], self.weights[chosen])

    def matrix(self, triangles: np.ndarray, count: int) -> sp.csr_matrix:
        """Maps values at `count` vertices to values at the places."""
        rows = np.repeat(np.arange(len(self.triangle)), 3)
        return sp.csr_matrix((self.weights.ravel(), (rows, triangles[self.triangle].ravel())),
                             (len(self.triangle), count))


def locate(flat: np.ndarray, triangles: np.ndarray, places: np.ndarray) -> Anchors:
    """The triangle of each place, or the nearest one for places a little outside."""
    a, b, c = (flat[triangles[:, k]] for k in range(3))
    det = (b - a)[:, 0] * (c - a)[:, 1] - (b - a)[:, 1] * (c - a)[:, 0]
    near = np.sort(cKDTree((a + b + c) / 3.0).query(places, k=min(40, len(triangles)))[1], axis=1)
    ap, ab, ac = places[:, None] - a[near], (b - a)[near], (c - a)[near]
    w1 = (ap[..., 0] * ac[..., 1] - ap[..., 1] * ac[..., 0]) / det[near]
    w2 = (ab[..., 0] * ap[..., 1] - ab[..., 1] * ap[..., 0]) / det[near]
    w = np.stack([1.0 - w1 - w2, w1, w2], axis=-1)
    best = np.argmax(np.round(w.min(axis=2), 9), axis=1)
    rows = np.arange(len(places))
    return Anchors(near[rows, best], w[rows, best])


def through_values(quadratic: sp.spmatrix, matrix: sp.spmatrix, values: np.ndarray,
                   weights: np.ndarray) -> np.ndarray:
    """Fields (count, k) that bend least while `matrix @ field` stays at `values` (n, k)."""
    pull = matrix.T @ sp.diags(weights)
    return Solver(quadratic + pull @ matrix)(np.asarray(pull @ values))


def surface_through(quadratic: sp.spmatrix, matrix: sp.spmatrix, points: np.ndarray,
                    weights: np.ndarray, slopes: sp.spmatrix, slope_weight: float) -> np.ndarray:
    """Vertex positions (count, 3) through `points`; `slopes` (m, 3 count) @ x should vanish.

    The unknowns of `slopes` are ordered x of all vertices, then y, then z.
    """
    count = quadratic.shape[0]
    pull = matrix.T @ sp.diags(weights)
    system = sp.block_diag([quadratic + pull @ matrix] * 3) + slope_weight * (slopes.T @ slopes)
    right = np.concatenate([pull @ points[:, k] for k in range(3)])
    return Solver(system)(right).reshape(3, count).T
