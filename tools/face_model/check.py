#!/usr/bin/env python3
"""Checks the face model in data/ and prints a table: python3 tools/face_model/check.py

Ends with status 1 when a check fails.
"""

import argparse
import re
import sys
from pathlib import Path

import numpy as np
from scipy.spatial import cKDTree

import candidates
import domain
import fields
import measurements
import nostril
import numbering
import surface
import tables
import tensor
import writer
from triangulate import boundary_edges, edge_owners, signed_areas

PEOPLE = 1000
SEED = 2141796
FOLD = 150.0  # degrees between the normals of neighbouring triangles; rolled-in lips come to 130


class Report:
    def __init__(self):
        self.failed = 0

    def head(self, title):
        print(f"\n{title}")

    def line(self, name, value, ok, limit=""):
        self.failed += not ok
        print(f"  {'ok  ' if ok else 'FAIL'} {name:<58} {str(value):>22}  {limit}")


class Model:
    """The files of data/, back in the upright head frame and in standard deviations."""

    def __init__(self, folder):
        self.size = (folder / "face_model.bin").stat().st_size
        raw = writer.read_model(folder / "face_model.bin")
        self.raw = raw
        untilt = np.linalg.inv(writer.TILT)
        self.mean, identity, self.expression = (block @ untilt.T for block in raw[:3])
        self.identity = identity / writer.IDENTITY_UNIT
        steps = raw[3].astype(float) * writer.TENSOR_STEP / writer.FIXED_POINT
        self.tensor = steps @ untilt.T / writer.IDENTITY_UNIT
        self.steps = raw[3]
        text = (folder / "triangles.inc").read_text().split("\n", 1)[1]
        self.triangles = np.array(re.findall(r"\d+", text), int).reshape(-1, 3)
        text = (folder / "texture_coordinates.inc").read_text().split("\n", 1)[1]
        self.texture = np.array(re.findall(r"([\d.]+)f", text), float).reshape(-1, 2)

        self.names = re.findall(r'"(\w+)"', (folder / "expression_names.inc").read_text())

    def mirror(self):
        """Mirrored vertex of each vertex, found through the texture, or None."""
        image = self.texture * [-1.0, 1.0] + [2 * domain.U_MIDDLE, 0.0]
        distance, found = cKDTree(self.texture).query(image)
        good = distance.max() < 2e-6 and (np.sort(found) == np.arange(len(found))).all()
        return found if good else None


def smallest_angles(points, triangles):
    out = []
    for k in range(3):
        a = points[triangles[:, (k + 1) % 3]] - points[triangles[:, k]]
        b = points[triangles[:, (k + 2) % 3]] - points[triangles[:, k]]
        cross = np.linalg.norm(np.cross(a, b), axis=1)
        out.append(np.degrees(np.arctan2(cross, np.einsum("ij,ij->i", a, b))))
    return np.min(out, axis=0)


def loops(edges):
    after = dict(edges)
    sizes, left = [], set(after)
    while left:
        start = v = min(left)
        size = 0
        while v in left:
            left.remove(v)
            v = after[v]
            size += 1
        sizes.append(size if v == start else -1)
    return sorted(sizes, reverse=True)


class Folds:
    """Looks for folds: neighbours whose normals point nearly against each other."""

    def __init__(self, triangles):
        self.triangles = triangles
        self.pairs = np.array([f for _, f in sorted(edge_owners(triangles).items()) if len(f) == 2])

    def normals(self, points):
        a, b, c = (points[self.triangles[:, k]] for k in range(3))
        n = np.cross(b - a, c - a)
        length = np.linalg.norm(n, axis=1)
        return n / np.maximum(length, 1e-12)[:, None], 0.5 * length

    def bend(self, points):
        """Largest angle between neighbouring normals, degrees, and smallest area."""
        n, area = self.normals(points)
        cosine = np.einsum("ij,ij->i", n[self.pairs[:, 0]], n[self.pairs[:, 1]])
        return np.degrees(np.arccos(np.clip(cosine, -1, 1))).max(), area.min()


