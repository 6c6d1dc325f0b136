# SPDX-License-Identifier: MIT
"""Draws triangle meshes to pictures with a depth buffer; nothing but numpy and Pillow."""

from pathlib import Path

import numpy as np

LIGHT = np.array([-0.35, 0.45, 0.82])


def turned(points: np.ndarray, yaw: float = 0.0, pitch: float = 0.0) -> np.ndarray:
    """The head turned by yaw (positive: towards the image right) and pitch (up), degrees."""
    y, p = np.radians([yaw, pitch])
    about_y = np.array([[np.cos(y), 0, np.sin(y)], [0, 1, 0], [-np.sin(y), 0, np.cos(y)]])
    about_x = np.array([[1, 0, 0], [0, np.cos(p), np.sin(p)], [0, -np.sin(p), np.cos(p)]])
    return points @ (about_x @ about_y).T


def vertex_normals(points: np.ndarray, triangles: np.ndarray) -> np.ndarray:
    a, b, c = (points[triangles[:, k]] for k in range(3))
    face = np.cross(b - a, c - a)
    normals = np.zeros_like(points)
    for k in range(3):
        np.add.at(normals, triangles[:, k], face)
    return normals / np.maximum(np.linalg.norm(normals, axis=1), 1e-12)[:, None]


def draw(points: np.ndarray, triangles: np.ndarray, size: int = 600, span: float = 215.0,
         centre: tuple[float, float] = (0.0, -5.0), wires: bool = False,
         colours: np.ndarray | None = None, shade: bool = True, sampling: int = 2) -> np.ndarray:
    """An RGB picture (size, size, 3) of the mesh seen from the front by parallel rays."""
    n = size * sampling
    scale = n / span
    xy = np.stack([(points[:, 0] - centre[0]) * scale + n / 2,
                   n / 2 - (points[:, 1] - centre[1]) * scale], axis=1)
    z = points[:, 2]
    normals = vertex_normals(points, triangles)
    light = LIGHT / np.linalg.norm(LIGHT)
    bright = normals @ light
    base = np.full((len(points), 3), [224.0, 188.0, 166.0]) if colours is None else colours
    depth = np.full((n, n), -np.inf)
    picture = np.full((n, n, 3), 30.0)
    for t in triangles:
        p = xy[t]
        low = np.maximum(np.floor(p.min(axis=0)).astype(int), 0)
        high = np.minimum(np.ceil(p.max(axis=0)).astype(int) + 1, n)
        if (low >= high).any():
            continue
        det = (p[1, 0] - p[0, 0]) * (p[2, 1] - p[0, 1]) - (p[1, 1] - p[0, 1]) * (p[2, 0] - p[0, 0])
        if abs(det) < 1e-9:
            continue
        gx, gy = np.meshgrid(np.arange(low[0], high[0]) + 0.5, np.arange(low[1], high[1]) + 0.5)
        w1 = ((gx - p[0, 0]) * (p[2, 1] - p[0, 1]) - (gy - p[0, 1]) * (p[2, 0] - p[0, 0])) / det
        w2 = ((p[1, 0] - p[0, 0]) * (gy - p[0, 1]) - (p[1, 1] - p[0, 1]) * (gx - p[0, 0])) / det
        w0 = 1.0 - w1 - w2
        d = w0 * z[t[0]] + w1 * z[t[1]] + w2 * z[t[2]]
        window = (slice(low[1], high[1]), slice(low[0], high[0]))
        hit = (w0 >= 0) & (w1 >= 0) & (w2 >= 0) & (d > depth[window])
        if not hit.any():
            continue
        depth[window][hit] = d[hit]
        w = np.stack([w0, w1, w2], axis=-1)[hit]
        colour = w @ base[t]
        if shade:
            back = det > 0  # seen from behind
            b = w @ bright[t]
            b = -b if back else b
            colour = colour * (0.25 + 0.75 * np.clip(b, 0, 1))[:, None]
            if back:
                colour = colour * [0.5, 0.55, 0.7]
        if wires:
            edge = np.min(w * abs(det) / np.array(
                [np.linalg.norm(p[1] - p[2]), np.linalg.norm(p[2] - p[0]),
                 np.linalg.norm(p[0] - p[1])]), axis=1)
            colour = np.where((edge < 0.55 * sampling)[:, None], [40.0, 60.0, 110.0], colour)
        picture[window][hit] = colour
    small = picture.reshape(size, sampling, size, sampling, 3).mean(axis=(1, 3))
    # Rounded first, so that no pixel hangs on the last bits of a product.
    return np.clip(np.round(small, 6) + 0.5, 0, 255).astype(np.uint8)


def row(pictures: list[np.ndarray]) -> np.ndarray:
    return np.concatenate(pictures, axis=1)


def save(path: Path, picture: np.ndarray, colours: int | None = None):
    from PIL import Image  # the generator uses this module without drawing
    image = Image.fromarray(picture)
    if colours:
        image = image.quantize(colours, dither=Image.Dither.NONE)
    image.save(path, optimize=True)
