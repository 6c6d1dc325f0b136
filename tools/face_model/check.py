#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""Checks the face model in data/ against the measured figures: python3 tools/face_model/check.py

What can be checked on the model file alone is in 'n3ds model check'. Ends with status 1 when a
check fails.
"""

import argparse
import sys
from pathlib import Path

import numpy as np

import candidates
import domain
import fields
import measurements
import nostril
import surface
import tables
import tensor
from shipped import Model

SEED = 2141796


class Report:
    def __init__(self):
        self.failed = 0

    def head(self, title):
        print(f"\n{title}")

    def line(self, name, value, ok, limit=""):
        self.failed += not ok
        print(f"  {'ok  ' if ok else 'FAIL'} {name:<58} {str(value):>22}  {limit}")

    def figure(self, name, value):
        """A figure that nothing is asked of."""
        print(f"       {name:<58} {value:>22}")


def check_landmarks(model: Model, report: Report):
    report.head("Landmarks")
    points = measurements.load().points
    off = max(np.linalg.norm(model.mean[v] - points[k])
              for k, v in tables.landmark_vertices().items())
    report.line("vertices off the measured landmarks, at most, mm", f"{off:.3f}", off < 0.1,
                "< 0.1")


def interaction(model: Model, person: np.ndarray, amounts: np.ndarray) -> np.ndarray:
    """What the dense mesh adds for identity (standard deviations) times expression."""
    used = tensor.read_pairs() * np.outer(person, amounts)
    return np.tensordot(used, model.tensor, 2)


def check_transfer(model: Model, report: Report):
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
        report.line(f"{name}: largest error without and with the tensor, mm",
                    f"{a:.2f}, {b:.2f}", b < a)


def check_reconstruction(model: Model, report: Report):
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

    def mean_error(field, wanted):
        return np.linalg.norm(matrix @ field - wanted, axis=1).mean()

    value = mean_error(model.mean, data.points[ids])
    report.line(f"mean face, {len(ids)} points", f"{value:.3f}", value < 0.3, "< 0.3")
    worst = 0.0
    for k in range(16):
        worst = max(worst, mean_error(2 * model.identity[k], 2 * data.identity[k, ids]))
    report.line("identity modes at 2 standard deviations, worst", f"{worst:.3f}", worst < 0.5,
                "< 0.5")
    names = data.expression_names
    errors = [mean_error(model.expression[model.names.index(name)], data.expression[k, ids])
              for k, name in enumerate(names)]
    worst = int(np.argmax(errors))
    report.line(f"expressions at full intensity, worst ({names[worst]})",
                f"{errors[worst]:.3f}", errors[worst] < 0.5, "< 0.5")


def check_candidates(model: Model, report: Report):
    report.head("Contour candidates: outline rows with one within 3 mm, %")
    table = tables.contour_candidates()
    for title, pitches, spread in (("mean face", (0.0,), 0.0),
                                   ("nodding", (-20.0, 20.0), 0.0),
                                   ("20 random people", (0.0,), 1.0)):
        picture, skin, rows = candidates.coverage(model, table, pitches, spread)
        report.figure(f"{title}, in the picture, of {rows} rows", f"{picture * 100:.1f}")
        report.figure(f"{title}, on the skin", f"{skin * 100:.1f}")


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("--data", type=Path, default=measurements.DATA, help="folder to check")
    model = Model(parser.parse_args().data)
    report = Report()
    check_landmarks(model, report)
    check_reconstruction(model, report)
    check_transfer(model, report)
    check_candidates(model, report)
    print(f"\n{report.failed} checks failed" if report.failed else "\nall checks passed")
    sys.exit(1 if report.failed else 0)


if __name__ == "__main__":
    main()
