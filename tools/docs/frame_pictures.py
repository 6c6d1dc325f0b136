# SPDX-License-Identifier: MIT
"""The frames: pixels, camera and viewer, and the two frames of the head."""

import math

import numpy as np

import canvas
import face
import orientation_pictures

SKIN = (255, 221, 187)
LINE = (170, 136, 102)
TILT = 20.0  # degrees between the model file's frame and the upright head

# Back of the head behind the measured profile, as (z, y) from the neck's front over the nape to the
# hairline: drawn, not measured.
BACK = [(50, -140), (-62, -140), (-58, -75), (-80, -25), (-95, 30), (-82, 90), (-40, 128),
        (20, 134), (64, 114)]


def _pixel_grid(picture, left, top):
    """A corner of the picture, one square a pixel."""
    cell, columns, rows = 84, 4, 3
    for row in range(rows):
        for column in range(columns):
            box = [(left + (column + i) * cell, top + (row + j) * cell)
                   for i, j in ((0, 0), (1, 0), (1, 1), (0, 1))]
            fill = (255, 238, 204) if (column, row) == (2, 1) else canvas.WHITE
            picture.polygon(box, fill, canvas.PALE, 2)
    for column in range(columns):
        for row in range(rows):
            picture.dot((left + (column + 0.5) * cell, top + (row + 0.5) * cell), 3, canvas.GREY)
    for column in range(columns + 1):
        picture.text((left + column * cell, top - 17), str(column), canvas.GREEN, 18, bold=True)
    for row in range(1, rows + 1):
        picture.text((left - 16, top + row * cell), str(row), canvas.GREEN, 18, bold=True)
    corner, middle = (left + 2 * cell, top + cell), (left + 2.5 * cell, top + 1.5 * cell)
    picture.dot(corner, 6, canvas.BLUE)
    picture.dot(middle, 6, canvas.RED)
    below = top + rows * cell
    picture.dot((left + 4, below + 31), 6, canvas.BLUE)
    picture.text((left + 20, below + 30), "landmark (2, 1) as passed in", canvas.INK, 18, "lm")
    picture.dot((left + 4, below + 60), 6, canvas.RED)
    picture.text((left + 20, below + 59), "centre (2.5, 1.5) of that pixel:", canvas.INK, 18, "lm")
    picture.text((left + 20, below + 83), "here the 3-D landmark projects", canvas.INK, 18, "lm")


def draw_pixel(folder):
    picture = canvas.Canvas(920, 430)
    person, _ = orientation_pictures.person()
    left, top = 90, 54
    width, height = orientation_pictures.UPRIGHT
    picture.paste(person, (left, top))
    picture.line([(left, top), (left + width, top), (left + width, top + height),
                  (left, top + height), (left, top)], canvas.GREY, 1.5)
    middle = (left + width / 2, top + height / 2)
    picture.dashed((middle[0], top), (middle[0], top + height), canvas.GREY, 1.2)
    picture.dashed((left, middle[1]), (left + width, middle[1]), canvas.GREY, 1.2)
    picture.dot(middle, 5, canvas.BLUE, rim=canvas.WHITE)
    picture.text((middle[0] + 12, middle[1] - 16), "(w/2, h/2)", canvas.BLUE, 16, "lm", bold=True,
                 halo=canvas.WHITE)
    gap = 9
    picture.arrow((left - gap, top - gap), (left + width, top - gap), canvas.GREEN)
    picture.arrow((left - gap, top - gap), (left - gap, top + height), canvas.GREEN)
    picture.dot((left - gap, top - gap), 5, canvas.GREEN)
    picture.text((left - gap, top - gap - 16), "(0, 0)", canvas.GREEN, 16, bold=True)
    picture.text((left + width / 2, top - gap - 15), "x", canvas.GREEN, 19, bold=True)
    picture.text((left + width, top - gap - 15), "w", canvas.GREEN, 19, bold=True)
    picture.text((left - gap - 15, top + height / 2), "y", canvas.GREEN, 19, bold=True)
    picture.text((left - gap - 15, top + height - 6), "h", canvas.GREEN, 19, bold=True)
    picture.text((left + width / 2, top + height + 24), "upright frame, pixels", canvas.INK, 19,
                 bold=True)
    _pixel_grid(picture, 480, 54)
    picture.save(folder / "frame_pixel.png", colours=128)


