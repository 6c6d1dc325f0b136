# SPDX-License-Identifier: MIT
"""Chooses the mesh vertices that serve as contour candidates: where outlines of heads run."""

import numpy as np
from scipy.spatial import cKDTree

import fields
import render
from shipped import Model

CAMERA_DISTANCE = 700.0
ROW = 2.0  # mm between the rows in which an outline is read
REACH = 3.0  # mm, how near a candidate has to be
TEMPLES = 22.0  # mm above the tragions: the ends of the outline
TOP = 32.0  # nodding heads bring skin above the temples to the outline's ends
BESIDE = (13.0, 40.0)  # mm from the midline: the hollows beside nose and mouth, round the eyes
BESIDE_LOW = -40.0
FOREHEAD = 45.0  # height above which nothing of the outline comes near
EAR = 11.0  # depth at which outlines end before the ear
SEED = 534

# The skin on which outlines run, on the mean head: its lower end, the jaw's border, as height over
# depth, and its inner end as distance from the middle over height (mm).
JAW_BORDER = np.array([(8, -44), (18, -51), (32, -66.5), (51, -79.5), (70, -85.5), (86, -90.5)])
INNER_END = np.array(
    [(-92, 0), (-86, 14), (-80, 27), (-68, 32), (-30, 33), (5, 44), (24, 50), (60, 50)])


def outline_skin(points: np.ndarray, top: float = TEMPLES) -> np.ndarray:
    """Marks the skin of the cheeks, the jaw and the chin on which outlines run.

    Not the underside of the chin: a candidate there would draw the chin's landmarks backwards and
    nod the head.
    """
    above_jaw = points[:, 1] > np.interp(points[:, 2], *JAW_BORDER.T)
    outside = np.abs(points[:, 0]) >= np.interp(points[:, 1], *INNER_END.T)
    before_ear = points[:, 2] > EAR
    return above_jaw & outside & before_ear & (points[:, 1] < top)


def spare(points: np.ndarray) -> np.ndarray:
    """How fit each vertex is as a candidate that no outline landmark should ever find.

    That is its distance from the outline skin, on the forehead and beside eyes, nose and mouth.
    Nose, lips and chin are out: they stand at the rim of the picture when the head is turned away,
    and would draw the landmarks of the far cheek to them.
    """
    across, height = np.abs(points[:, 0]), points[:, 1]
    beside = (across > BESIDE[0]) & (across < BESIDE[1]) & (height > BESIDE_LOW)
    distance = cKDTree(points[outline_skin(points, TOP)]).query(points)[0]
    return np.where(beside | (height > FOREHEAD), distance, -1.0)


def seen_from(points: np.ndarray, yaw: float, pitch: float) -> np.ndarray:
    """Places in the picture of a turned head, in mm at the head's own distance."""
    turned = render.turned(points, yaw, pitch)
    return turned[:, :2] / (CAMERA_DISTANCE - turned[:, 2:]) * CAMERA_DISTANCE


def silhouette(picture: np.ndarray) -> np.ndarray:
    """Numbers of the places furthest out to the left and to the right, row by row."""
    level = np.round(picture[:, 1] / ROW).astype(int)
    out = []
    for sign in (-1.0, 1.0):
        order = np.lexsort((-sign * picture[:, 0], level))
        out.append(order[np.unique(level[order], return_index=True)[1]])
    return np.concatenate(out)


def choose(points: np.ndarray, mirror: np.ndarray, must: list[int], never: list[int],
           wanted: int) -> list[int]:
    """`wanted` vertices, symmetric: `must` and their mirrors, and the rest where they do no harm.

    Candidates between the rows of the outline landmarks would let the landmarks slide along the
    outline, so what the table has to spare lies as far from the outlines as the face allows.
    `never` are out. Vertices on the midline come in twos, so that the number stays even.
    """
    chosen = set(must) | {int(mirror[v]) for v in must}
    barred = set(never) | {int(mirror[v]) for v in never}
    if chosen & barred:
        raise ValueError("a vertex is both wanted and barred")
    fitness = spare(points)
    fitness = np.round(fitness + fitness[mirror], 6)
    alone = mirror == np.arange(len(mirror))
    odd = (wanted - len(chosen)) % 2
    while len(chosen) < wanted:
        gain = fitness.copy()
        gain[list(chosen | barred)] = -9.0
        room = wanted - len(chosen)
        if odd and room == 1:
            gain[~alone] = -9.0
        elif room == 2 and not odd:
            gain[alone] = -9.0
        v = int(np.argmax(gain))
        chosen |= {v, int(mirror[v])}
        if alone[v]:
            odd = 1 - odd
    return sorted(chosen)


def coverage(model: Model, table: np.ndarray, pitches: tuple[float, ...], spread: float,
             people: int = 20) -> tuple[float, float, int]:
    """How well candidates cover the outline at yaws from -60 to 60 degrees, row by row.

    Returns the share of rows with a candidate within reach of the outline's place in the picture,
    the share with one within reach on the skin, and the number of rows.
    """
    cut = fields.subdivision_matrix(len(model.mean), model.triangles)
    _, triangles = fields.subdivided(model.texture, model.triangles)
    cut = fields.subdivision_matrix(cut.shape[0], triangles) @ cut
    rng = np.random.RandomState(SEED + 1)
    rows = in_picture = on_skin = 0
    for person in range(people if spread else 1):
        shape = rng.standard_normal(len(model.identity)) * spread
        points = model.mean + np.tensordot(shape, model.identity, 1)
        fine = cut @ points
        skin = np.flatnonzero(outline_skin(cut @ model.mean))
        tree = cKDTree(points[table])
        for pitch in pitches:
            for yaw in np.arange(-60.0, 60.1, 5.0):
                picture = seen_from(fine[skin], yaw, pitch)
                rim = silhouette(picture)
                flat_tree = cKDTree(seen_from(points[table], yaw, pitch))
                in_picture += (flat_tree.query(picture[rim])[0] <= REACH).sum()
                on_skin += (tree.query(fine[skin[rim]])[0] <= REACH).sum()
                rows += len(rim)
    return in_picture / rows, on_skin / rows, rows