def crossings(points, triangles, near):
    """Edges that run through a triangle they do not touch, among the vertices `near`."""
    part = triangles[np.isin(triangles, near).all(axis=1)]
    edges = np.unique(np.sort(np.concatenate(
        [part[:, [0, 1]], part[:, [1, 2]], part[:, [2, 0]]]), axis=1), axis=0)
    centre = points[part].mean(axis=1)
    reach = np.linalg.norm(points[part] - centre[:, None], axis=2).max()
    tree = cKDTree(centre)
    count = 0
    for a, b in edges:
        p, q = points[a], points[b]
        for f in tree.query_ball_point(0.5 * (p + q), reach + 0.5 * np.linalg.norm(q - p)):
            t = part[f]
            if a in t or b in t:
                continue
            o, e, g = points[t[0]], points[t[1]] - points[t[0]], points[t[2]] - points[t[0]]
            matrix = np.column_stack([e, g, p - q])
            if abs(np.linalg.det(matrix)) < 1e-9:
                continue
            u, v, s = np.linalg.solve(matrix, p - o)
            count += u >= 0 and v >= 0 and u + v <= 1 and 0 <= s <= 1
    return count


def check_form(model, report):
    report.head("Form")
    t = model.triangles
    report.line("size of the model file", model.size, model.size == 2141796, "= 2141796")
    shape = f"{len(model.mean)}, {len(model.identity)}, {len(model.expression)}"
    report.line("vertices, identity modes, expressions", shape, shape == "1812, 16, 20")
    report.line("triangles", len(t), len(t) == 3456, "= 3456")
    report.line("vertices in use", len(np.unique(t)), len(np.unique(t)) == 1812, "= 1812")
    rows = [tuple(r) for r in t[:8].tolist()]
    report.line("first eight triangles as given", "", rows == numbering.FIRST_ROWS)
    round_one = sorted(set(t[(t == 1).any(axis=1)].ravel().tolist()) - {1})
    report.line("neighbours of vertex 1", round_one, round_one == [0, 2, 3, 4])
    most = max(len(f) for f in edge_owners(t).values())
    report.line("triangles at an edge, at most", most, most == 2)
    edges = boundary_edges(t)
    ring = loops(edges)
    report.line("boundary edges, loop by loop", ring, sum(ring) == 172 and len(ring) == 4)
    largest = np.abs(model.raw[0]).max()
    report.line("largest coordinate of the mean, mm", f"{largest:.2f}", largest < 127.99, "< 127.99")
    table = tables.landmark_vertices()
    points = measurements.load().points
    off = max(np.linalg.norm(model.mean[v] - points[k]) for k, v in table.items())
    report.line("landmark vertices off the measured landmarks, mm", f"{off:.3f}", off < 0.1, "< 0.1")


def check_symmetry(model, report):
    report.head("Symmetry")
    mirror = model.mirror()
    report.line("every vertex has a mirror image in the texture", "", mirror is not None)
    if mirror is None:
        return
    turned = lambda t: {tuple(np.roll(r, -int(np.argmin(r)))) for r in t.tolist()}
    same = turned(mirror[model.triangles][:, ::-1]) == turned(model.triangles)
    report.line("the triangles are their own mirror image", "", same)
    flip = np.array([-1.0, 1.0, 1.0])
    raw = model.raw
    names = model.names
    image, sign = zip(*(surface.partner(n, names) for n in names))
    worst = {
        "mean": np.abs(raw[0][mirror] * flip - raw[0]).max(),
        "identity modes": max(np.abs(m[mirror] * flip - m).max() for m in raw[1]),
        "expressions against their partners": max(
            np.abs(raw[2][image[k]][mirror] * flip * sign[k] - raw[2][k]).max() for k in range(20)),
        "tensor": max(np.abs(
            raw[3][:, image[k]][:, mirror].astype(int) * flip * sign[k] - raw[3][:, k]).max()
            for k in range(20)),
    }
    for name, value in worst.items():
        report.line(f"{name}: largest difference to the mirror image", f"{value:g}", value == 0, "= 0")
    named = tables.landmark_vertices()
    table = tables.contour_candidates()
    even = set(mirror[table].tolist()) == set(table.tolist())
    report.line("the contour candidates are symmetric", "", even)
    pairs = measurements.load().mirror
    even = all(mirror[v] == named[int(pairs[k])] for k, v in named.items())
    report.line("the landmark vertices are symmetric", "", even)


