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


def upper_lid_middle() -> int:
    """The middle of the upper lid of the eye at image left."""
    return int(_read("lid_vertex_indices.inc")[0])


def landmark_vertices() -> dict[int, int]:
    """Vertex of each landmark that has one: 0..94 and the ridge of the nose, 97..100."""
    table = dict(enumerate(np.concatenate([default_contour(), inner_landmarks()]).tolist()))
    table.update(enumerate(_read("ridge_vertex_indices.inc").tolist(), start=97))
    return table
