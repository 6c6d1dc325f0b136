#!/usr/bin/python3
# SPDX-License-Identifier: MIT
"""Draws examples/assets/mask_*.png: three mask pictures in the texture layout of the face model.

Everything is placed by the landmarks' vertices and measured in eye distances, so that running this
again after the model has changed gives masks that fit it. The layout is read from data/. Needs
Debian's numpy, scipy and Pillow; the same bits every time.

    /usr/bin/python3 tools/assets/make_mask_textures.py [--out FOLDER]
"""

import argparse
import sys
import warnings
from pathlib import Path

import numpy as np
from PIL import Image, ImageDraw
from scipy import interpolate, ndimage
from scipy.cluster import vq

ROOT = Path(__file__).resolve().parents[2]
sys.path.insert(0, str(ROOT / "tools" / "face_model"))
from measurements import DATA  # noqa: E402
from shipped import Model  # noqa: E402
from tables import default_contour, inner_landmarks  # noqa: E402
from triangulate import boundary_rings  # noqa: E402

SIZE = 512  # of a picture; a face on a photo seldom has more pixels
FINE = 3  # drawn that much larger, for smooth edges
PIXELS = SIZE * FINE


class Layout:
    """Landmarks, holes and outer border of the face in the texture, 0 to 1, v down."""

    def __init__(self):
        model = Model(DATA)
        self.vertices, self.triangles = model.texture, model.triangles
        self.landmarks = self.vertices[np.concatenate([default_contour(), inner_landmarks()])]
        rings = sorted(boundary_rings(self.triangles), key=len)
        self.rim = self.vertices[rings.pop()]
        self.mouth = self.vertices[rings.pop(int(np.argmax(
            [self.vertices[r][:, 1].mean() for r in rings])))]
        self.eyes = sorted((self.vertices[r] for r in rings), key=lambda e: e[:, 0].mean())
        # The unit of all lengths: from the middle of one eye to that of the other.
        self.unit = self.eyes[1][:, 0].mean() - self.eyes[0][:, 0].mean()

    def at(self, landmark, right=0.0, down=0.0):
        return self.landmarks[landmark] + self.unit * np.array([right, down])

    def middle(self, *landmarks, right=0.0, down=0.0):
        return self.landmarks[list(landmarks)].mean(axis=0) + self.unit * np.array([right, down])


def mirrored(points):
    return np.asarray(points) * [-1, 1] + [1, 0]


def smooth(points, closed=False, count=400):
    """A cubic curve through the points."""
    points = np.asarray(points, float)
    if closed:
        points = np.vstack([points, points[:1]])
    step = np.r_[0, np.cumsum(np.linalg.norm(np.diff(points, axis=0), axis=1))]
    curve = interpolate.CubicSpline(step, points, bc_type="periodic" if closed else "natural")
    return curve(np.linspace(0, step[-1], count))


def filled(polygon):
    """Coverage of a polygon, at the fine size."""
    image = Image.new("L", (PIXELS, PIXELS))
    ImageDraw.Draw(image).polygon([tuple(p) for p in np.asarray(polygon) * PIXELS], fill=255)
    return np.asarray(image) > 0


def distance(inside):
    """Signed distance to an edge in texture widths, negative inside."""
    outwards = ndimage.distance_transform_edt(~inside)
    return (outwards - ndimage.distance_transform_edt(inside)) / PIXELS


def step(value, low, high):
    """0 below low, 1 above high (or the reverse), smooth between."""
    x = np.clip((value - low) / (high - low), 0, 1)
    return x * x * (3 - 2 * x)


def stroke(points, widths):
    """A brush stroke along a curve; widths at the points, in texture widths."""
    line = smooth(points)
    where = np.linspace(0, 1, len(widths))
    width = np.interp(np.linspace(0, 1, len(line)), where, widths)[:, None] / 2
    along = np.gradient(line, axis=0)
    across = np.stack([-along[:, 1], along[:, 0]], axis=1)
    across /= np.linalg.norm(across, axis=1, keepdims=True) + 1e-12
    return filled(np.vstack([line + across * width, (line - across * width)[::-1]]))


