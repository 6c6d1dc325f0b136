#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""Writes examples/assets: a pair of glasses and a hat as OBJ, fitted to the mean face.

Frame: that of the engine's model matrix, mm. x to the image right, y up, z out of the face, origin
midway between the tragions. Places on the mean face that the shapes are fitted to: pupils at
(+-32, 25, 78), nose ridge at (0, 26, 96) and (0, 15, 104), brows at y = 44 to 53 and z = 85 to 96,
hairline at (0, 90, 82), widest head +-76, tops of the ears about (+-78, 14, -6).

    tools/assets/make_sticker_assets.py [--out FOLDER]
"""

import argparse
import math
import pathlib


def add(a, b):
    return tuple(p + q for p, q in zip(a, b))


def sub(a, b):
    return tuple(p - q for p, q in zip(a, b))


def scale(a, s):
    return tuple(p * s for p in a)


def cross(a, b):
    return (a[1] * b[2] - a[2] * b[1], a[2] * b[0] - a[0] * b[2], a[0] * b[1] - a[1] * b[0])


def unit(a):
    n = math.sqrt(sum(p * p for p in a))
    return scale(a, 1 / n) if n > 0 else (0.0, 0.0, 1.0)


def mirrored(p):
    return (-p[0], p[1], p[2])


def smooth(low, high, value):
    """0 below low, 1 above high, without a corner between."""
    t = min(1.0, max(0.0, (value - low) / (high - low)))
    return t * t * (3 - 2 * t)


class Obj:
    """Collects smooth grids of points as an OBJ file."""

    def __init__(self, name, title):
        self.name = name
        self.lines = [f"# {title}", "# Made by tools/assets/make_sticker_assets.py.",
                      f"mtllib {name}.mtl"]
        self.materials = []
        self.count = 0

    def material(self, name, colour, gloss, opacity=1.0):
        self.materials += [f"newmtl {name}", "Kd " + " ".join(f"{c:g}" for c in colour),
                           f"Ns {gloss:g}", f"d {opacity:g}", ""]

    def use(self, name):
        self.lines.append(f"usemtl {name}")

    def grid(self, rows, closed=False, mirror=False):
        """A surface through rows of points; outside is where rows x columns points to.

        closed: the last column joins the first. mirror: the same again for the other side.
        """
        self._grid(rows, closed, False)
        if mirror:
            self._grid([[mirrored(p) for p in row] for row in rows], closed, True)

    def _grid(self, rows, closed, flipped):
        height, width = len(rows), len(rows[0])
        first = self.count + 1
        for r, row in enumerate(rows):
            for c, p in enumerate(row):
                left = row[c - 1] if c > 0 or closed else p
                right = row[(c + 1) % width] if c + 1 < width or closed else p
                below, above = rows[max(r - 1, 0)][c], rows[min(r + 1, height - 1)][c]
                n = unit(cross(sub(above, below), sub(right, left)))
                if flipped:
                    n = scale(n, -1)
                self.lines.append("v " + " ".join(f"{v:.1f}" for v in p))
                self.lines.append("vn " + " ".join(f"{v:.2f}" for v in n))
        for r in range(height - 1):
            for c in range(width if closed else width - 1):
                a, b = first + r * width + c, first + r * width + (c + 1) % width
                quad = (a, a + width, b + width, b)
                if flipped:
                    quad = quad[::-1]
                self.lines.append("f " + " ".join(f"{i}//{i}" for i in quad))
        self.count += height * width

    def tube(self, path, across, half_width, half_height, mirror=False, closed=False):
        """A bar with rounded edges along a path.

        across: for each point of the path the direction of the width; half_width and half_height
        are numbers or one number a point.
        """
        sides = 8
        rows = []
        for i, p in enumerate(path):
            after = path[(i + 1) % len(path)] if closed else path[min(i + 1, len(path) - 1)]
            before = path[i - 1] if closed or i > 0 else p
            tangent = unit(sub(after, before))
            along = sum(a * t for a, t in zip(across[i], tangent))
            side = unit(sub(across[i], scale(tangent, along)))
            up = cross(tangent, side)
            w = half_width[i] if isinstance(half_width, list) else half_width
            h = half_height[i] if isinstance(half_height, list) else half_height
            row = []
            for s in range(sides):
                angle = 2 * math.pi * s / sides
                # Between a circle and a square: flat sides that still catch a highlight.
                x, y = math.cos(angle), math.sin(angle)
                round_ = (abs(x) ** 4 + abs(y) ** 4) ** 0.25
                row.append(add(p, add(scale(side, w * x / round_), scale(up, h * y / round_))))
            rows.append(row)
        if closed:
            rows.append(rows[0])
        else:
            # Rounded ends.
            for end, inner in ((0, 1), (-1, -2)):
                out = unit(sub(path[end], path[inner]))
                cap = [add(path[end], add(scale(sub(q, path[end]), 0.6), scale(out, 0.8)))
                       for q in rows[end]]
                tip = [add(path[end], scale(out, 1.0))] * sides
                rows = [tip, cap] + rows if end == 0 else rows + [cap, tip]
        self.grid(rows, closed=True, mirror=mirror)

    def write(self, folder):
        (folder / f"{self.name}.obj").write_text("\n".join(self.lines) + "\n")
        (folder / f"{self.name}.mtl").write_text("\n".join(self.materials).rstrip() + "\n")


# ---------------------------------------------------------------------------------------------
# Glasses


def front(x):
    """Depth of the frame's front: it follows the face around."""
    return 100.5 - 0.0019 * x * x