def check_shape(model, report):
    report.head("Shape")
    t = model.triangles
    angle = smallest_angles(model.mean, t)
    share = (angle > 15.0).mean() * 100
    report.line("triangles with all angles over 15 degrees, %", f"{share:.2f}", share >= 99, ">= 99")
    report.line("smallest angle in the mean, degrees", f"{angle.min():.1f}", angle.min() > 5, "> 5")
    folds = Folds(t)
    limit = f"< {FOLD:.0f}"
    bend, area = folds.bend(model.mean)
    report.line("sharpest edge of the mean, degrees", f"{bend:.0f}", bend < FOLD, limit)
    report.line("smallest triangle of the mean, mm2", f"{area:.2f}", area > 0.3, "> 0.3")
    before, _ = folds.normals(model.mean)
    rng = np.random.RandomState(SEED)
    bends, turned = [], 0
    for _ in range(PEOPLE):
        person = model.mean + np.tensordot(rng.standard_normal(16), model.identity, 1)
        bends.append(folds.bend(person)[0])
        after, _ = folds.normals(person)
        turned += (np.einsum("ij,ij->i", before, after) < 0).sum()
    report.line("sharpest edge over 1,000 random people", f"{max(bends):.0f}", max(bends) < FOLD, limit)
    report.line("triangles turned over in 1,000 random people", turned, turned == 0, "= 0")
    names = model.names
    for k, name in enumerate(names):
        for amount in ((1.0, -1.0) if name.endswith("_side") else (1.0,)):
            bend, area = folds.bend(model.mean + amount * model.expression[k])
            report.line(f"sharpest edge with {amount:+.0f} {name}", f"{bend:.0f}", bend < FOLD, limit)
    mixed = {
        "smile + blink": dict(mouth_smile_L=1, mouth_smile_R=1, eye_blink_L=1, eye_blink_R=1),
        "jaw open + brows up": dict(jaw_open=1, brow_inner_up=1, brow_outer_up_L=1,
                                    brow_outer_up_R=1),
    }
    for title, amounts in mixed.items():
        face = model.mean + sum(v * model.expression[names.index(n)] for n, v in amounts.items())
        bend, _ = folds.bend(face)
        report.line(f"sharpest edge with {title}", f"{bend:.0f}", bend < FOLD, limit)
    bends = []
    for _ in range(PEOPLE):
        amounts = rng.random_sample(20) * (rng.random_sample(20) < 0.15)
        person = rng.standard_normal(16)
        face = (model.mean + np.tensordot(person, model.identity, 1)
                + np.tensordot(amounts, model.expression, 1) + interaction(model, person, amounts))
        bends.append(folds.bend(face)[0])
    count = sum(b > FOLD for b in bends)
    report.line("folded faces in 1,000 people with a few expressions", count, count == 0, "= 0")
    mouth = np.flatnonzero((np.abs(model.mean[:, 0]) < 30) & (model.mean[:, 1] < -33)
                           & (model.mean[:, 1] > -58))
    count = crossings(model.mean, t, mouth)
    report.line("edges through the lips at rest", count, count == 0, "= 0")


def interaction(model, person, amounts):
    """What the dense mesh adds for identity (standard deviations) times expression."""
    used = tensor.read_pairs() * np.outer(person, amounts)
    return np.tensordot(used, model.tensor, 2)


