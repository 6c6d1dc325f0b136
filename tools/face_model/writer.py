# SPDX-License-Identifier: MIT
"""Writes the model file and the tables of data/."""

from pathlib import Path

import numpy as np

from arithmetic import dot

# From the upright head frame to the frame of the file: 20 degrees about x, which the engine's
# output takes back. The rows are the engine's own constants.
TILT = np.array([[1.0, 0.0, 0.0], [0.0, 0.9397, 0.342], [0.0, -0.342, 0.9397]])
FIXED_POINT = 256.0
# Standard deviations of the population in one unit of an identity coefficient. The dense mesh holds
# products of an identity and an expression coefficient in 16 bits that wrap at 1, so a unit has to
# lie beyond every real person; the fits do not feel it.
IDENTITY_UNIT = 8.0
TENSOR_STEP = 40.0  # units of 1/256 mm


def tilted(vectors: np.ndarray) -> np.ndarray:
    """Vectors (..., 3) in the file's frame, from the upright one."""
    return np.stack([dot(vectors, row) for row in TILT], axis=-1)


def upright(vectors: np.ndarray) -> np.ndarray:
    """The inverse of `tilted`, up to rounding."""
    return np.stack([dot(vectors, row) for row in TILT.T], axis=-1) / [1.0, *dot(TILT, TILT)[1:]]


def fixed(vectors: np.ndarray) -> np.ndarray:
    """16-bit fixed point; raises when a value does not fit."""
    values = np.rint(vectors * FIXED_POINT)
    limit = np.iinfo(np.int16)
    if values.min() < limit.min or values.max() > limit.max:
        raise ValueError("a coordinate does not fit 16 bits")
    return values.astype("<i2")


def write_model(path: Path, mean: np.ndarray, identity: np.ndarray, expression: np.ndarray,
                tensor: np.ndarray):
    """Shapes: (n, 3), (16, n, 3), (20, n, 3) in mm in the file's frame; tensor int8 steps."""
    with open(path, "wb") as file:
        file.write(np.array([len(mean), len(identity), len(expression)], "<i4").tobytes())
        for block in (mean, identity, expression):
            file.write(fixed(block).tobytes())
        file.write(tensor.astype("<i1").tobytes())


def read_model(path: Path) -> tuple[np.ndarray, np.ndarray, np.ndarray, np.ndarray]:
    """The inverse of write_model, in mm and steps."""
    raw = path.read_bytes()
    n, k, j = np.frombuffer(raw, "<i4", 3)
    values = np.frombuffer(raw, "<i2", 3 * n * (1 + k + j), 12).astype(float) / FIXED_POINT
    blocks = np.split(values, [3 * n, 3 * n * (1 + k)])
    tensor = np.frombuffer(raw, "<i1", 3 * n * k * j, 12 + 6 * n * (1 + k + j))
    return (blocks[0].reshape(n, 3), blocks[1].reshape(k, n, 3), blocks[2].reshape(j, n, 3),
            tensor.reshape(k, j, n, 3))


def _table(path, comment, rows, a_line):
    with open(path, "w", newline="\n") as file:
        file.write(f"// SPDX-License-Identifier: MIT\n// {comment}\n")
        for start in range(0, len(rows), a_line):
            file.write(" ".join(rows[start:start + a_line]) + "\n")


def write_triangles(path: Path, triangles: np.ndarray):
    _table(path, "Vertices of the face mesh's triangles, counter-clockwise seen from outside.",
           [f"{{{a}, {b}, {c}}}," for a, b, c in triangles.tolist()], 6)


def write_texture(path: Path, texture: np.ndarray):
    _table(path, "Texture coordinates (u, v) of the face mesh's vertices, v downwards.",
           [f"{{{u:.6f}f, {v:.6f}f}}," for u, v in texture], 4)


def write_names(path: Path, names: list[str]):
    _table(path, "Names of the expressions of the face model, in the order of the model file.",
           [f'"{name}",' for name in names], 5)
