#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""Rebuilds the face model in data/ from the measured figures: python3 tools/face_model/generate.py

The result is the same bits with every BLAS and processor. See docs/face-model.md.
"""

import argparse
from pathlib import Path

import numpy as np

import candidates
import domain
import measurements
import nostril
import numbering
import surface
import tables
import tensor
import topology
import writer
from arithmetic import settled


def build() -> dict:
    """The parts of the model by name, in the numbering of the files and the upright frame."""
    data = nostril.with_nostrils(measurements.load())
    dom = domain.build(data)
    half = topology.half_mesh(dom)
    mesh = topology.mirrored(half)
    lifted = surface.lift(data, dom, mesh)
    half = topology.refined(half, lifted)
    mesh = topology.mirrored(half)
    lifted = surface.lift(data, dom, mesh)
    mean, identity, expression = surface.modes(data, mesh, lifted)
    mean = settled(mean, 5, doubt=1e-10, nudge=-1e-9 * np.sign(mean))  # both sides alike
    identity, expression = (settled(a, 5, doubt=1e-12) for a in (identity, expression))

    owners = numbering.edge_owners(mesh.triangles)
    known = numbering.known_vertices(data, half, mesh, owners)
    table = set(tables.contour_candidates().tolist())
    must = [v for n, v in known.items() if n in table] + [
        v for row, v in half.rows if row == int(row)]
    never = [v for n, v in known.items() if n not in table]
    chosen = candidates.choose(mean, mesh.mirror, must, never, len(table))
    order, triangles = numbering.number(data, half, mesh, mean, chosen)

    names = data.expression_names
    at_left, at_right = topology.lid_rims(half, mesh)
    blocks = tensor.build(mean, writer.IDENTITY_UNIT * identity, expression, names, mesh.triangles,
                          {"eye_blink_R": at_left, "eye_blink_L": at_right})
    blocks = np.array([surface.symmetric(row, names, mesh) for row in blocks])
    places = tensor.expression_order(blocks, names)

    texture = dom.layout.texture(mesh.flat)[order]
    for number, pair in domain.FIRST_TEXTURE.items():
        texture[number] = pair
    return dict(mean=mean[order], identity=identity[:, order],
                expression=expression[places][:, order],
                tensor=np.round(blocks[:, places][:, :, order], 4),
                triangles=triangles, texture=texture, names=[names[j] for j in places])


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("--out", type=Path, default=measurements.DATA, help="folder to write to")
    out = parser.parse_args().out
    model = build()
    out.mkdir(parents=True, exist_ok=True)
    writer.write_model(out / "face_model.bin", writer.tilted(model["mean"]),
                       writer.IDENTITY_UNIT * writer.tilted(model["identity"]),
                       writer.tilted(model["expression"]),
                       tensor.steps(writer.tilted(model["tensor"])))
    writer.write_triangles(out / "triangles.inc", model["triangles"])
    writer.write_texture(out / "texture_coordinates.inc", model["texture"])
    writer.write_names(out / "expression_names.inc", model["names"])


if __name__ == "__main__":
    main()