def rim_point(angle, inset=0.0):
    """The lens at +x: a rounded rectangle, higher and fuller towards the temple."""
    half_width, half_height, power = 24.5 - inset, 19.0 - inset, 2.7
    c, s = math.cos(angle), math.sin(angle)
    x = half_width * math.copysign(abs(c) ** (2 / power), c)
    y = half_height * math.copysign(abs(s) ** (2 / power), s)
    # The lower inner corner gives way to the nose, the upper outer one is drawn up.
    x += 3.0 * smooth(0, 19, -y) * smooth(0, 24, -x)
    y += 2.5 * smooth(0, 24, x) * smooth(-5, 19, y)
    px, py = 33.5 + x, 22.0 + y
    return (px, py, front(px) - 0.02 * (22.0 - py))


def glasses():
    obj = Obj("glasses", "A pair of glasses on the mean face, mm")
    obj.material("frame", (0.13, 0.09, 0.08), 70)
    obj.material("metal", (0.62, 0.60, 0.56), 90)
    obj.material("lens", (0.20, 0.27, 0.32), 100, 0.38)

    steps = 40
    angles = [2 * math.pi * i / steps for i in range(steps)]
    rim = [rim_point(a) for a in angles]
    obj.use("frame")
    heights = [1.7 + 0.8 * smooth(-0.2, 0.9, math.sin(a)) for a in angles]
    obj.tube(rim, [(0, 0, 1)] * steps, 2.0, heights, mirror=True, closed=True)

    # Bridge: from rim to rim over the nose.
    arc = []
    for i in range(13):
        x = -10.5 + 21.0 * i / 12
        bow = math.cos(math.pi * x / 21)
        arc.append((x, 29.5 + 2.2 * bow, 101.0 + 0.8 * bow))
    obj.tube(arc, [(0, 0, 1)] * len(arc), 1.8, 2.2)

    # Temples: from the rim's outer corner round the hinge back over the ear and down behind it.
    path = [(56.5, 33.5, 94.0), (63.0, 33.6, 91.8), (68.5, 33.2, 88.0), (71.2, 32.6, 82.5),
            (72.6, 31.4, 72.0), (74.0, 28.4, 52.0), (75.6, 24.6, 32.0), (76.9, 21.0, 14.0),
            (77.6, 18.2, 2.0), (78.0, 14.8, -7.0), (78.2, 8.5, -14.5), (78.0, 0.0, -19.0),
            (77.6, -9.0, -22.0)]
    path = resampled(path, 28)
    across = [(1, 0, 0) if p[2] < 80 else unit((1, 0, 0.9)) for p in path]
    heights = [3.4 - 1.4 * smooth(0, 0.35, i / 27) + 0.7 * smooth(0.75, 1, i / 27)
               for i in range(28)]
    obj.tube(path, across, 1.2, heights, mirror=True)

    # Nose pads.
    obj.use("metal")
    pad = [(9.2, 23.0, 99.0), (9.8, 21.0, 95.5), (10.6, 17.5, 94.5), (11.6, 14.0, 96.0)]
    pad = resampled(pad, 9)
    obj.tube(pad, [(1, 0, 0.5)] * 9, 0.8, 1.5, mirror=True)

    # Lenses, a fan of rings around the middle; slightly domed.
    obj.use("lens")
    rows = []
    for ring in range(5):
        t = 1 - ring / 4
        row = []
        for a in angles:
            edge = rim_point(a, inset=1.0)
            x, y = 33.5 + (edge[0] - 33.5) * t, 22.0 + (edge[1] - 22.0) * t
            row.append((x, y, front(x) - 0.02 * (22.0 - y) + 1.2 * (1 - t * t)))
        rows.append(row)
    obj.grid(rows, closed=True, mirror=True)
    return obj


