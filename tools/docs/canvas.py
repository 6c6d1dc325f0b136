# SPDX-License-Identifier: MIT
"""A drawing surface for the documents: smooth lines, one typeface, small palette PNGs."""

import math

import numpy as np
from PIL import Image, ImageDraw, ImageFont

FONT = "/usr/share/fonts/truetype/dejavu/DejaVuSans.ttf"
BOLD = "/usr/share/fonts/truetype/dejavu/DejaVuSans-Bold.ttf"

INK = (34, 40, 49)
GREY = (130, 138, 148)
PALE = (205, 210, 216)
WHITE = (255, 255, 255)
RED = (200, 50, 47)
GREEN = (33, 130, 60)
BLUE = (30, 95, 185)
ORANGE = (196, 98, 16)
PURPLE = (120, 60, 160)

SMOOTHING = 4  # drawn this many times larger and averaged
LARGEST_FILE = 60_000  # bytes


class Canvas:
    """Coordinates are pixels of the finished picture, x right and y down."""

    def __init__(self, width, height, background=WHITE):
        self.size = (width, height)
        self._image = Image.new("RGB", (width * SMOOTHING, height * SMOOTHING), background)
        self._draw = ImageDraw.Draw(self._image)

    def _big(self, points):
        return [(x * SMOOTHING, y * SMOOTHING) for x, y in points]

    def polygon(self, points, fill, outline=None, width=2):
        self._draw.polygon(self._big(points), fill=fill)
        if outline:
            self.line(list(points) + [points[0]], outline, width)

    def line(self, points, colour, width=2):
        big = self._big(points)
        self._draw.line(big, fill=colour, width=round(width * SMOOTHING), joint="curve")
        for x, y in (big[0], big[-1]):
            self._disc(x, y, width * SMOOTHING / 2, colour)

    def dashed(self, a, b, colour, width=2, dash=7, gap=5):
        length = math.dist(a, b)
        at = 0.0
        while at < length:
            ends = [at / length, min(at + dash, length) / length]
            self.line([(a[0] + (b[0] - a[0]) * t, a[1] + (b[1] - a[1]) * t) for t in ends],
                      colour, width)
            at += dash + gap

    def arrow(self, a, b, colour, width=3, head=13):
        angle = math.atan2(b[1] - a[1], b[0] - a[0])
        neck = (b[0] - head * math.cos(angle), b[1] - head * math.sin(angle))
        self.line([a, neck], colour, width)
        wing = [(b[0] - head * 1.15 * math.cos(angle + s), b[1] - head * 1.15 * math.sin(angle + s))
                for s in (-0.42, 0.42)]
        self.polygon([b, *wing], colour)

    def _disc(self, x, y, radius, colour):
        self._draw.ellipse((x - radius, y - radius, x + radius, y + radius), fill=colour)

    def dot(self, at, radius, colour, rim=None):
        x, y = at[0] * SMOOTHING, at[1] * SMOOTHING
        if rim:
            self._disc(x, y, (radius + 1.6) * SMOOTHING, rim)
        self._disc(x, y, radius * SMOOTHING, colour)

    def arc(self, centre, radius, start, end, colour, width=2):
        """From angle to angle in degrees, 0 to the right and growing clockwise."""
        steps = np.radians(np.linspace(start, end, 40))
        self.line([(centre[0] + radius * math.cos(t), centre[1] + radius * math.sin(t))
                   for t in steps], colour, width)

    def text(self, at, text, colour=INK, size=16, anchor="mm", bold=False, halo=None):
        font = ImageFont.truetype(BOLD if bold else FONT, size * SMOOTHING)
        self._draw.text((at[0] * SMOOTHING, at[1] * SMOOTHING), text, fill=colour, font=font,
                        anchor=anchor, stroke_width=3 * SMOOTHING if halo else 0, stroke_fill=halo)

    def text_box(self, text, size, bold=False):
        """Width and height of a text."""
        font = ImageFont.truetype(BOLD if bold else FONT, size * SMOOTHING)
        left, top, right, bottom = font.getbbox(text, anchor="lt")
        return (right - left) / SMOOTHING, (bottom - top) / SMOOTHING

    def paste(self, picture, at):
        """Places a picture that is SMOOTHING times larger than its place."""
        self._image.paste(picture, (round(at[0] * SMOOTHING), round(at[1] * SMOOTHING)))

    def large(self):
        """The picture as drawn, SMOOTHING times too large."""
        return self._image

    def save(self, path, colours=32):
        small = self._image.resize(self.size, Image.Resampling.BOX)
        _indexed(small, colours).save(path, optimize=True)
        size = path.stat().st_size
        if size >= LARGEST_FILE:
            raise ValueError(f"{path.name} has {size} bytes; {LARGEST_FILE} is the limit")
        print(f"{path.name}: {self.size[0]} x {self.size[1]}, {size} bytes")


def _indexed(picture, colours):
    """The picture with its most frequent colours; the others go to the nearest of those. White
    stays white and the result does not depend on the imaging library's own quantiser."""
    pixels = np.asarray(picture).reshape(-1, 3).astype(np.int32)
    coarse = (pixels + 8) // 17  # 16 levels a channel
    key = coarse @ [256, 16, 1]
    used, where, count = np.unique(key, return_inverse=True, return_counts=True)
    levels = np.stack([used // 256, used // 16 % 16, used % 16], axis=1) * 17
    kept = np.argsort(-count, kind="stable")[:colours]
    distance = ((levels[:, None, :] - levels[None, kept, :]) ** 2).sum(axis=2)
    index = np.argmin(distance, axis=1)[where].astype(np.uint8)
    out = Image.fromarray(index.reshape(picture.height, picture.width), "P")
    out.putpalette(levels[kept].astype(np.uint8).tobytes())
    return out