def both(draw, points, *arguments):
    return draw(points, *arguments) | draw(mirrored(points), *arguments)


def blur(picture, unit):
    return ndimage.gaussian_filter(np.asarray(picture, float), unit * PIXELS)


def noise(seed, scale, stretch=(1, 1)):
    """Smooth noise of mean 0 and deviation 1; scale in texture widths, stretched down and right."""
    random = np.random.default_rng(seed).standard_normal((PIXELS, PIXELS))
    sigma = [max(scale * s * PIXELS, 0.5) for s in stretch]
    field = ndimage.gaussian_filter(random, sigma, mode="wrap")
    return field / field.std()


class Painting:
    """Colours over the whole texture, and how much of them covers the face."""

    def __init__(self, colour):
        self.colour = np.ones((PIXELS, PIXELS, 3)) * np.array(colour)
        self.alpha = np.ones((PIXELS, PIXELS))

    def paint(self, coverage, colour):
        coverage = np.asarray(coverage, float)[:, :, None]
        self.colour += coverage * (np.asarray(colour, float) - self.colour)

    def light(self, factor):
        self.colour *= np.asarray(factor)[:, :, None]

    def emboss(self, height, strength):
        """Light from above as on a relief."""
        slope = ndimage.sobel(height, axis=0) * 0.8 + ndimage.sobel(height, axis=1) * 0.3
        slope *= -strength / (slope.std() + 1e-12)
        self.light(1 + np.clip(slope, -0.4, 0.5))

    def cut(self, inside, soft):
        """Lets a region shine through; its edge is `soft` wide."""
        self.alpha *= step(distance(inside), -soft / 2, soft / 2)

    def keep(self, inside, soft):
        self.cut(~inside, soft)

    def reduced(self):
        """The picture in its own size. Colours run on under what is transparent, so that blending
        pixels at the edge meets no foreign colour."""
        def shrink(field):
            return field.reshape(SIZE, FINE, SIZE, FINE, -1).mean(axis=(1, 3))
        alpha = shrink(self.alpha)[:, :, 0]
        colour = shrink(self.colour * self.alpha[:, :, None]) / np.maximum(alpha, 1e-6)[:, :, None]
        seen = alpha > 0.02
        nearest = ndimage.distance_transform_edt(~seen, return_distances=False,
                                                 return_indices=True)
        colour = colour[tuple(nearest)]
        return np.dstack([np.clip(colour, 0, 1) * 255, alpha * 255])


def palette_of(pixels, colours, seed):
    """A palette for the pixels, and the place of each pixel in it."""
    random = np.random.default_rng(seed)
    sample = pixels[random.choice(len(pixels), 30000)]
    start = np.unique(sample, axis=0)
    start = start[random.choice(len(start), min(colours, len(start)), replace=False)]
    with warnings.catch_warnings():
        warnings.simplefilter("ignore")  # a cluster without members: its colour is not used
        palette, _ = vq.kmeans2(sample, start, iter=12, minit="matrix")
    palette = np.round(palette)
    return palette, vq.vq(pixels, palette)[0]


def save(painting, path):
    """A palette of 256 colours with alpha keeps the files small. What is wholly transparent has
    colours of its own in it: a trace of alpha would be seen as a veil on the face."""
    pixels = painting.reduced().reshape(-1, 4)
    clear = pixels[:, 3] < 1
    pixels[clear, 3] = 0
    pixels[~clear, 3] = np.clip(pixels[~clear, 3], 2, None)
    pixels[pixels[:, 3] > 253, 3] = 255
    index = np.zeros(len(pixels), np.uint8)
    palette_clear, index[clear] = palette_of(pixels[clear], 16, 1)
    palette, place = palette_of(pixels[~clear], 240, 2)
    palette[palette[:, 3] > 252, 3] = 255
    index[~clear] = place + len(palette_clear)
    palette = np.vstack([palette_clear, palette]).astype(np.uint8)
    image = Image.fromarray(index.reshape(SIZE, SIZE), "P")
    image.putpalette(palette[:, :3].tobytes())
    image.save(path, transparency=palette[:, 3].tobytes(), optimize=True)
    print(f"{path}: {path.stat().st_size / 1000:.0f} kB")


