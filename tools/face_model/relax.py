# SPDX-License-Identifier: MIT
"""Spreads mesh vertices so that the edges get the lengths wanted for them."""

from __future__ import annotations

from collections.abc import Callable
from typing import TYPE_CHECKING

import numpy as np
from scipy.spatial import Delaunay

import fields
from arithmetic import Nearest, length
from surface import Surface
from triangulate import flip_by_shape, signed_areas

if TYPE_CHECKING:
    from topology import HalfMesh

WALL_DISTANCE = 0.6  # of the wanted edge length, between free vertices and edges that stay
STRETCH = 1.17  # springs a little too long for the room push the vertices evenly apart


def _unique_edges(triangles):
    return np.unique(np.sort(np.concatenate(
        [triangles[:, [0, 1]], triangles[:, [1, 2]], triangles[:, [2, 0]]]), axis=1), axis=0)


def _pushes(points, edges, wanted):
    """Sum of the spring forces on each vertex; springs push only."""
    vector = points[edges[:, 0]] - points[edges[:, 1]]
    now = length(vector)
    wanted = wanted * STRETCH * np.sqrt((now**2).sum() / (wanted**2).sum())
    push = vector * (np.maximum(wanted - now, 0.0) / now)[:, None]
    total = np.zeros_like(points)
    np.add.at(total, edges[:, 0], push)
    np.add.at(total, edges[:, 1], -push)
    return total


def _off_the_wall(places, wall, sizing):
    distance, nearest = wall(places)
    least = WALL_DISTANCE * sizing(places)
    close = distance < least
    away = places - wall.points[nearest]
    scale = least / np.maximum(distance, 1e-9)
    return np.where(close[:, None], wall.points[nearest] + away * scale[:, None], places)


def spread(places: np.ndarray, count_fixed: int, sizing: Callable, inside: Callable,
           wall: np.ndarray, rounds: int = 400) -> np.ndarray:
    """Flat places, the first `count_fixed` of them immovable (Persson and Strang's scheme)."""
    wall = Nearest(wall)
    for step in range(rounds):
        triangles = Delaunay(places).simplices
        triangles = triangles[inside(places[triangles].mean(axis=1))]
        edges = _unique_edges(triangles)
        wanted = sizing(0.5 * (places[edges[:, 0]] + places[edges[:, 1]]))
        pace = 0.2 if step < rounds * 0.8 else 0.1
        moved = places + pace * _pushes(places, edges, wanted)
        moved = _off_the_wall(moved, wall, sizing)
        ok = inside(moved)
        ok[:count_fixed] = False
        places = np.where(ok[:, None], moved, places)
    return places


def spread_on_surface(half: HalfMesh, surface: Surface, rounds: int = 160,
                      flip_every: int = 8) -> tuple[np.ndarray, np.ndarray]:
    """Flat places and triangles of the half mesh, with lengths and angles measured in space.

    No triangle is ever turned over on the flat face.
    """
    flat, triangles = half.flat.copy(), half.triangles
    wall = Nearest(half.wall)
    free = np.ones(len(flat), bool)
    free[half.fixed] = False

    corner = surface.flat[surface.triangles]
    frame = np.stack([corner[:, 1] - corner[:, 0], corner[:, 2] - corner[:, 0]], axis=2)
    lifted = surface.points[surface.triangles]
    tangent = np.stack([lifted[:, 1] - lifted[:, 0], lifted[:, 2] - lifted[:, 0]], axis=2)
    jacobian = tangent @ np.linalg.inv(frame)
    back = np.linalg.pinv(jacobian, rcond=0.05)

    def lift(places):
        anchors = fields.locate(surface.flat, surface.triangles, places)
        points = np.einsum("nk,nkd->nd", anchors.weights, lifted[anchors.triangle])
        return points, anchors.triangle

    for step in range(rounds):
        points, at = lift(flat)
        if step % flip_every == 0:
            triangles = flip_by_shape(points, flat, triangles, half.keep)
        edges = _unique_edges(triangles)
        wanted = half.sizing(0.5 * (flat[edges[:, 0]] + flat[edges[:, 1]]))
        push = np.einsum("nij,nj->ni", back[at], _pushes(points, edges, wanted))
        pace = 0.15 if step < rounds * 0.7 else 0.06
        moved = _off_the_wall(flat + pace * push, wall, half.sizing)
        moved = np.where(free[:, None], moved, flat)
        for _ in range(20):
            turned = signed_areas(moved, triangles) < 0.02
            if not turned.any():
                break
            moved[triangles[turned].ravel()] = flat[triangles[turned].ravel()]
        flat = moved
    points, _ = lift(flat)
    return flat, flip_by_shape(points, flat, triangles, half.keep)
