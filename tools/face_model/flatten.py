# SPDX-License-Identifier: MIT
"""Spreads a triangulated surface out flat with little distortion and without folds.

Minimises the symmetric Dirichlet energy (Smith and Schaefer, "Bijective parameterization with free
boundaries", 2015) by reweighted local/global steps (Rabinovich et al., "Scalable locally injective
mappings", 2017).
"""

import numpy as np
import scipy.sparse as sp

from arithmetic import Solver, length


def gradients(corners: np.ndarray) -> tuple[np.ndarray, np.ndarray]:
    """Per triangle (n, 3 corners, 3) the area and the gradients (2 x 3) in its own plane."""
    a, b, c = (corners[:, k] for k in range(3))
    e, f = b - a, c - a
    base = length(e)
    x = np.einsum("ij,ij->i", e, f) / base
    y = length(np.cross(e, f)) / base
    area = 0.5 * base * y
    grad = np.zeros((len(corners), 2, 3))
    grad[:, 0, 0], grad[:, 0, 1] = -1.0 / base, 1.0 / base
    grad[:, 1, 0] = (x / base - 1.0) / y
    grad[:, 1, 1] = -x / base / y
    grad[:, 1, 2] = 1.0 / y
    return area, grad


def jacobians(plane: np.ndarray, triangles: np.ndarray, grad: np.ndarray) -> np.ndarray:
    """Jacobians (n, 2, 2) of the maps from each triangle's own plane to the flat sheet."""
    return np.einsum("tkd,tgk->tdg", plane[triangles], grad)


def energy(jac: np.ndarray, area: np.ndarray) -> float:
    """The symmetric Dirichlet energy, infinite when a triangle is folded."""
    det = np.linalg.det(jac)
    if (det <= 0).any():
        return np.inf
    norm = np.einsum("tij,tij->t", jac, jac)
    return float((area * norm * (1.0 + 1.0 / det**2)).sum())


def symmetric_dirichlet(corners: np.ndarray, plane: np.ndarray, triangles: np.ndarray,
                        on_axis: np.ndarray, rounds: int = 80) -> np.ndarray:
    """Flat places of the vertices, starting from `plane`, which must not be folded.

    `corners` (n, 3, 3) are the corner positions of each triangle in space, whose shape the flat
    triangle is to keep. Vertices listed in `on_axis` stay on the line x = 0.
    """
    count = len(plane)
    area, grad = gradients(corners)
    plane = plane.copy()
    pinned = np.zeros(2 * count, bool)
    pinned[on_axis] = True  # x of the axis vertices
    free = np.flatnonzero(~pinned)
    # Moving the whole sheet along y changes nothing. Held here, it does not drift by rounding.
    height = round(plane[:, 1].mean(), 7)
    best = energy(jacobians(plane, triangles, grad), area)
    if not np.isfinite(best):
        raise ValueError("the starting layout has folded triangles")
    rows = np.repeat(np.arange(len(triangles)), 3)
    d = [sp.csr_matrix((grad[:, g].ravel(), (rows, triangles.ravel())), (len(triangles), count))
         for g in range(2)]
    for _ in range(rounds):
        jac = jacobians(plane, triangles, grad)
        u, s, vt = np.linalg.svd(jac)
        sign = np.sign(np.linalg.det(u @ vt))
        u[:, :, 1] *= sign[:, None]
        s = np.maximum(s, 1e-9)
        near = np.abs(s - 1.0) < 1e-5
        weight = np.sqrt(np.where(near, 4.0, (s - s**-3) / np.where(near, 1.0, s - 1.0)))
        w = np.einsum("tij,tj,tkj->tik", u, weight, u)
        rotation = u @ vt
        target = w @ rotation
        root = np.sqrt(area)
        # unknown order: all x, then all y
        a = sp.vstack([
            sp.hstack([sp.diags(root * w[:, i, 0]) @ d[g], sp.diags(root * w[:, i, 1]) @ d[g]])
            for i in range(2) for g in range(2)]).tocsc()
        rhs = np.concatenate([root * target[:, i, g] for i in range(2) for g in range(2)])
        now = np.concatenate([plane[:, 0], plane[:, 1]])
        normal = (a.T @ a + 1e-6 * sp.eye(2 * count)).tocsc()
        right = a.T @ rhs + 1e-6 * now
        solution = now.copy()
        solution[free] = Solver(normal[free][:, free])(
            right[free] - normal[free][:, np.flatnonzero(pinned)] @ now[pinned])
        solution[count:] += height - solution[count:].mean()
        step = solution.reshape(2, count).T - plane
        share = 1.0
        while share > 1e-6:
            trial = plane + share * step
            value = energy(jacobians(trial, triangles, grad), area)
            if value < best:
                break
            share *= 0.6
        else:
            break
        gain = best - value
        plane, best = trial, value
        if gain < 1e-7 * best:
            break
    return plane