def eye_holes(face, grow):
    """Openings a little larger than the eyes, so that lids may move in them."""
    holes = np.zeros((PIXELS, PIXELS), bool)
    for eye in face.eyes:
        holes |= filled(eye)
    return distance(holes) < grow * face.unit


def mouth_hole(face, grow):
    return distance(filled(face.mouth)) < grow * face.unit


def carnival(face):
    """A half mask of harlequin silk with golden trim."""
    e = face.unit
    # Outline of the right half, from above the nose round to its side.
    right = [face.middle(29, 24, down=-0.28), face.at(31, 0.05, -0.30), face.at(33, 0.12, -0.32),
             face.at(34, 0.36, -0.40), face.at(34, 0.36, -0.02), face.at(57, 0.44, 0.22),
             face.at(58, 0.20, 0.42), face.at(60, 0.02, 0.52), face.at(71, 0.10, -0.10),
             face.at(72, 0.04, 0.04)]
    top, tip = right[0], face.middle(68, 69, down=-0.30)
    curve = smooth(right + [tip])
    body = filled(np.vstack([curve, mirrored(curve[::-1])]))
    edge = distance(body)

    p = Painting([0.36, 0.06, 0.30])
    # Lozenges along two families of slanted lines, mirrored in the middle.
    y, x = np.mgrid[0:PIXELS, 0:PIXELS] / PIXELS
    x, y = np.abs(x - 0.5) / e, (y - face.at(63)[1]) / e
    a, b = (x / 0.34 + y / 0.52), (x / 0.34 - y / 0.52)
    lozenge = (np.floor(a) + np.floor(b)) % 2 == 0
    p.paint(blur(lozenge, 0.0012), [0.05, 0.30, 0.38])
    seam = np.minimum(np.abs(a - np.round(a)), np.abs(b - np.round(b)))
    gold, dark_gold = [0.93, 0.74, 0.30], [0.62, 0.42, 0.12]
    p.paint(step(seam, 0.055, 0.025), gold)
    knots = np.hypot(a - np.round(a), b - np.round(b))
    p.paint(step(knots, 0.16, 0.12), [0.98, 0.90, 0.66])
    p.light(1 + 0.05 * noise(2, 0.0016, (1, 4)) + 0.05 * noise(3, 0.0016, (4, 1)))
    # The silk is puffed: darker towards its edges.
    p.light(0.62 + 0.45 * step(-edge, 0.0, 0.30 * e))

    # Trim along the outer edge and round the eyes, as a rope of gold.
    holes = eye_holes(face, 0.055)
    rope = np.zeros((PIXELS, PIXELS))
    for line, width in ((np.abs(edge + 0.035 * e), 0.045 * e),
                        (np.abs(distance(holes) - 0.035 * e), 0.040 * e)):
        band = step(line, width, width * 0.7)
        p.paint(band, dark_gold)
        p.paint(step(line, width * 0.75, width * 0.1), gold)
        rope = np.maximum(rope, 1 - np.clip(line / width, 0, 1))
    # Scrolls above the brows and on the cheeks.
    scrolls = np.zeros((PIXELS, PIXELS), bool)
    thick = 0.030 * e
    for centre, radius, turns, start in ((face.at(32, 0.02, -0.20), 0.13, 1.4, 2.6),
                                         (face.at(57, 0.26, -0.10), 0.12, 1.4, 0.3),
                                         (face.at(60, 0.12, 0.24), 0.10, 1.4, 3.6)):
        t = np.linspace(0.12, 1, 60)
        angle = start + 2 * np.pi * turns * t
        spiral = centre + (radius * e * t)[:, None] * np.stack([np.cos(angle), np.sin(angle)], 1)
        scrolls |= both(stroke, spiral[::4], [thick * 0.5, thick, thick * 1.2, thick * 0.6])
    p.paint(blur(scrolls, 0.0015), gold)
    p.emboss(blur(rope + scrolls, 0.0025), 0.10)

    # Beads on the trim and a jewel between the brows.
    outline = np.vstack([curve, mirrored(curve[::-1])])
    length = np.r_[0, np.cumsum(np.linalg.norm(np.diff(outline, axis=0), axis=1))]
    count = int(length[-1] / (0.115 * e))
    beads = np.stack([np.interp(np.linspace(0, length[-1], count, endpoint=False), length,
                                outline[:, k]) for k in range(2)], 1)
    yy, xx = np.mgrid[0:PIXELS, 0:PIXELS] / PIXELS
    inward = np.stack(np.gradient(edge)[::-1], -1)
    for bead in beads:
        i, j = np.clip((bead[::-1] * PIXELS).astype(int), 0, PIXELS - 1)
        direction = inward[i, j] / (np.linalg.norm(inward[i, j]) + 1e-12)
        jewel(p, xx, yy, bead - 0.036 * e * direction, 0.026 * e, [0.98, 0.95, 0.88])
    jewel(p, xx, yy, top + [0, 0.17 * e], 0.085 * e, [0.75, 0.05, 0.16], 1.5, dark_gold)
    p.keep(body & filled(face.rim), 0.006)
    p.cut(holes, 0.006)
    return p


