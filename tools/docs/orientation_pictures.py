# SPDX-License-Identifier: MIT
"""How the delivered picture of an upright person looks: one picture for each degree and mirror."""

import math

from PIL import Image

import canvas
import face

UPRIGHT = (252, 336)  # pixels of the upright picture in the cell
CELL = (480, 520)
MIDDLE = (CELL[0] / 2 + 8, 216)  # centre of the delivered picture in the cell
MM = 1.24  # pixels per mm
HEAD = (126, 158)  # the head's origin in the upright picture

WALL = (221, 238, 255)
SKIN = (255, 221, 187)
SHADE = (238, 187, 153)
HAIR = (102, 68, 51)
SHIRT = (68, 119, 170)

FORMULAS = {0: "(x, y)", 90: "(H − y, x)", 180: "(W − x, H − y)", 270: "(y, W − x)"}


def _spot(point):
    return (HEAD[0] + point[0] * MM, HEAD[1] - point[1] * MM)


def person():
    """An upright person with a letter on the cheek at image left and hair parted to one side."""
    landmarks = face.points(mouth_smile_L=0.5, mouth_smile_R=0.5)[:101]
    at = [_spot(p) for p in landmarks]
    picture = canvas.Canvas(*UPRIGHT, background=WALL)

    def shape(through, colour):
        picture.polygon(face.curve([_spot(p) for p in through], closed=True), colour)

    shape([(-100, -160), (-94, -128), (-42, -108), (42, -108), (94, -128), (100, -160)], SHIRT)
    picture.polygon([_spot(p) for p in [(-44, -40), (44, -40), (44, -108), (0, -128), (-44, -108)]],
                    SHADE)
    for side in (-1, 1):
        shape([(side * 71, 22), (side * 82, 26), (side * 83, 8), (side * 74, -14)], SHADE)
    shape([(-78, 25), (-76, 85), (-30, 118), (30, 118), (76, 85), (78, 25)], HAIR)
    outline = face.curve([at[k] for k in face.OUTLINE])
    brow = face.curve([_spot(p) for p in
                       [(74.7, 21.7), (70, 52), (52, 76), (8, 70), (-30, 84), (-66, 60),
                        (-74.7, 21.7)]])
    picture.polygon(outline + brow, SKIN)
    for ring in face.BROWS:
        picture.polygon(face.curve([at[k] for k in ring], closed=True), HAIR)
    for ring, pupil in zip(face.EYES, face.PUPILS):
        picture.polygon(face.curve([at[k] for k in ring], closed=True), canvas.WHITE)
        picture.dot(at[pupil], 5.5, canvas.INK)
        picture.line(face.curve([at[k] for k in ring[:7]]), HAIR, 2)
    picture.line(face.curve([at[k] for k in face.NOSE[3:9]]), SHADE, 3)
    picture.polygon(face.curve([at[k] for k in face.OUTER_LIP], closed=True), (204, 85, 85))
    picture.line(face.curve([at[k] for k in (87, 88, 89, 90, 91)]), (153, 51, 51), 2)
    picture.text(_spot((-45, -16)), "R", canvas.BLUE, 34, bold=True)
    return picture.large(), at


def _to_delivered(point, degree, mirror, size):
    """The reverse of what the engine does: from the upright picture to the delivered one of the
    given size."""
    u, v = point
    width, height = size
    x, y = {0: (u, v), 90: (v, height - u), 180: (width - u, height - v),
            270: (width - v, u)}[degree]
    return (width - x if mirror else x, y)


def _to_upright(point, degree, mirror, size):
    """What the engine does."""
    x, y = point
    width, height = size
    if mirror:
        x = width - x
    places = {0: (x, y), 90: (height - y, x), 180: (width - x, height - y), 270: (y, width - x)}
    return places[degree]


def _deliver(picture, degree, mirror):
    """The picture as the camera delivers it: the engine's clockwise turn undone, then mirrored."""
    turns = {0: None, 90: Image.Transpose.ROTATE_90, 180: Image.Transpose.ROTATE_180,
             270: Image.Transpose.ROTATE_270}  # these turn counter-clockwise
    if turns[degree] is not None:
        picture = picture.transpose(turns[degree])
    return picture.transpose(Image.Transpose.FLIP_LEFT_RIGHT) if mirror else picture


def _draw_cell(folder, person_picture, at, degree, mirror):
    size = UPRIGHT if degree in (0, 180) else UPRIGHT[::-1]
    left, top = MIDDLE[0] - size[0] / 2, MIDDLE[1] - size[1] / 2
    cell = canvas.Canvas(*CELL)
    cell.paste(_deliver(person_picture, degree, mirror), (left, top))
    corners = [(left, top), (left + size[0], top), (left + size[0], top + size[1]),
               (left, top + size[1])]
    cell.line(corners + corners[:1], canvas.GREY, 1.5)

    for landmark in (0, 9, 18):  # numbers as the detector gives them in the delivered picture
        place = at[face.mirrored(landmark)] if mirror else at[landmark]
        spot = _to_delivered(place, degree, mirror, size)
        if math.dist(_to_upright(spot, degree, mirror, size), place) > 1e-9:
            raise ValueError("the mapping and its reverse disagree")
        middle = _to_delivered(_spot((0, 0)), degree, mirror, size)
        away = math.dist(spot, middle)
        spot = (spot[0] + left, spot[1] + top)
        beside = [spot[i] + (spot[i] - (middle[i] + (left, top)[i])) / away * 22 for i in (0, 1)]
        cell.dot(spot, 5, canvas.RED, rim=canvas.WHITE)
        cell.text(tuple(beside), str(landmark), canvas.RED, 19, bold=True, halo=WALL)

    gap = 9
    cell.arrow((left - gap, top - gap), (left + size[0], top - gap), canvas.GREEN)
    cell.arrow((left - gap, top - gap), (left - gap, top + size[1]), canvas.GREEN)
    cell.dot((left - gap, top - gap), 4.5, canvas.GREEN)
    cell.text((left - gap - 9, top - gap - 11), "0", canvas.GREEN, 17, bold=True)
    cell.text((left + size[0] / 2, top - gap - 14), "x", canvas.GREEN, 19, bold=True)
    cell.text((left + size[0], top - gap - 14), "W", canvas.GREEN, 17, bold=True)
    cell.text((left - gap - 15, top + size[1] / 2), "y", canvas.GREEN, 19, bold=True)
    cell.text((left - gap - 15, top + size[1] - 6), "H", canvas.GREEN, 17, bold=True)

    cell.text((CELL[0] / 2, 424), f"degree {degree}, mirror {mirror}", canvas.INK, 23, bold=True)
    mapping = f"upright = {FORMULAS[degree]}"
    if mirror:
        cell.text((CELL[0] / 2, 460), "first x ← W − x, then", canvas.INK, 19)
        cell.text((CELL[0] / 2, 491), f"{mapping}, then pairs swap", canvas.INK, 19)
    else:
        cell.text((CELL[0] / 2, 462), mapping, canvas.INK, 19)
    cell.save(folder / f"degree_{degree}_mirror_{mirror}.png", colours=64)


def draw(folder):
    drawn, at = person()
    for degree in (0, 90, 180, 270):
        for mirror in (0, 1):
            _draw_cell(folder, drawn, at, degree, mirror)
