# SPDX-License-Identifier: MIT
"""Arithmetic whose results do not hang on the processor or on the BLAS in use.

Sums and products that numpy does element by element are the same bits everywhere. Matrix products,
solvers and functions like the sine are not: BLAS libraries and processors differ in their last
bits. Nor is compiled code that a compiler for another processor may fuse products and sums in. So
lengths and products of short vectors, distances and interpolation are written out here, solutions
are refined until little more than their last bit is open, and what decisions hang on is rounded by
`settled`.
"""

import sys

import numpy as np
import scipy.sparse as sp
from scipy.sparse.linalg import splu
from scipy.spatial import cKDTree


def dot(a: np.ndarray, b: np.ndarray) -> np.ndarray:
    """Products of vectors along the last axis."""
    return (a * b).sum(axis=-1)


def length(vectors: np.ndarray) -> np.ndarray:
    """Lengths of vectors along the last axis."""
    return np.sqrt(dot(vectors, vectors))


def settled(values: np.ndarray, digits: int, doubt: float,
            nudge: float | np.ndarray = 0.0) -> np.ndarray:
    """Values rounded to decimal digits, as everywhere.

    `doubt` bounds by how much the values differ from machine to machine. Where that could make
    another decimal of one, it says so on the standard error: the model is as good, but others may
    not get the same bits. `nudge` is added first; it brings values that belong half way between two
    decimals to one side.
    """
    values = np.asarray(values) + nudge
    scaled = values * 10.0**digits
    unsettled = np.abs(scaled - np.floor(scaled) - 0.5) < doubt * 10.0**digits
    if unsettled.any():
        print(f"warning: {unsettled.sum()} of {values.size} values may be rounded otherwise on "
              "another processor", file=sys.stderr)
    return np.round(values, digits)


class Solver:
    """A factorised sparse matrix whose solutions are right but for little more than the last bit.

    One step of refinement with a residual in extended precision takes off what the condition of the
    matrix lets the factors lose.
    """

    def __init__(self, matrix: sp.spmatrix):
        self._factors = splu(matrix.tocsc())
        rows = matrix.tocsr()
        self._entries = rows.data.astype(np.longdouble)
        self._columns, self._starts = rows.indices, rows.indptr[:-1]

    def _residual(self, right: np.ndarray, solution: np.ndarray) -> np.ndarray:
        products = self._entries * solution[self._columns]
        return (right - np.add.reduceat(products, self._starts)).astype(float)

    def __call__(self, right: np.ndarray) -> np.ndarray:
        """Solutions (n,) or (n, k) for right sides of that shape."""
        solution = self._factors.solve(right)
        if right.ndim == 1:
            return solution + self._factors.solve(self._residual(right, solution))
        residual = np.column_stack([self._residual(*pair) for pair in zip(right.T, solution.T)])
        return solution + self._factors.solve(residual)


class Nearest:
    """Finds the nearest of some points; unlike the tree's own, its distances are sure bits."""

    def __init__(self, points: np.ndarray):
        self.points = points
        self._tree = cKDTree(points)

    def __call__(self, places: np.ndarray) -> tuple[np.ndarray, np.ndarray]:
        """Distance (n,) to the nearest point of each place (n, d), and that point's number."""
        number = self._tree.query(places)[1]
        return length(places - self.points[number]), number


def interpolated(wanted: np.ndarray, along: np.ndarray, line: np.ndarray) -> np.ndarray:
    """Points (n, d) of a polyline at lengths `wanted`, `along` being those of its own points."""
    before = np.clip(np.searchsorted(along, wanted, side="right") - 1, 0, len(along) - 2)
    slope = (line[before + 1] - line[before]) / (along[before + 1] - along[before])[:, None]
    out = slope * (wanted - along[before])[:, None] + line[before]
    return np.where((wanted >= along[-1])[:, None], line[-1], out)