def jewel(p, x, y, centre, radius, colour, tall=1.0, setting=None):
    """A polished stone: bright above left, a rim of light below right."""
    dx, dy = (x - centre[0]) / radius, (y - centre[1]) / (radius * tall)
    r = np.hypot(dx, dy)
    if setting is not None:
        p.paint(step(r, 1.35, 1.25), setting)
        p.paint(step(np.abs(r - 1.18), 0.10, 0.0), [0.96, 0.80, 0.40])
    p.paint(step(r, 1.05, 0.95), np.array(colour) * 0.55)
    p.paint(step(r, 1.0, 0.3) * step(dx + dy, -1.0, 1.2), np.array(colour))
    p.paint(0.9 * step(np.hypot(dx + 0.35, dy + 0.4), 0.42, 0.10), [1, 1, 1])


def tiger(face):
    """A tiger's face as if painted on the skin."""
    e = face.unit
    p = Painting([0.93, 0.52, 0.13])
    y, x = np.mgrid[0:PIXELS, 0:PIXELS] / PIXELS
    # Darker above and towards the sides, lighter down the middle.
    p.paint(0.55 * step(y, face.at(21)[1] - 0.1 * e, 0.0), [0.74, 0.32, 0.06])
    p.paint(0.45 * step(np.abs(x - 0.5), 0.55 * e, 1.35 * e), [0.76, 0.33, 0.07])
    p.paint(0.5 * step(np.abs(x - 0.5), 0.22 * e, 0.05 * e) *
            step(y, face.at(67)[1], face.at(64)[1]), [0.98, 0.64, 0.24])

    white = [0.99, 0.96, 0.90]
    soft = 0.035 * e
    brow = [face.at(39, -0.06, -0.14), face.at(40, -0.05, -0.34), face.at(42, 0.0, -0.42),
            face.at(44, 0.08, -0.30), face.at(45, 0.02, -0.10), face.at(43, 0.0, -0.10),
            face.at(41, 0.0, -0.10)]
    under = [face.at(39, 0.0, 0.12), face.at(49, -0.02, 0.22), face.at(47, 0.02, 0.24),
             face.at(45, -0.02, 0.13), face.at(48, 0.0, 0.09)]
    muzzle = [face.middle(68, 69, down=-0.06), face.at(67, -0.02, -0.06), face.at(66, -0.20, 0.16),
              face.at(75, -0.36, -0.20), face.at(75, -0.34, 0.22), face.at(86, -0.18, 0.34),
              face.at(84, -0.10, 0.52), face.at(84, 0.0, 0.58)]
    cheek = [face.at(2, 0.02, -0.05), face.at(2, 0.28, 0.10), face.at(3, 0.34, 0.14),
             face.at(4, 0.30, 0.18), face.at(5, 0.26, 0.20), face.at(6, 0.10, 0.22),
             face.at(5, -0.06, 0.14), face.at(4, -0.08, 0.0), face.at(3, -0.08, 0.0)]
    whole_muzzle = np.vstack([muzzle, mirrored(muzzle[-2:0:-1])])
    for shape, strength in ((brow, 1.0), (under, 0.9), (cheek, 0.95)):
        patch = both(lambda q: filled(smooth(q, closed=True)), shape)
        p.paint(strength * blur(patch, soft), white)
    p.paint(blur(filled(smooth(whole_muzzle, closed=True)), soft), white)

    # Stripes: (points on the left half, widths in units of the eye distance at those points).
    w = [0.02, 0.10, 0.12, 0.07, 0.0]
    thin = [0.0, 0.07, 0.08, 0.05, 0.0]
    strokes = [
        # Forehead, up from the brows.
        ([face.at(24, 0.10, -0.05), face.at(24, 0.02, -0.34), face.at(23, 0.04, -0.62)],
         [0.0, 0.09, 0.0]),
        ([face.at(23, 0.18, -0.36), face.at(22, 0.10, -0.54), face.at(21, 0.10, -0.64),
          face.at(20, 0.02, -0.58)], w),
        ([face.at(23, 0.20, -0.72), face.at(22, 0.06, -0.86), face.at(20, 0.06, -0.92),
          face.at(20, -0.16, -0.74)], w),
        ([face.at(22, 0.02, -0.26), face.at(21, -0.06, -0.36), face.at(20, -0.10, -0.36),
          face.at(19, -0.14, -0.30)], thin),
        # Temples and cheeks, from the sides inwards.
        ([face.at(19, -0.52, -0.40), face.at(19, -0.30, -0.30), face.at(19, -0.08, -0.12)],
         [0.14, 0.10, 0.0]),
        ([face.at(0, 0.04, -0.14), face.at(0, 0.26, -0.12), face.at(39, -0.22, -0.04)],
         [0.14, 0.12, 0.0]),
        ([face.at(1, -0.10, 0.0), face.at(1, 0.18, -0.02), face.at(1, 0.44, -0.06),
          face.at(50, -0.02, 0.34)], [0.15, 0.13, 0.09, 0.0]),
        ([face.at(2, -0.12, 0.04), face.at(2, 0.20, 0.0), face.at(2, 0.46, -0.04),
          face.at(2, 0.66, -0.10)], [0.15, 0.13, 0.08, 0.0]),
        ([face.at(3, -0.12, 0.08), face.at(3, 0.12, 0.02), face.at(3, 0.34, -0.06),
          face.at(3, 0.52, -0.16)], [0.15, 0.12, 0.07, 0.0]),
        ([face.at(4, -0.12, 0.10), face.at(4, 0.08, 0.04), face.at(4, 0.28, -0.06),
          face.at(4, 0.42, -0.18)], [0.15, 0.12, 0.07, 0.0]),
        ([face.at(5, -0.10, 0.12), face.at(5, 0.10, 0.04), face.at(5, 0.26, -0.08)],
         [0.13, 0.10, 0.0]),
        # Down both sides of the nose.
        ([face.at(45, 0.06, 0.02), face.at(63, 0.05, 0.12), face.at(64, 0.02, 0.06)],
         [0.05, 0.06, 0.0]),
    ]
    stripes = np.zeros((PIXELS, PIXELS), bool)
    for points, widths in strokes:
        stripes |= both(stroke, points, [width * e for width in widths])
    # One stroke up the middle of the forehead.
    stripes |= stroke([face.middle(24, 29, down=0.02), face.middle(24, 29, down=-0.30),
                       face.middle(24, 29, down=-0.62)], [0.0, 0.10 * e, 0.0])
    # Fur: the stripes' edges are torn along the hair, which grows away from the nose.
    shift = noise(11, 0.0016, (5, 0.6)) * 0.012 * e
    side = noise(12, 0.0030) * 0.010 * e
    rows, columns = np.mgrid[0:PIXELS, 0:PIXELS].astype(float)
    torn = ndimage.map_coordinates(
        blur(stripes, 0.0012), [rows + shift * PIXELS, columns + side * PIXELS], order=1)
    black = [0.07, 0.05, 0.05]
    p.paint(0.96 * torn, black)

    # Lids, nose, the line under it, lips and the whiskers' roots.
    lids = distance(eye_holes(face, 0.0))
    p.paint(step(lids, 0.085 * e, 0.055 * e), black)
    corner = both(stroke, [face.at(39, 0.06, 0.0), face.at(39, -0.10, -0.03),
                           face.at(39, -0.26, -0.12)], [0.09 * e, 0.08 * e, 0.0])
    corner |= both(stroke, [face.at(45, -0.05, 0.0), face.at(45, 0.07, 0.05),
                            face.at(45, 0.13, 0.16)], [0.07 * e, 0.06 * e, 0.0])
    p.paint(blur(corner, 0.002), black)
    nose = [face.at(65, 0.14, 0.10), face.at(66, 0.10, 0.06), face.at(67, -0.02, -0.06),
            face.at(67, 0.06, 0.03), face.middle(68, 69, down=0.07)]
    nose = np.vstack([nose, mirrored(nose[-2::-1])])
    snout = blur(filled(smooth(nose, closed=True)), 0.004)
    p.paint(snout, [0.46, 0.17, 0.17])
    p.paint(step(np.abs(distance(filled(smooth(nose, closed=True)))), 0.035 * e, 0.010 * e), black)
    line = stroke([face.middle(68, 69, down=0.04), face.at(78, 0.0, -0.06), face.at(78, 0.0, 0.04)],
                  [0.05 * e, 0.035 * e, 0.06 * e])
    p.paint(blur(line, 0.0015), black)
    lips = filled(smooth(face.landmarks[75:87], closed=True))
    p.paint(0.9 * step(distance(lips), 0.0, -0.05 * e), [0.20, 0.10, 0.10])
    p.paint(step(np.abs(distance(lips)), 0.030 * e, 0.010 * e), black)
    smile = both(stroke, [face.at(75, 0.04, 0.0), face.at(75, -0.08, -0.03),
                          face.at(75, -0.19, -0.12)], [0.05 * e, 0.045 * e, 0.0])
    p.paint(blur(smile, 0.0015), black)
    roots = [face.at(75, right, down) for right, down in
             ((-0.06, -0.14), (0.06, -0.20), (0.20, -0.22), (-0.14, -0.24), (0.0, -0.30),
              (0.14, -0.32), (-0.20, -0.10))]
    for root in roots + list(mirrored(roots)):
        p.paint(step(np.hypot(x - root[0], y - root[1]), 0.020 * e, 0.013 * e), black)

    # Hair by hair: fine streaks of light that run outwards.
    p.light(1 + 0.055 * noise(13, 0.0011, (6, 0.7)) + 0.035 * noise(14, 0.0011, (0.7, 6)) +
            0.04 * noise(15, 0.02))
    p.keep(distance(filled(face.rim)) < -0.03 * e, 0.10 * e)
    p.cut(eye_holes(face, 0.012), 0.010)
    p.cut(mouth_hole(face, 0.0), 0.008)
    return p


