"""Chooses the mesh vertices that serve as contour candidates: where outlines of heads run."""

import numpy as np
from scipy.spatial import cKDTree

import render

CAMERA_DISTANCE = 700.0
YAWS = np.arange(-65.0, 65.1, 5.0)
PITCHES = (-24.0, -12.0, 0.0, 12.0, 24.0)
PEOPLE, SPREAD, SEED = 12, 1.0, 534
ROW = 2.0
TOP = 44.0  # mm above the tragions; the outline landmarks start lower
TEMPLES = 24.0  # height of the ends of the outline


def outline_skin(mean, normals):
    """Skin on which the outline can run: cheeks, temples, jaw, chin and under it."""
    x, y = np.abs(mean[:, 0]), mean[:, 1]
    side = (x > np.where(y > 5, 47.0, np.where(y > -30.0, 33.0, 33.0))) & (y < TOP)
    low = y < -66.0
    return side | low


def silhouette(points, skin, yaw, pitch):
    """Numbers of the skin points that lie furthest out, row by row to both sides, and radially
    below the mouth (points are in the upright head frame)."""
    seen = render.turned(points[skin], yaw, pitch)
    picture = seen[:, :2] / (CAMERA_DISTANCE - seen[:, 2:]) * CAMERA_DISTANCE
    rows = np.round(picture[:, 1] / ROW).astype(int)
    out = set()
    for sign in (-1.0, 1.0):
        order = np.lexsort((-sign * picture[:, 0], rows))
        first = np.unique(rows[order], return_index=True)[1]
        out.update(order[first].tolist())
    columns = np.round(picture[:, 0] / ROW).astype(int)
    middle = np.abs(picture[:, 0] - picture[:, 0].mean()) < 55.0
    order = np.lexsort((picture[:, 1], columns))
    order = order[middle[order]]
    first = np.unique(columns[order], return_index=True)[1]
    out.update(order[first].tolist())
    return skin[sorted(out)]


def usage(mean, identity, fine_points, fine_identity, fine_triangles):
    """How often each vertex is the nearest to the outline, over heads and poses."""
    normals = render.vertex_normals(fine_points, fine_triangles)
    skin = np.flatnonzero(outline_skin(fine_points, normals))
    rng = np.random.RandomState(SEED)
    count = np.zeros(len(mean))
    for person in range(PEOPLE):
        shape = rng.standard_normal(len(identity)) * SPREAD * (person > 0)
        fine = fine_points + np.tensordot(shape, fine_identity, 1)
        tree = cKDTree(mean + np.tensordot(shape, identity, 1))
        for pitch in PITCHES:
            for yaw in YAWS:
                hit = silhouette(fine, skin, yaw, pitch)
                np.add.at(count, tree.query(fine[hit])[1], 1.0)
    return count


def choose(count, mirror, must, never, wanted):
    """`wanted` vertices, symmetric, the most used first; `must` are in, `never` are out."""
    both = count + count[mirror]
    chosen = set(must) | {int(mirror[v]) for v in must}
    barred = set(never) | {int(mirror[v]) for v in never}
    if chosen & barred:
        raise ValueError("a vertex is both wanted and barred")
    on_middle = [v for v in np.argsort(-both, kind="stable") if mirror[v] == v and v not in barred]
    if (wanted - len(chosen)) % 2:
        chosen.add(int(next(v for v in on_middle if v not in chosen)))
    for v in np.argsort(-both, kind="stable"):
        v, m = int(v), int(mirror[v])
        if len(chosen) >= wanted:
            break
        if v in chosen or v in barred:
            continue
        if v == m:  # middle vertices only come in twos, to keep the number even
            rest = [int(w) for w in on_middle if w not in chosen and w != v]
            if rest and both[rest[0]] > 0:
                chosen.update((v, rest[0]))
        else:
            chosen.update((v, m))
    if len(chosen) != wanted:
        raise ValueError("the candidates do not come out at their number")
    return sorted(chosen)


def row_skin(points):
    """The outline skin below the temples."""
    return outline_skin(points, None) & (points[:, 1] < TEMPLES)


def coverage(model, pitches, spread, people=20):
    """Share of the silhouette rows with a candidate within 3 mm, and the number of rows.

    The silhouette is that of the whole outline skin (cheeks, temples up to the outline's ends, jaw,
    chin), sampled finely on the triangles, at yaws from -60 to 60 degrees in steps of 5.
    """
    import fields
    import tables
    table = tables.contour_candidates()
    matrix = fields.subdivision_matrix(len(model.mean), model.triangles)
    _, triangles = fields.subdivided(model.texture, model.triangles)
    matrix = fields.subdivision_matrix(matrix.shape[0], triangles) @ matrix
    rng = np.random.RandomState(SEED + 1)
    hits = rows = 0
    for person in range(people if spread else 1):
        shape = rng.standard_normal(len(model.identity)) * spread
        points = model.mean + np.tensordot(shape, model.identity, 1)
        fine = matrix @ points
        skin = np.flatnonzero(row_skin(fine))
        tree = cKDTree(points[table])
        for pitch in pitches:
            for yaw in np.arange(-60.0, 60.1, 5.0):
                seen = render.turned(fine[skin], yaw, pitch)
                picture = seen[:, :2] / (CAMERA_DISTANCE - seen[:, 2:]) * CAMERA_DISTANCE
                level = np.round(picture[:, 1] / ROW).astype(int)
                for sign in (-1.0, 1.0):
                    order = np.lexsort((-sign * picture[:, 0], level))
                    first = order[np.unique(level[order], return_index=True)[1]]
                    distance = tree.query(fine[skin[first]])[0]
                    hits += (distance <= 3.0).sum()
                    rows += len(first)
    return hits / rows, rows
