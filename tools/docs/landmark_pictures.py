# SPDX-License-Identifier: MIT
"""The numbered pictures of the landmark layouts."""

import numpy as np

import canvas
import face

SCALE = 10.0  # pixels per mm
LEFT, TOP = 86.0, 72.0  # mm that the picture reaches to the left of and above the head's origin
WIDTH, HEIGHT = 1720, 1930
NUMBER = 25  # text height, pixels
SKIN = (255, 238, 221)
LINE = (221, 204, 187)
GAP = 11  # from a point to its number
MOUTH = {"jaw_open": 0.55}  # so that the lips do not hide each other's numbers


def _place(landmarks):
    return np.column_stack([(LEFT + landmarks[:, 0]) * SCALE, (TOP - landmarks[:, 1]) * SCALE])


def _background(picture, at):
    outline = face.curve(at[face.OUTLINE])
    # The forehead has no landmarks: the picture ends in it, narrowing as heads do.
    temples = [at[18] + (-5, -130), at[18] + (-30, -280), at[18] + (-110, -520)]
    right = face.curve([at[17], at[18], *temples])[10:]
    left = [(2 * LEFT * SCALE - x, y) for x, y in right]
    whole = left[::-1] + outline + right
    picture.polygon(whole, SKIN)
    picture.line(whole, LINE, 4)
    for ring in face.BROWS + face.RINGS:
        picture.polygon(face.curve(at[ring], closed=True), canvas.WHITE, LINE, 4)
    picture.line(face.curve(at[face.NOSE]), LINE, 4)
    picture.line(face.curve(at[face.RIDGE]), LINE, 4)


def _outward(at, ring):
    """Unit directions out of a closed ring, across the line through both neighbours."""
    p = at[ring]
    along = np.roll(p, -1, axis=0) - np.roll(p, 1, axis=0)
    normal = np.column_stack([along[:, 1], -along[:, 0]])
    normal /= np.linalg.norm(normal, axis=1)[:, None]
    ahead = np.roll(p, -1, axis=0)
    turn = np.sign(np.sum(p[:, 0] * ahead[:, 1] - p[:, 1] * ahead[:, 0]))
    return normal * turn


def _directions(at):
    """Where the number of each base landmark stands: a unit vector from its point."""
    out = np.zeros((101, 2))
    out[face.OUTLINE] = _outward(at, face.OUTLINE)
    out[0], out[18] = (-1, 0), (1, 0)
    for ring in [*face.BROWS, *face.EYES, face.OUTER_LIP]:
        out[ring] = _outward(at, ring)
    out[face.INNER_LIP] = -_outward(at, face.INNER_LIP)
    out[[63, 64, 65]], out[[74, 73, 72]] = (1, 0), (-1, 0)
    out[66], out[71] = (-1, 0), (1, 0)
    out[67], out[70] = (-0.6, 0.8), (0.6, 0.8)
    out[68], out[69] = (-0.25, 1), (0.25, 1)
    out[95], out[96] = (0, 1), (0, 1)
    out[face.RIDGE] = (1, 0)
    return out


class _Numbers:
    """Places numbers beside their points and refuses to draw one over another."""

    def __init__(self, picture):
        self._picture = picture
        self._boxes = []

    def add(self, number, at, direction, colour, gap=GAP):
        text = str(number)
        width, height = self._picture.text_box(text, NUMBER, bold=True)
        away = np.asarray(direction, float) / np.linalg.norm(direction)
        # The box touches the circle of radius `gap` round the point.
        reach = gap + abs(away[0]) * width / 2 + abs(away[1]) * height / 2
        if gap > GAP:
            self._picture.line([tuple(at), tuple(at + away * (gap - 2))], colour, 1.5)
        centre = np.asarray(at) + away * reach
        box = (centre[0] - width / 2, centre[1] - height / 2,
               centre[0] + width / 2, centre[1] + height / 2)
        for other, where in self._boxes:
            if (box[0] < where[2] + 2 and where[0] < box[2] + 2
                    and box[1] < where[3] + 2 and where[1] < box[3] + 2):
                raise ValueError(f"the numbers {number} and {other} overlap")
        self._boxes.append((number, box))
        self._picture.text(tuple(centre), text, colour, NUMBER, bold=True, halo=canvas.WHITE)


def _colour(landmark):
    groups = [(face.OUTLINE, canvas.INK), (face.BROWS[0] + face.BROWS[1], canvas.PURPLE),
              (face.EYES[0] + face.EYES[1], canvas.BLUE), (face.NOSE, canvas.GREEN),
              (face.OUTER_LIP, canvas.RED), (face.INNER_LIP, canvas.ORANGE),
              (face.PUPILS, canvas.INK), (face.RIDGE, canvas.ORANGE)]
    return next(colour for group, colour in groups if landmark in group)


def _title(picture, big, small):
    picture.text((WIDTH / 2, HEIGHT - 92), big, canvas.INK, 38, bold=True)
    picture.text((WIDTH / 2, HEIGHT - 40), small, canvas.GREY, 27)


def draw_101(folder):
    at = _place(face.points(**MOUTH)[:101])
    directions = _directions(at)
    picture = canvas.Canvas(WIDTH, HEIGHT)
    _background(picture, at)
    for k, point in enumerate(at):
        picture.dot(point, 7, _colour(k))
    numbers = _Numbers(picture)
    for k, point in enumerate(at):
        numbers.add(k, point, directions[k], _colour(k))
    _title(picture, "The 101 landmarks",
           "upright, unmirrored picture: 0 is at image left, x to the right, y down")
    picture.save(folder / "landmarks_101.png", colours=16)


def draw_165(folder):
    base = face.points(**MOUTH)[:101]
    at, extra = _place(base), _place(face.further_points(base))
    picture = canvas.Canvas(WIDTH, HEIGHT)
    _background(picture, at)
    for point in at:
        picture.dot(point, 5, (176, 182, 190))
    directions = np.zeros((64, 2))
    directions[0:2] = (0, 1)
    # Beyond the chin the outline's own ring closes across the forehead, so its ends need no care.
    directions[2:20] = _outward(extra, list(range(2, 20)))
    directions[2], directions[19] = (-1, 0), (1, 0)
    first = 20
    colours = [canvas.INK] * 2 + [canvas.INK] * 18
    for ring, colour in zip(face.RINGS, (canvas.BLUE, canvas.BLUE, canvas.RED, canvas.ORANGE)):
        run = list(range(first, first + len(ring)))
        away = _outward(extra, run)
        directions[run] = -away if ring is face.INNER_LIP else away
        colours += [colour] * len(ring)
        first += len(ring)
    for point, colour in zip(extra, colours):
        picture.dot(point, 7, colour)
    numbers = _Numbers(picture)
    for k, point in enumerate(extra):
        # Round the eyes there is no room side by side: every other number stands further out.
        far = 20 <= k < 44 and k % 2 == 1
        numbers.add(101 + k, point, directions[k], colours[k], GAP + 28 if far else GAP)
    _title(picture, "The 64 further points of the 165-point layout",
           "grey: the 101 base points; 101 and 102 repeat the pupils 95 and 96")
    picture.save(folder / "landmarks_165.png", colours=16)