def gold_leaf(face):
    """Leaves of beaten gold, laid over each other and flaking at the border."""
    e = face.unit
    p = Painting([0.90, 0.68, 0.26])
    y, x = np.mgrid[0:PIXELS, 0:PIXELS] / PIXELS
    # Leaves: cells round scattered places, with wavering edges.
    random = np.random.default_rng(21)
    places = random.random((150, 2))
    wx, wy = x + 0.020 * noise(22, 0.02) * e, y + 0.020 * noise(23, 0.02) * e
    first = np.full((PIXELS, PIXELS), 9.0)
    second = first.copy()
    owner = np.zeros((PIXELS, PIXELS), int)
    for k, (px, py) in enumerate(places):
        d = np.maximum(np.abs(wx - px) * 1.2, np.abs(wy - py)) + 0.4 * np.hypot(wx - px, wy - py)
        nearer = d < first
        second = np.where(nearer, first, np.minimum(second, d))
        owner[nearer] = k
        first = np.minimum(first, d)
    tones = random.normal(0, 1, len(places))
    warmth = random.normal(0, 1, len(places))
    p.light(1 + 0.07 * tones[owner])
    p.paint(np.clip(0.16 * warmth[owner], 0, 0.4), [0.86, 0.50, 0.16])
    p.paint(np.clip(-0.16 * warmth[owner], 0, 0.4), [0.98, 0.86, 0.52])
    seam = second - first
    p.paint(0.55 * step(seam, 0.010, 0.001), [0.50, 0.31, 0.08])
    p.paint(0.45 * step(np.abs(seam - 0.014), 0.006, 0.0), [1.0, 0.93, 0.66])
    # Crumpled like foil: ridges of smooth noise.
    folds = -np.abs(noise(24, 0.012)) - 0.5 * np.abs(noise(25, 0.005))
    p.emboss(blur(folds, 0.0012), 0.085)
    p.paint(0.30 * step(noise(26, 0.05), 0.8, 2.2), [1.0, 0.95, 0.72])
    p.paint(0.25 * step(noise(27, 0.06), 0.8, 2.2), [0.62, 0.38, 0.10])

    # Features in copper and dark gold, so that the face stays a face.
    lips = filled(smooth(face.landmarks[75:87], closed=True))
    p.paint(0.55 * blur(lips, 0.006 * e / 0.25), [0.66, 0.27, 0.12])
    p.paint(0.5 * step(np.abs(distance(lips)), 0.025 * e, 0.0), [0.42, 0.20, 0.06])
    brows = filled(smooth(face.landmarks[19:29], closed=True))
    brows |= filled(smooth(face.landmarks[29:39], closed=True))
    p.paint(0.5 * blur(brows, 0.012), [0.48, 0.28, 0.07])
    around = distance(eye_holes(face, 0.03))
    p.paint(0.65 * step(around, 0.16 * e, 0.0), [0.46, 0.25, 0.06])
    p.paint(0.9 * step(np.abs(around - 0.012 * e), 0.022 * e, 0.006 * e), [1.0, 0.90, 0.58])

    # The border flakes: what is left depends on the distance to it and on the leaf.
    rim = -distance(filled(face.rim)) / e
    flake = rim + 0.10 * tones[owner] + 0.05 * noise(28, 0.010) + 0.025 * noise(29, 0.003)
    p.keep((flake > 0.20) & (rim > 0.02), 0.006)
    p.cut(eye_holes(face, 0.03), 0.008)
    p.cut(mouth_hole(face, 0.0), 0.006)
    return p


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("--out", type=Path, default=ROOT / "examples" / "assets",
                        help="folder to write to")
    folder = parser.parse_args().out
    folder.mkdir(parents=True, exist_ok=True)
    face = Layout()
    for name, draw in (("carnival", carnival), ("tiger", tiger), ("gold", gold_leaf)):
        save(draw(face), folder / f"mask_{name}.png")


if __name__ == "__main__":
    main()