def resampled(path, count):
    """Points at even distances on a Catmull-Rom curve through `path`."""
    ends = [sub(scale(path[0], 2), path[1])] + path + [sub(scale(path[-1], 2), path[-2])]
    fine = []
    for i in range(1, len(ends) - 2):
        p0, p1, p2, p3 = ends[i - 1:i + 3]
        for k in range(20):
            t = k / 20
            fine.append(tuple(0.5 * (2 * b + (c - a) * t + (2 * a - 5 * b + 4 * c - d) * t * t
                                     + (3 * b - a - 3 * c + d) * t ** 3)
                              for a, b, c, d in zip(p0, p1, p2, p3)))
    fine.append(path[-1])
    lengths = [0.0]
    for a, b in zip(fine, fine[1:]):
        lengths.append(lengths[-1] + math.dist(a, b))
    result = []
    k = 0
    for i in range(count):
        want = lengths[-1] * i / (count - 1)
        while k + 2 < len(fine) and lengths[k + 1] < want:
            k += 1
        span = lengths[k + 1] - lengths[k]
        t = (want - lengths[k]) / span if span > 0 else 0.0
        result.append(add(fine[k], scale(sub(fine[k + 1], fine[k]), t)))
    return result


# ---------------------------------------------------------------------------------------------
# Hat

HAT_CENTRE = (0.0, 63.0, -2.0)
HAT_TILT = math.radians(8.0)  # lower at the back
BAND_X, BAND_Z = 79.0, 97.0   # the head with hair, a few millimetres wider than the skull
STEPS = 60


def worn(p):
    """From the hat's own frame (band in the plane y = 0, front at +z) to the head."""
    x, y, z = p
    c, s = math.cos(HAT_TILT), math.sin(HAT_TILT)
    return (HAT_CENTRE[0] + x, HAT_CENTRE[1] + c * y + s * z, HAT_CENTRE[2] - s * y + c * z)


def crown_point(angle, radius, height):
    """A point of the crown before it is worn: `radius` in parts of the band, then the creases."""
    x, z = BAND_X * radius * math.sin(angle), BAND_Z * radius * math.cos(angle)
    top = smooth(55, 98, height)
    # The crease along the middle of the top, deepest behind the pinch.
    y = height - 20 * top * math.exp(-(x / 17) ** 2) * (1 - smooth(45, 95, abs(z + 5)))
    # Two fingers' pinch at the front.
    x *= 1 - 0.22 * smooth(45, 92, height) * smooth(15, 75, z)
    # The top falls to the back.
    y -= 10 * top * smooth(-90, 60, -z)
    return (x, y, z)


def brim_point(angle, outward, lift):
    """`outward` mm from the band; the sides are rolled up, front and back dip."""
    normal = unit((math.sin(angle) / BAND_X, 0, math.cos(angle) / BAND_Z))
    width = outward / 54.0
    side = math.sin(angle) ** 2
    y = width * width * (20 * side - 9 * (1 - side)) - 2.0 * width
    return (BAND_X * math.sin(angle) + normal[0] * outward, y + lift,
            BAND_Z * math.cos(angle) + normal[2] * outward)


def hat():
    obj = Obj("hat", "A felt hat with brim on the mean head, mm")
    obj.material("felt", (0.36, 0.27, 0.20), 6)
    obj.material("ribbon", (0.45, 0.08, 0.10), 30)
    angles = [2 * math.pi * i / STEPS for i in range(STEPS)]

    def rows(points):
        return [[worn(point(a)) for a in angles] for point in points]

    obj.use("felt")
    # Wall, shoulder and top, from the band up.
    profile = [(1.0, 0), (0.985, 20), (0.97, 40), (0.95, 60), (0.935, 76), (0.92, 86), (0.89, 93),
               (0.83, 97.5), (0.73, 99.5), (0.60, 100), (0.45, 100), (0.32, 100), (0.20, 100),
               (0.10, 100), (0.0, 100)]
    obj.grid(rows([lambda a, r=r, h=h: crown_point(a, r, h) for r, h in profile]), closed=True)
    # Brim: underside from the band out, round the edge, upper side back in.
    outward = [0, 8, 18, 30, 42, 50, 54]
    under = [lambda a, o=o: brim_point(a, o, -1.2) for o in outward]
    edge = [lambda a: brim_point(a, 55.2, 0.0)]
    over = [lambda a, o=o: brim_point(a, o, 1.2) for o in reversed(outward)]
    obj.grid(rows(under + edge + over), closed=True)

    obj.use("ribbon")
    band = [(1.004, 1.0), (1.02, 1.6), (1.012, 13), (1.0, 25.4), (0.984, 26.0)]
    obj.grid(rows([lambda a, r=r, h=h: crown_point(a, r, h) for r, h in band]), closed=True)
    return obj


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("--out", type=pathlib.Path, help="folder to write to",
                        default=pathlib.Path(__file__).resolve().parents[2] / "examples" / "assets")
    folder = parser.parse_args().out
    folder.mkdir(parents=True, exist_ok=True)
    for obj in (glasses(), hat()):
        obj.write(folder)


if __name__ == "__main__":
    main()
