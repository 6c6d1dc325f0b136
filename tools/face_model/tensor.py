# SPDX-License-Identifier: MIT
"""How an identity changes an expression: the interaction tensor.

Deformation transfer (Sumner and Popovic, 2004) to first order: an expression turns and stretches
each triangle; on another person it does the same to that person's triangle. With S the expression's
deformation gradient at a triangle of the mean face and D the identity mode's displacement, the
change T of the expression's displacement has the gradient (S - 1) grad D. A longer jaw so swings
further down, and a wider mouth smiles wider.

Where lids meet the triangles do not know of each other: there the closing lid follows the resting
one, so that a person with large eyes can shut them.
"""

import numpy as np
import scipy.sparse as sp

import writer
from arithmetic import Solver, dot, length

FAR_WEIGHT = 0.05  # holds the change at zero where the expression does not move the skin
MOVES = 0.35  # mm; skin that moves less is far from the expression
CONTACT_WEIGHT = 200.0


def _frames(points, triangles):
    """Per triangle two edges and a normal of edge length, as columns."""
    a, b, c = (points[triangles[:, k]] for k in range(3))
    e, f = b - a, c - a
    n = np.cross(e, f)
    n = n / np.sqrt(np.maximum(length(n), 1e-9))[:, None]
    return np.stack([e, f, n], axis=2)


def _gradient_operator(points, triangles):
    """Per triangle the 3 x 3 map from corner values to the gradient on the surface, and areas."""
    a, b, c = (points[triangles[:, k]] for k in range(3))
    normal = np.cross(b - a, c - a)
    double = length(normal)
    normal = normal / double[:, None]
    edges = np.stack([c - b, a - c, b - a], axis=2)
    return np.cross(normal[:, :, None], edges, axisa=1, axisb=1, axisc=1) / double[:, None, None], \
        0.5 * double


def lid_contacts(face: np.ndarray, upper: list[int],
                 lower: list[int]) -> list[tuple[int, int, int, float]]:
    """For each upper rim vertex the place on the lower rim where it rests.

    As (vertex, two vertices of the lower rim, share of the way between them).
    """
    out = []
    for v in upper:
        best = None
        for a, b in zip(lower, lower[1:]):
            along = face[b] - face[a]
            t = float(np.clip(dot(face[v] - face[a], along) / dot(along, along), 0.0, 1.0))
            distance = length(face[a] + t * along - face[v])
            if best is None or distance < best[0] - 1e-9:
                best = (distance, a, b, t)
        out.append((v, *best[1:]))
    return out


class Transfer:
    """Carries expressions from one face of a mesh to another."""

    def __init__(self, triangles: np.ndarray):
        self.triangles = triangles

    def _system(self, points, move):
        """Gradient operator, its weighted transpose and the matrix of the least-squares problem."""
        gradient, area = _gradient_operator(points, self.triangles)
        rows = np.repeat(np.arange(3 * len(self.triangles)), 3)
        columns = np.repeat(self.triangles, 3, axis=0).ravel()
        operator = sp.csr_matrix(
            (gradient.ravel(), (rows, columns)), (3 * len(self.triangles), len(points)))
        weighted = operator.T @ sp.diags(np.repeat(area, 3))
        size = length(move)
        far = FAR_WEIGHT * np.exp(-((size / MOVES) ** 2)) + 1e-5
        return operator, weighted, weighted @ operator + sp.diags(far)

    def _change(self, points, move):
        """Deformation gradient of the expression at each triangle, less one."""
        rest = np.linalg.inv(_frames(points, self.triangles))
        return _frames(points + move, self.triangles) @ rest - np.eye(3)

    def displacement(self, mean: np.ndarray, move: np.ndarray, face: np.ndarray) -> np.ndarray:
        """The expression's whole displacement on another face."""
        operator, weighted, system = self._system(face, move)
        slope = (operator @ face).reshape(-1, 3, 3)
        wanted = np.einsum("tcd,tgd->tgc", self._change(mean, move), slope).reshape(-1, 3)
        return Solver(system)(weighted @ wanted)

    def first_order(self, mean: np.ndarray, move: np.ndarray, identity: np.ndarray,
                    contacts: list[tuple[int, int, int, float]]) -> np.ndarray:
        """Change of the displacement for one unit of each identity mode."""
        operator, weighted, system = self._system(mean, move)
        change = self._change(mean, move)
        touch = sp.csr_matrix(
            (np.ones(len(contacts)), (np.arange(len(contacts)), [c[0] for c in contacts])),
            (len(contacts), len(mean)))
        solve = Solver(system + CONTACT_WEIGHT * touch.T @ touch)
        out = []
        for mode in identity:
            slope = (operator @ mode).reshape(-1, 3, 3)
            right = weighted @ np.einsum("tcd,tgd->tgc", change, slope).reshape(-1, 3)
            if contacts:
                follow = np.array([(1 - t) * mode[a] + t * mode[b] - mode[v]
                                   for v, a, b, t in contacts])
                right = right + CONTACT_WEIGHT * (touch.T @ follow)
            out.append(solve(right))
        return np.array(out)


