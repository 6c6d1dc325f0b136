# SPDX-License-Identifier: MIT
"""The tables of data/ that tie vertices to landmarks. They are fixed: part of the file format."""

import re

import numpy as np

from measurements import DATA


def _read(name):
    text = re.sub(r"//.*", "", (DATA / name).read_text())
    return np.array([int(number) for number in re.findall(r"\d+", text)])


def default_contour() -> np.ndarray:
    return _read("default_contour_vertex_indices.inc")


def inner_landmarks() -> np.ndarray:
    return _read("inner_landmark_vertex_indices.inc")


def contour_candidates() -> np.ndarray:
    return _read("contour_candidate_vertex_indices.inc")


# Beyond the tables: upper lid's middle at image left, above landmark 48, and the nose ridge.
LID_MIDDLE = 1154
RIDGE = {97: 1335, 98: 1366, 99: 1443, 100: 1513}


def landmark_vertices() -> dict[int, int]:
    """Vertex of each landmark that has one: 0..94 and the ridge 97..100."""
    table = dict(enumerate(np.concatenate([default_contour(), inner_landmarks()]).tolist()))
    table.update(RIDGE)
    return table