def _head_from_the_side(scale, turn=0.0):
    """Outline of the head, looking left, as offsets in pixels from its origin."""
    through = np.array(face.curve(list(face.profile(face.points()))[:-1] + BACK, closed=True))
    turn = math.radians(turn)
    z = math.cos(turn) * through[:, 0] - math.sin(turn) * through[:, 1]
    y = math.sin(turn) * through[:, 0] + math.cos(turn) * through[:, 1]
    return np.column_stack([-z, -y]) * scale


def _turned(z, y, turn):
    turn = math.radians(turn)
    return (math.cos(turn) * z - math.sin(turn) * y, math.sin(turn) * z + math.cos(turn) * y)


def _draw_head(picture, at, scale, turn=0.0):
    picture.polygon([tuple(at + p) for p in _head_from_the_side(scale, turn)], SKIN, LINE, 2)
    points = face.points()

    def spot(point):
        z, y = _turned(point[2], point[1], turn)
        return (at[0] - z * scale, at[1] - y * scale)

    eye = face.EYES[1]
    rim = face.curve([spot(points[k]) for k in eye], closed=True)
    picture.polygon(rim, canvas.WHITE, LINE, 1.5)
    picture.dot(spot(points[96]), 4 * scale + 1, canvas.INK)
    picture.line(face.curve([spot(points[k]) for k in range(29, 35)]), LINE, 3)
    picture.line(face.curve([spot(points[k]) for k in (70, 71, 72)]), LINE, 1.5)
    picture.line(face.curve([spot(points[k]) for k in (89, 90, 91)]), LINE, 2)


def _axes(picture, at, axes, colour, length=72, size=19):
    """Axes as (name, x, y of its direction in the picture); None for one towards the reader."""
    for name, direction in axes:
        if direction is None:
            picture.dot(at, 9, colour, rim=canvas.WHITE)
            picture.dot(at, 6, canvas.WHITE)
            picture.dot(at, 3, colour)
            picture.text((at[0] + 15, at[1] + 17), name, colour, size, bold=True, halo=canvas.WHITE)
            continue
        end = (at[0] + direction[0] * length, at[1] + direction[1] * length)
        picture.arrow(at, end, colour)
        beyond = (end[0] + direction[0] * 14, end[1] + direction[1] * 14)
        picture.text(beyond, name, colour, size, bold=True, halo=canvas.WHITE)


def draw_camera(folder):
    scale = 0.92  # pixels per mm
    picture = canvas.Canvas(1100, 480)
    axis = 230
    eye, middle, head = (150, axis), (150 + 500 * scale, axis), (150 + 760 * scale, axis + 34)
    half = math.atan(0.5 * 4 / 3 / (0.5 * (1 + 4 / 3)))  # upright 3 : 4 picture
    for side in (-1, 1):
        picture.dashed(eye, (eye[0] + 335, eye[1] + side * 335 * math.tan(half)), canvas.PALE, 2)
    picture.arc(eye, 265, -math.degrees(half), math.degrees(half), canvas.PALE, 2)
    picture.text((eye[0] + 275, axis - 46), "vertical field of view", canvas.GREY, 16, "lm")
    picture.text((eye[0] + 275, axis - 24), "2 atan(h / (w + h))", canvas.GREY, 16, "lm")
    picture.dashed(eye, (1060, axis), canvas.PALE, 1.5)
    _draw_head(picture, np.array(head), scale)

    _axes(picture, (eye[0], axis), [("z", (1, 0)), ("y", (0, 1)), ("x", None)], canvas.BLUE)
    _axes(picture, (eye[0], axis), [("z", (-1, 0)), ("y", (0, -1))], canvas.GREEN)
    picture.text((eye[0], axis + 112), "camera frame", canvas.BLUE, 18, bold=True)
    picture.text((eye[0], axis + 136), "y down, z into the scene", canvas.BLUE, 16)
    picture.text((eye[0], axis - 128), "OpenGL eye frame", canvas.GREEN, 18, bold=True)
    picture.text((eye[0], axis - 104), "y up, z to the viewer", canvas.GREEN, 16)
    _axes(picture, head, [("y", (0, -1)), ("z", (-1, 0)), ("x", None)], canvas.RED, 96)
    picture.text((head[0] + 4, 90), "model frame", canvas.RED, 18, bold=True)
    picture.text((head[0] + 4, 114), "origin between the ears", canvas.RED, 16)

    picture.dot(middle, 6, canvas.PURPLE, rim=canvas.WHITE)
    picture.text((middle[0], axis + 28), "world origin", canvas.PURPLE, 17, bold=True)
    for start, end, row, text in ((eye[0], middle[0], 400, "viewMatrix: 500 mm"),
                                  (middle[0], head[0], 400, "modelMatrix")):
        picture.line([(start, row - 9), (start, row + 9)], canvas.PURPLE, 2)
        picture.line([(end, row - 9), (end, row + 9)], canvas.PURPLE, 2)
        picture.line([(start, row), (end, row)], canvas.PURPLE, 2)
        picture.text(((start + end) / 2, row + 20), text, canvas.PURPLE, 17, bold=True)
    picture.text((550, 462), "Seen from the side: all three x axes point to the reader, who stands "
                 "at image right.", canvas.GREY, 16)
    picture.save(folder / "frame_camera.png", colours=128)