def check_tensor(model, report):
    report.head("Tensor and scales")
    filled = (model.steps != 0).any(axis=(2, 3))
    report.line("filled blocks of 320", int(filled.sum()), True)
    share = (model.steps != 0).any(axis=3).mean() * 100
    report.line("vertices of all blocks with a value, %", f"{share:.2f}", True)
    unused = filled & ~tensor.read_pairs()
    report.line("filled blocks that nothing reads", int(unused.sum()), not unused.any(), "= 0")
    rng = np.random.RandomState(SEED)
    person = rng.standard_normal((PEOPLE, 16)) / writer.IDENTITY_UNIT
    amounts = rng.random_sample((PEOPLE, 20))
    products = np.abs(person[:, :, None] * amounts[:, None, :])
    wraps = (products * (filled & tensor.read_pairs()) >= 1.0).any(axis=(1, 2)).sum()
    report.line("people of 1,000 whose products wrap", wraps, wraps == 0, "= 0")
    full = (np.abs(person)[:, :, None] * filled[None] >= 1.0).any(axis=(1, 2)).sum()
    report.line("the same with every expression at full intensity", full, full <= 1, "<= 1")
    report.line("largest identity value, mm a unit", f"{np.abs(model.raw[1]).max():.1f}", True)
    report.line("largest expression value, mm", f"{np.abs(model.raw[2]).max():.1f}", True)


def check_transfer(model, report):
    """Does the tensor bring an unusual face's expressions nearer to what its own shape asks for?

    The measure is the whole deformation transfer, which the tensor holds to first order only.
    """
    report.head("Expressions of 12 unusual people (1.5 standard deviations a mode)")
    rng = np.random.RandomState(SEED)
    people = rng.standard_normal((12, 16)) * 1.5
    transfer = tensor.Transfer(model.triangles)
    for name in ("jaw_open", "mouth_smile_L", "mouth_funnel", "cheek_puff", "nose_sneer"):
        k = model.names.index(name)
        amounts = np.eye(20)[k]
        without, with_it = [], []
        for person in people:
            face = model.mean + np.tensordot(person, model.identity, 1)
            wanted = transfer.displacement(model.mean, model.expression[k], face)
            plain = model.expression[k]
            without.append(np.linalg.norm(plain - wanted, axis=1).max())
            plain = plain + interaction(model, person, amounts)
            with_it.append(np.linalg.norm(plain - wanted, axis=1).max())
        a, b = np.mean(without), np.mean(with_it)
        report.line(f"{name}: largest error without and with the tensor, mm", f"{a:.2f}, {b:.2f}", b < a)


def check_texture(model, report):
    report.head("Texture")
    uv, t = model.texture, model.triangles
    distinct = len(np.unique(uv, axis=0))
    report.line("distinct places", distinct, distinct == 1812, "= 1812")
    given = all(tuple(uv[k]) == pair for k, pair in domain.FIRST_TEXTURE.items())
    report.line("first rows as given", "", given)
    low, high = uv.min(axis=0), uv.max(axis=0)
    exact = (low[0], high[0], low[1], high[1]) == (
        domain.U_LEFT, domain.U_RIGHT, domain.V_TOP, domain.V_BOTTOM)
    report.line("extremes as given", f"{low[0]}..{high[0]}", exact)
    upright = uv * [1.0, -1.0]
    area = signed_areas(upright, t)
    report.line("triangles turned over or empty", int((area <= 0).sum()), (area > 0).all(), "= 0")
    # without overlaps the triangles add up to what their border encloses
    a, b = (upright[np.array([e[k] for e in boundary_edges(t)])] for k in range(2))
    enclosed = 0.5 * (a[:, 0] * b[:, 1] - a[:, 1] * b[:, 0]).sum()
    report.line("area against that inside the borders", f"{area.sum() / enclosed:.9f}",
                abs(area.sum() / enclosed - 1) < 1e-9, "= 1")
    crossing = border_crossings(upright, boundary_edges(t))
    report.line("border edges that cross", crossing, crossing == 0, "= 0")
    stretch = texture_stretch(model.mean, upright, t)
    for q in (5, 50, 95):
        pair = np.percentile(stretch, q, axis=0)
        report.line(f"stretch across and along, {q}th percentile", f"{pair[1]:.2f}, {pair[0]:.2f}", True)
    ratio = np.percentile(stretch[:, 0] / stretch[:, 1], [50, 95])
    report.line("stretch ratio, median and 95th percentile", f"{ratio[0]:.2f}, {ratio[1]:.2f}",
                ratio[1] < 2.0, "< 2")


