# SPDX-License-Identifier: MIT
"""Lifts the flat mesh to the smooth surface through the measured points, with its modes."""

from __future__ import annotations

from dataclasses import dataclass
from typing import TYPE_CHECKING

import numpy as np
import scipy.sparse as sp

import fields
from arithmetic import length
from measurements import Measurements

if TYPE_CHECKING:
    from domain import Domain
    from topology import Mesh

POINT_WEIGHT = 1e3
NORMAL_WEIGHT = 4.0
ROUNDS = 2  # the bending is measured on the surface found before
GUIDE_WEIGHT = 20.0  # points of our own bend to the measured ones


@dataclass
class Samples:
    """The measured points on both halves of the flat face."""

    ids: np.ndarray
    flat: np.ndarray


def samples(data: Measurements, dom: Domain) -> Samples:
    """The points of the half and their mirror images."""
    ids, flat = list(dom.ids), list(dom.flat)
    for k, point in enumerate(dom.ids):
        if data.mirror[point] != point:
            ids.append(data.mirror[point])
            flat.append(dom.flat[k] * [-1.0, 1.0])
    return Samples(np.array(ids), np.array(flat))


def _slopes(points, triangles, anchors, normals):
    """Rows that vanish when the triangle round each place is square to the normal there."""
    corners = triangles[anchors.triangle]
    count = len(points)
    rows, columns, values = [], [], []
    row = 0
    for corner, normal in zip(corners, normals):
        for k in (1, 2):
            along = length(points[corner[k]] - points[corner[0]])
            for axis in range(3):
                rows += [row, row]
                columns += [corner[k] + axis * count, corner[0] + axis * count]
                values += [normal[axis] / along, -normal[axis] / along]
            row += 1
    return sp.csr_matrix((values, (rows, columns)), (row, 3 * count))


@dataclass
class Surface:
    """The mesh cut in four, lifted; the first vertices are those of the mesh itself."""

    flat: np.ndarray
    triangles: np.ndarray
    points: np.ndarray
    quadratic: sp.spmatrix  # bending form on the surface
    matrix: sp.spmatrix  # values at the measured points from vertex values
    ids: np.ndarray


def lift(data: Measurements, dom: Domain, mesh: Mesh) -> Surface:
    """The smooth surface through the measured points."""
    known = samples(data, dom)
    flat, triangles = fields.subdivided(mesh.flat, mesh.triangles)
    anchors = fields.locate(flat, triangles, known.flat)
    matrix = anchors.matrix(triangles, len(flat))
    places = data.points[known.ids]

    weights = np.where(data.measured[known.ids], POINT_WEIGHT, GUIDE_WEIGHT)
    slope_known = length(data.normals[known.ids]) > 0.5

    quadratic = fields.bending(flat, triangles)
    points = fields.through_values(quadratic, matrix, places, weights)
    for _ in range(ROUNDS):
        quadratic = fields.bending(points, triangles)
        slopes = _slopes(points, triangles, anchors.part(slope_known),
                         data.normals[known.ids[slope_known]])
        points = fields.surface_through(
            quadratic, matrix, places, weights, slopes, NORMAL_WEIGHT)
    measured = data.measured[known.ids]
    return Surface(flat, triangles, points, fields.bending(points, triangles), matrix[measured],
                   known.ids[measured])


def mirror_field(field: np.ndarray, mesh: Mesh) -> np.ndarray:
    """The mirror image of displacements or places (n, 3)."""
    return field[mesh.mirror] * [-1.0, 1.0, 1.0]


def partner(name: str, names: list[str]) -> tuple[int, float]:
    """Number of the mirrored expression and the sign it comes with."""
    if name[-2:] in ("_L", "_R"):
        return names.index(name[:-1] + {"L": "R", "R": "L"}[name[-1]]), 1.0
    return names.index(name), -1.0 if name.endswith("_side") else 1.0


def symmetric(fields_of: np.ndarray, names: list[str], mesh: Mesh) -> np.ndarray:
    """Expression fields (..., n, 3) by number, made exact mirror images of their partners."""
    out = []
    for k, name in enumerate(names):
        other, sign = partner(name, names)
        out.append(0.5 * (fields_of[k] + sign * mirror_field(fields_of[other], mesh)))
    return np.array(out)


def modes(data: Measurements, mesh: Mesh,
          surface: Surface) -> tuple[np.ndarray, np.ndarray, np.ndarray]:
    """Mean (n, 3), identity modes (16, n, 3), expressions (20, n, 3): exactly symmetric."""
    count = len(mesh.flat)
    every = np.concatenate([data.identity, data.expression])
    values = every[:, surface.ids].transpose(1, 0, 2).reshape(len(surface.ids), -1)
    carried = fields.through_values(
        surface.quadratic, surface.matrix, values, np.full(len(values), POINT_WEIGHT))
    carried = carried[:count].reshape(count, len(every), 3).transpose(1, 0, 2)
    mean = surface.points[:count]
    mean = 0.5 * (mean + mirror_field(mean, mesh))
    identity = carried[:len(data.identity)]
    identity = np.array([0.5 * (m + mirror_field(m, mesh)) for m in identity])
    return mean, identity, symmetric(
        carried[len(data.identity):], data.expression_names, mesh)
