"""Chooses the mesh vertices that serve as contour candidates: where outlines of heads run."""

import numpy as np
import scipy.sparse as sp
from scipy.spatial import cKDTree

import render

CAMERA_DISTANCE = 700.0
ROW = 2.0  # mm between the rows in which an outline is read
REACH = 3.0  # mm, how near a candidate has to be
TEMPLES = 22.0  # mm above the tragions: the ends of the outline
TOP = 32.0  # nodding heads bring skin above the temples to the outline's ends
EAR = 11.0  # depth at which outlines end before the ear
SEED = 534

# Poses in which candidates are wanted, with their worth.
YAWS = np.arange(-65.0, 65.1, 5.0)
PITCH_WORTH = {0.0: 5.0, -12.0: 1.0, 12.0: 1.0, -24.0: 0.5, 24.0: 0.5}
PEOPLE = 4
FAR = 9.0  # mm on the skin; further along the view a candidate no longer stands for the place
SKIN_WORTH = 0.05
AGAIN = 0.02  # what is left of a demand once it is served


# The skin on which outlines run, on the mean head: its lower end, the jaw's border, as height over
# depth, and its inner end as distance from the middle over height (mm).
JAW_BORDER = np.array([(8, -44), (18, -51), (32, -66.5), (51, -79.5), (70, -85.5), (86, -90.5)])
INNER_END = np.array([(-92, 0), (-86, 14), (-80, 27), (-68, 32), (-30, 33), (5, 44), (24, 50), (60, 50)])


def outline_skin(points, top=TEMPLES):
    """Marks the skin of the cheeks, the jaw and the chin on which outlines run.

    Not the underside of the chin: a candidate there would draw the chin's landmarks backwards and
    nod the head.
    """
    above_jaw = points[:, 1] > np.interp(points[:, 2], *JAW_BORDER.T)
    outside = np.abs(points[:, 0]) >= np.interp(points[:, 1], *INNER_END.T)
    before_ear = points[:, 2] > EAR
    return above_jaw & outside & before_ear & (points[:, 1] < top)


def spare(points):
    """How fit each vertex is as a candidate that is never asked for: above zero on the outline skin
    and 4 mm round it, else falling with the distance on the front of the cheek, where no outline
    and no edge of the hull comes near; lowest elsewhere."""
    above_jaw = points[:, 1] > np.interp(points[:, 2], *JAW_BORDER.T)
    distance = cKDTree(points[outline_skin(points, TOP)]).query(points)[0]
    front = above_jaw & (points[:, 1] < 15.0) & (points[:, 1] > -66.0)
    fitness = np.where(front, -1.0 - distance / 1000.0, -2.0)
    return np.where(above_jaw & (distance < 4.0) & (points[:, 1] < TOP), 1.0, fitness)


def seen_from(points, yaw, pitch):
    """Places in the picture of a turned head, in mm at the head's own distance."""
    turned = render.turned(points, yaw, pitch)
    return turned[:, :2] / (CAMERA_DISTANCE - turned[:, 2:]) * CAMERA_DISTANCE


def silhouette(picture):
    """Numbers of the places furthest out to the left and to the right, row by row."""
    level = np.round(picture[:, 1] / ROW).astype(int)
    out = []
    for sign in (-1.0, 1.0):
        order = np.lexsort((-sign * picture[:, 0], level))
        out.append(order[np.unique(level[order], return_index=True)[1]])
    return np.concatenate(out)


def lower_edge(picture):
    """Numbers of the lowest places, column by column, round the chin."""
    column = np.round(picture[:, 0] / ROW).astype(int)
    order = np.lexsort((picture[:, 1], column))
    lowest = order[np.unique(column[order], return_index=True)[1]]
    return lowest[np.abs(picture[lowest, 0] - picture[:, 0].mean()) < 45.0]


def demands(points, identity, fine_points, fine_identity):
    """Outline places, and which vertices serve them: a sparse 0/1 matrix and a worth a row.

    A vertex serves a place when it is within reach in the picture and not far along the view; a
    second, smaller demand asks for one within reach on the skin.
    """
    rng = np.random.RandomState(SEED)
    blocks, worths = [], []
    for person in range(PEOPLE):
        shape = rng.standard_normal(len(identity)) * (person > 0)
        fine = fine_points + np.tensordot(shape, fine_identity, 1)
        coarse = points + np.tensordot(shape, identity, 1)
        tree = cKDTree(coarse)
        for pitch, worth in PITCH_WORTH.items():
            skin = np.flatnonzero(outline_skin(fine_points, TEMPLES if pitch == 0 else TOP))
            for yaw in YAWS:
                picture = seen_from(fine[skin], yaw, pitch)
                flat = seen_from(coarse, yaw, pitch)
                for rim, share in ((silhouette(picture), 1.0), (lower_edge(picture), 0.1)):
                    rows, columns, skin_rows, skin_columns = [], [], [], []
                    for k, close in enumerate(tree.query_ball_point(fine[skin[rim]], FAR)):
                        close = np.array(close, int)
                        offset = np.linalg.norm(flat[close] - picture[rim[k]], axis=1)
                        serves = close[offset <= REACH]
                        rows += [k] * len(serves)
                        columns += serves.tolist()
                        depth = np.linalg.norm(coarse[close] - fine[skin[rim[k]]], axis=1)
                        serves = close[depth <= REACH]
                        skin_rows += [k] * len(serves)
                        skin_columns += serves.tolist()
                    size = (len(rim), len(points))
                    blocks.append(sp.csr_matrix((np.ones(len(rows)), (rows, columns)), size))
                    blocks.append(sp.csr_matrix(
                        (np.ones(len(skin_rows)), (skin_rows, skin_columns)), size))
                    worths.append(np.full(len(rim), worth * share))
                    worths.append(np.full(len(rim), worth * share * SKIN_WORTH))
    return sp.vstack(blocks).tocsc(), np.concatenate(worths)


def choose(points, serves, worth, mirror, must, never, wanted):
    """`wanted` vertices, symmetric, that serve most: greedily the pair that adds most each time.

    `must` are in, `never` are out. Vertices on the middle line come in twos, so that the number
    stays even.
    """
    chosen = set(must) | {int(mirror[v]) for v in must}
    barred = set(never) | {int(mirror[v]) for v in never}
    if chosen & barred:
        raise ValueError("a vertex is both wanted and barred")
    fitness = spare(points)
    left = worth.copy()

    def take(v):
        chosen.add(v)
        left[serves.indices[serves.indptr[v]:serves.indptr[v + 1]]] *= AGAIN

    for v in sorted(chosen):
        take(v)
    odd = (wanted - len(chosen)) % 2
    while len(chosen) < wanted:
        gain = np.round(serves.T @ left, 6)
        gain = np.where(fitness > 0, gain + gain[mirror], np.round(fitness + fitness[mirror], 6))
        gain[list(chosen | barred)] = -9.0
        room = wanted - len(chosen)
        alone = mirror == np.arange(len(mirror))
        if odd and room == 1:
            gain[~alone] = -9.0
        elif room == 2 and not odd:
            gain[alone] = -9.0
        v = int(np.argmax(gain))
        take(v)
        if alone[v]:
            odd = 1 - odd
        else:
            take(int(mirror[v]))
    return sorted(chosen)


def coverage(model, table, pitches, spread, people=20):
    """How well candidates cover the outline at yaws from -60 to 60 degrees, row by row.

    Returns the share of rows with a candidate within reach of the outline's place in the picture,
    the share with one within reach on the skin, and the number of rows.
    """
    import fields
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