def _front(picture, at, scale):
    points = face.points()[:101]

    def spot(point):
        return (at[0] + point[0] * scale, at[1] - point[1] * scale)

    crown = [(78, 70), (60, 112), (0, 134), (-60, 112), (-78, 70)]
    head = face.curve([spot(p) for p in list(points[face.OUTLINE]) + crown], closed=True)
    picture.polygon(head, SKIN, LINE, 2)
    for ring in face.EYES:
        picture.polygon(face.curve([spot(points[k]) for k in ring], closed=True), canvas.WHITE,
                        LINE, 1.5)
    for pupil in face.PUPILS:
        picture.dot(spot(points[pupil]), 5 * scale, canvas.INK)
    for ring in face.BROWS:
        picture.line(face.curve([spot(points[k]) for k in ring[:6]]), LINE, 3)
    picture.line(face.curve([spot(points[k]) for k in face.NOSE[3:9]]), LINE, 2)
    picture.line(face.curve([spot(points[k]) for k in (75, 87, 88, 89, 90, 91, 81)]), LINE, 2)


def draw_head(folder):
    scale = 0.95
    picture = canvas.Canvas(1100, 400)
    y = 178
    front, side, file = np.array([170.0, y]), np.array([560.0, y]), np.array([930.0, y])
    _front(picture, front, scale)
    _axes(picture, tuple(front), [("x", (1, 0)), ("y", (0, -1)), ("z", None)], canvas.RED, 100)
    _draw_head(picture, side, scale)
    _axes(picture, tuple(side), [("y", (0, -1)), ("z", (-1, 0)), ("x", None)], canvas.RED, 150)
    _draw_head(picture, file, scale, TILT)
    _axes(picture, tuple(file), [("y", (0, -1)), ("z", (-1, 0)), ("x", None)], canvas.ORANGE, 150)
    # Where the head's own axes lie in the file's frame.
    for z, up in ((0, 160), (160, 0)):
        turned = _turned(z, up, TILT)
        picture.dashed(tuple(file), (file[0] - turned[0], file[1] - turned[1]), canvas.RED, 2)
    picture.arc(tuple(file), 128, 180, 180 + TILT, canvas.INK, 2)
    picture.text((file[0] - 164, file[1] - 28), "20°", canvas.INK, 18, bold=True, halo=canvas.WHITE)
    for at, title, below in (
            (front, "from the front", "x to image right"),
            (side, "upright head frame", "modelMatrix and landmarks3D, rigid mode"),
            (file, "frame of the model file", "mask mode, meshes, the core's poses")):
        picture.text((at[0], 342), title, canvas.INK, 19, bold=True)
        picture.text((at[0], 370), below, canvas.GREY, 16)
    picture.save(folder / "frame_head.png", colours=128)
