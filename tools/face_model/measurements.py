# SPDX-License-Identifier: MIT
"""Reads the measured figures that the face model is built from (data/face_statistics)."""

import csv
from dataclasses import dataclass
from pathlib import Path

import numpy as np

DATA = Path(__file__).resolve().parents[2] / "data"
FOLDER = DATA / "face_statistics"


@dataclass
class Measurements:
    """Sample points of the mean head and their displacements, millimetres, upright head frame."""

    points: np.ndarray  # (n, 3)
    normals: np.ndarray  # (n, 3), unit, outward
    region: np.ndarray  # (n,) names
    landmark: np.ndarray  # (n,) landmark index or -1
    mirror: np.ndarray  # (n,) id of the mirrored point, its own on the midline
    identity: np.ndarray  # (16, n, 3) for one standard deviation
    expression: np.ndarray  # (20, n, 3) at full intensity
    expression_names: list[str]
    measured: np.ndarray  # (n,) False for points of our own


def _modes(path):
    with open(path, newline="") as file:
        rows = list(csv.reader(file))
    names = [name[:-2] for name in rows[0][1::3]]
    values = np.array(rows[1:], dtype=float)[:, 1:]
    return names, values.reshape(len(values), len(names), 3).transpose(1, 0, 2).copy()


def load() -> Measurements:
    """The figures of data/face_statistics."""
    with open(FOLDER / "points.csv", newline="") as file:
        rows = list(csv.DictReader(file))
    _, identity = _modes(FOLDER / "identity_modes.csv")
    names, expression = _modes(FOLDER / "expression_modes.csv")
    return Measurements(
        points=np.array([[float(row[key]) for key in ("x", "y", "z")] for row in rows]),
        normals=np.array([[float(row[key]) for key in ("nx", "ny", "nz")] for row in rows]),
        region=np.array([row["region"] for row in rows]),
        landmark=np.array([int(row["landmark"] or -1) for row in rows]),
        mirror=np.array([int(row["mirror"]) for row in rows]),
        identity=identity,
        expression=expression,
        expression_names=names,
        measured=np.ones(len(rows), bool),
    )
