# SPDX-License-Identifier: MIT
"""The model in data/, read back for the checker, the artists' files and the pictures."""

import re
from pathlib import Path

import numpy as np

import writer


class Model:
    """The files of data/, back in the upright head frame and in standard deviations."""

    def __init__(self, folder: Path):
        raw = writer.read_model(folder / "face_model.bin")
        self.mean, identity, self.expression = (writer.upright(block) for block in raw[:3])
        self.identity = identity / writer.IDENTITY_UNIT
        steps = raw[3].astype(float) * writer.TENSOR_STEP / writer.FIXED_POINT
        self.tensor = writer.upright(steps) / writer.IDENTITY_UNIT
        text = (folder / "triangles.inc").read_text().split("\n", 1)[1]
        self.triangles = np.array(re.findall(r"\d+", text), int).reshape(-1, 3)
        text = (folder / "texture_coordinates.inc").read_text().split("\n", 1)[1]
        self.texture = np.array(re.findall(r"([\d.]+)f", text), float).reshape(-1, 2)
        self.names = re.findall(r'"(\w+)"', (folder / "expression_names.inc").read_text())