def build(mean: np.ndarray, identity: np.ndarray, expression: np.ndarray, names: list[str],
          triangles: np.ndarray, lids: dict[str, tuple[list, list]]) -> np.ndarray:
    """Blocks T (identity, expression, n, 3) in mm for one unit of each.

    `lids` gives for each blink's name the upper and the lower rim's vertices, corner to corner.
    """
    transfer = Transfer(triangles)
    blocks = []
    for name, move in zip(names, expression):
        contacts = lid_contacts(mean + move, *lids[name]) if name in lids else []
        blocks.append(transfer.first_order(mean, move, identity, contacts))
    return np.array(blocks).transpose(1, 0, 2, 3)


def steps(blocks: np.ndarray) -> np.ndarray:
    """The blocks in the file's 8-bit steps, those that the engine does not read left empty."""
    values = np.rint(blocks * writer.FIXED_POINT / writer.TENSOR_STEP)
    values = values * read_pairs(*blocks.shape[:2])[:, :, None, None]
    if np.abs(values).max() > 127:
        raise ValueError("a tensor value does not fit 8 bits")
    return values.astype(np.int8)


def read_pairs(identities: int = 16, expressions: int = 20) -> np.ndarray:
    """Marks the blocks the engine reads: even sums, and the whole row of the last identity."""
    k, j = np.indices((identities, expressions))
    return ((k + j) % 2 == 0) | (k == identities - 1)


def expression_order(tensor: np.ndarray, names: list[str]) -> np.ndarray:
    """An order of the expressions in which the blocks that are read hold the most.

    Left and right partners get places of the same parity, so that both sides are treated alike;
    otherwise the order of the names is kept.
    """
    strength = (tensor**2).sum(axis=(2, 3))
    gain = strength[0::2].sum(axis=0) - strength[1::2].sum(axis=0)  # even place against odd
    groups, seen = [], set()
    for j, name in enumerate(names):
        if j in seen:
            continue
        group = [j]
        if name[-2:] in ("_L", "_R"):
            group.append(names.index(name[:-1] + {"L": "R", "R": "L"}[name[-1]]))
        seen.update(group)
        groups.append(group)
    # exact choice of groups for the even places: a small knapsack over the number of places
    places = len(names) // 2
    best = {0: (0.0, ())}
    for g, group in enumerate(groups):
        for used, (value, taken) in sorted(best.items(), reverse=True):
            total = used + len(group)
            candidate = (round(value + gain[group].sum(), 6), taken + (g,))
            if total <= places and (total not in best or candidate[0] > best[total][0]):
                best[total] = candidate
    even = [j for g in best[places][1] for j in groups[g]]
    odd = [j for j in range(len(names)) if j not in even]
    order = np.empty(len(names), int)
    order[0::2], order[1::2] = even, odd
    return order