def border_crossings(places, edges):
    p, q = (places[[e[k] for e in edges]] for k in range(2))
    side = lambda o, a, b: (a[..., 0] - o[..., 0]) * (b[..., 1] - o[..., 1]) - (
        a[..., 1] - o[..., 1]) * (b[..., 0] - o[..., 0])
    i, j = np.triu_indices(len(edges), 1)
    return int(((side(p[i], q[i], p[j]) * side(p[i], q[i], q[j]) < 0)
                & (side(p[j], q[j], p[i]) * side(p[j], q[j], q[i]) < 0)).sum())


def texture_stretch(points, uv, triangles):
    """Larger and smaller stretch of each triangle from space to texture, 1 on average."""
    from flatten import gradients, jacobians
    area, gradient = gradients(points[triangles])
    stretch = np.linalg.svd(jacobians(uv, triangles, gradient), compute_uv=False)
    return stretch / np.sqrt(signed_areas(uv, triangles).sum() / area.sum())


def check_reconstruction(model, report):
    report.head("Reconstruction of the measured figures, mean distance in mm")
    data = nostril.with_nostrils(measurements.load())
    dom = domain.build(data)
    known = surface.samples(data, dom)
    measured = data.measured[known.ids]
    ids = known.ids[measured]
    places = dom.layout.texture(known.flat[measured]) * [1.0, -1.0]
    upright = model.texture * [1.0, -1.0]
    anchors = fields.locate(upright, model.triangles, places)
    matrix = anchors.matrix(model.triangles, len(model.mean))
    mean_error = lambda field, wanted: np.linalg.norm(matrix @ field - wanted, axis=1).mean()
    value = mean_error(model.mean, data.points[ids])
    report.line(f"mean face, {len(ids)} points", f"{value:.3f}", value < 0.3, "< 0.3")
    worst = 0.0
    for k in range(16):
        worst = max(worst, mean_error(2 * model.identity[k], 2 * data.identity[k, ids]))
    report.line("identity modes at 2 standard deviations, worst", f"{worst:.3f}", worst < 0.5, "< 0.5")
    names = data.expression_names
    errors = [mean_error(model.expression[model.names.index(name)], data.expression[k, ids])
              for k, name in enumerate(names)]
    worst = int(np.argmax(errors))
    report.line(f"expressions at full intensity, worst ({names[worst]})",
                f"{errors[worst]:.3f}", errors[worst] < 0.5, "< 0.5")


def check_candidates(model, report):
    report.head("Contour candidates: outline rows with one within 3 mm, %")
    table = tables.contour_candidates()
    for title, pitches, spread in (("mean face", (0.0,), 0.0),
                                   ("nodding", (-20.0, 20.0), 0.0),
                                   ("20 random people", (0.0,), 1.0)):
        picture, skin, rows = candidates.coverage(model, table, pitches, spread)
        report.line(f"{title}, in the picture, of {rows} rows", f"{picture * 100:.1f}",
                    True)
        report.line(f"{title}, on the skin", f"{skin * 100:.1f}", True)


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("--data", type=Path, default=measurements.DATA, help="folder to check")
    model = Model(parser.parse_args().data)
    report = Report()
    check_form(model, report)
    check_symmetry(model, report)
    check_shape(model, report)
    check_tensor(model, report)
    check_transfer(model, report)
    check_texture(model, report)
    check_reconstruction(model, report)
    check_candidates(model, report)
    print(f"\n{report.failed} checks failed" if report.failed else "\nall checks passed")
    sys.exit(1 if report.failed else 0)


if __name__ == "__main__":
    main()
