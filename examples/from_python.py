#!/usr/bin/env python3
"""The README's Python example: draws, turns and measures a picture, and saves it as a PNG.

    from_python.py [OUT.png]    (default docs/python.png)
"""

import struct
import sys
import zlib

import numpy as np

import kel_images as k


def write_png(path, pixels):
    """A greyscale 8-bit PNG, every row unfiltered, from the standard library alone."""
    def chunk(kind, data):
        return (struct.pack(">I", len(data)) + kind + data
                + struct.pack(">I", zlib.crc32(kind + data)))
    height, width = pixels.shape
    rows = np.hstack([np.zeros((height, 1), np.uint8), pixels]).tobytes()
    with open(path, "wb") as out:
        out.write(b"\x89PNG\r\n\x1a\n" + chunk(b"IHDR", struct.pack(">IIBBBBB", width, height,
                                                                       8, 0, 0, 0, 0))
                  + chunk(b"IDAT", zlib.compress(rows, 9)) + chunk(b"IEND", b""))


picture = np.add.outer(np.arange(72), np.arange(96)).astype(np.uint8)  # a diagonal ramp
k.draw_rectangle(picture, 8, 8, 80, 56, 255)
k.draw_circle(picture, 31, 48, 36, 0)
k.draw_triangle(picture, 20, 56, 48, 14, 76, 56, 255)

canvas, (offset_y, offset_x) = k.rotate(picture, 24)  # 24/256 of a turn; new pixels are 255
k.draw_circle(canvas, 9, offset_x, offset_y, 0)  # where the picture's corner went
deviation, mean = k.std(picture)
k.draw_number(canvas, deviation, 1, 2, 2, 0)
write_png(sys.argv[1] if len(sys.argv) > 1 else "docs/python.png", canvas)
print(f"mean {mean}, deviation {deviation}, canvas {canvas.shape}, corner at {offset_y, offset_x}")
