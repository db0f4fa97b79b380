"""The module against the library's known answers, and every bad argument it must refuse."""

import zlib

import numpy as np
import pytest

import kel_images as k

U8, I8 = np.uint8, np.int8
SOURCE = np.array([[0, 1, 2, 3], [10, 11, 12, 13], [20, 21, 22, 23]], U8)


def picture(rows, dtype=U8):
    """A picture from strings: '.' is 0, any other character 1."""
    return np.array([[c != "." for c in row] for row in rows.split()], dtype)


def drawn(draw, *args, size=(10, 10)):
    img = np.zeros(size, U8)
    draw(img, *args)
    return img


def composed(compose, dst, src, *args):
    dst = np.array(dst, U8)
    compose(dst, np.array(src, U8), *args)
    return dst.tolist()


def hist_of(values):
    return k.histogram(np.array([values], U8))


@pytest.mark.parametrize("result, expected", [
    (lambda: k.histogram_n(np.array([[15, 16, 255]], U8), 4).tolist(), [1, 1] + [0] * 13 + [1]),
    (lambda: k.histogram_n(np.array([[15, 16, 255]], U8), 0).tolist(), [3]),
    (lambda: k.var(np.array([[0, 2, 2]], U8)), (1, 1)),
    (lambda: k.std(np.array([[0, 255], [255, 0]], U8)), (127, 127)),
    (lambda: k.hist_mean(hist_of([255] * 4), 1), 252),
    (lambda: (k.hist_var(hist_of([0, 3]), 1, 2), k.hist_std(hist_of([0, 3]), 1, 2)), (2, 1)),
    (lambda: k.rotate(SOURCE, 64)[0][:3].tolist(),
     [[255, 255, 10, 0], [255, 255, 11, 1], [255, 255, 12, 2]]),
    (lambda: k.rotate(SOURCE.astype(I8), 128, True)[0][1:, 1:].tolist(),
     [[23, 22, 21, 20], [13, 12, 11, 10], [3, 2, 1, 0]]),
    (lambda: k.rotate(np.full((1, 1), -128, I8), 0, nearest=True)[0].tolist(),
     [[-127, -128], [-128, -128]]),
    (lambda: k.rotate(np.full((3, 3), -5, I8), 0)[0].tolist(),
     [[-5, -5, 0, 0], [-5, -5, 0, 0], [0] * 4, [0] * 4]),
    (lambda: k.brighten(np.array([[0, 1, 2, 99, 200, 254, 255]], U8), 50).tolist(),
     [[127, 128, 128, 177, 227, 254, 255]]),
    (lambda: k.darken(np.array([[255, 254, 200, 100, 99, 2, 1, 0]], U8), 50).tolist(),
     [[128, 127, 100, 50, 50, 1, 1, 0]]),
    (lambda: k.brighten(np.array([[0, 9]], U8), 2**32 - 1).tolist(), [[255, 255]]),
    (lambda: k.get_mask(np.array([[7, 0, 7, 255, 8]], U8), 7).tolist(), [[0, 1, 0, 1, 1]]),
    (lambda: k.get_mask(np.array([[7, 0]], U8), -1).tolist(), [[1, 1]]),
    (lambda: k.mask_image(SOURCE, np.ones((3, 4), U8)).tolist(), SOURCE.tolist()),
    (lambda: k.mask_image(SOURCE, np.zeros((3, 4), U8)).any(), False),
    (lambda: composed(k.draw_image, [[9] * 3] * 2, [[1, 2, 3, 4, 5]], -3, 1), [[9] * 3, [4, 5, 9]]),
    (lambda: composed(k.draw_image, [[9, 9, 9]], [[0, 5, 6]], 0, 0, 5), [[0, 9, 6]]),
    (lambda: composed(k.blend_image, [[2, 255, 255, 7]], [[1, 0, 255, 0]], 0, 0),
     [[1, 127, 255, 3]]),
    (lambda: composed(k.blend_image, [[2, 255]], [[1, 0]], 0, 0, 0), [[1, 255]]),
    (lambda: np.argwhere(drawn(k.draw_line, -5, -5, 20, 14, 1)).tolist(),
     [[0, 2], [1, 3], [1, 4], [2, 5], [3, 6], [4, 7], [4, 8], [5, 9]]),
    (lambda: drawn(k.draw_rectangle, 2, 3, 4, 3, 1, size=(6, 7)),
     picture("....... ....... ....... ..1111. ..1..1. ..1111.")),
    (lambda: drawn(k.draw_circle, 5, 0, 0, 1, size=(4, 4)), picture("..1. ..1. 11.. ....")),
    (lambda: drawn(k.draw_triangle, 1, 1, 8, 2, 4, 8, 7),
     drawn(k.draw_line, 1, 1, 8, 2, 7) | drawn(k.draw_line, 8, 2, 4, 8, 7)
     | drawn(k.draw_line, 4, 8, 1, 1, 7)),
    (lambda: drawn(k.draw_number, -7, 0, 0, 0, 9)[:4, :4], picture(".... .... .... .11.") * 9),
    (lambda: drawn(k.draw_number, 0, 0, 0, 0, 9).any(), False),
    (lambda: np.flatnonzero(drawn(k.set_pixel, 3, 4, 5)).tolist(), [34]),
])
def test_matches_the_library(result, expected):
    np.testing.assert_array_equal(result(), expected)


# Digests of the C library's own output for the same calls, made by a small C program.
RAMP = ((np.arange(27) * 7 + np.arange(20)[:, None] * 13) & 255).astype(U8)
HOLE = np.ones_like(RAMP)
HOLE[4:15, 5:19] = 0


def composited():
    dst = (np.arange(30 * 40) * 31).astype(U8).reshape(30, 40)
    k.blend_image(dst, RAMP, 20, -6, 13)
    k.draw_image(dst, RAMP, -9, 17)
    return dst, None


@pytest.mark.parametrize("result, shape, offsets, digest", [
    (lambda: (k.mask_image(RAMP, HOLE), None), (20, 27), None, 0xa5fd8e02),
    (lambda: k.rotate(RAMP, 20), (31, 33), (0, 9), 0x44882bb6),
    (lambda: k.rotate(RAMP.view(I8), 20), (31, 33), (0, 9), 0x150ed53c),
    (lambda: k.rotate(RAMP.view(I8), 200, nearest=True), (30, 25), (26, 0), 0xd8f76920),
    (composited, (30, 40), None, 0x1380b5be),
])
def test_matches_the_library_digests(result, shape, offsets, digest):
    pixels, where = result()
    assert (pixels.shape, where, zlib.crc32(pixels.tobytes())) == (shape, offsets, digest)


EMPTY = np.zeros((0, 5), U8)


@pytest.mark.parametrize("result, expected", [
    (lambda: k.histogram(EMPTY).sum(), 0),
    (lambda: k.var(EMPTY), (0, 0)),
    (lambda: k.rotate(np.zeros((0, 0), U8), 9)[0].tolist(), [[255]]),
    (lambda: k.brighten(EMPTY, 50).shape, (0, 5)),
    (lambda: k.mask_image(EMPTY, EMPTY).shape, (0, 5)),
    (lambda: drawn(k.draw_circle, 9, 0, 0, 1, size=(0, 5)).shape, (0, 5)),
    (lambda: composed(k.draw_image, [[1]], EMPTY, 0, 0), [[1]]),
])
def test_empty_pictures(result, expected):
    assert result() == expected


GOOD = np.zeros((4, 4), U8)
HIST = np.zeros(256, np.uint32)
READ_ONLY = GOOD.copy()
READ_ONLY.flags.writeable = False


@pytest.mark.parametrize("call, error, words", [
    (lambda: k.histogram([[1]]), TypeError, "numpy array"),
    (lambda: k.var(GOOD.astype(np.uint16)), TypeError, "dtype uint8"),
    (lambda: k.rotate(GOOD.astype(np.float32), 1), TypeError, "uint8 or int8"),
    (lambda: k.std(np.zeros(4, U8)), ValueError, "2-D"),
    (lambda: k.brighten(GOOD[:, ::2], 1), ValueError, "C-contiguous"),
    (lambda: k.draw_line(np.zeros((4, 4), U8)[None], 0, 0, 1, 1, 1), ValueError, "2-D"),
    (lambda: k.draw_circle(READ_ONLY, 3, 1, 1, 1), ValueError, "read-only"),
    (lambda: k.draw_image(GOOD.astype(I8), GOOD, 0, 0), TypeError, "dtype uint8"),
    (lambda: k.hist_mean(HIST[:255], 1), ValueError, "256 bins"),
    (lambda: k.hist_var(HIST.astype(np.int64), 0, 1), TypeError, "uint32"),
    (lambda: k.hist_std(HIST, 256, 1), ValueError, "mean"),
    (lambda: k.hist_mean(HIST, -1), ValueError, "count"),
    (lambda: k.histogram_n(GOOD, 9), ValueError, "bits"),
    (lambda: k.mask_image(GOOD, np.ones((4, 3), U8)), ValueError, "shape"),
    (lambda: k.blend_image(GOOD, np.zeros((1, 65536), U8), 0, 0), ValueError, "too large"),
    (lambda: k.rotate(GOOD, 256), ValueError, "angle"),
    (lambda: k.rotate(GOOD, 1, nearest=True), ValueError, "int8"),
    (lambda: k.brighten(GOOD, -1), ValueError, "percent"),
    (lambda: k.get_mask(GOOD, 2**31), ValueError, "key"),
    (lambda: k.draw_image(GOOD, GOOD, 0, 0, 65536), ValueError, "key"),
    (lambda: k.draw_line(GOOD, 0, 0, 2**31, 0, 1), ValueError, "x1"),
    (lambda: k.draw_triangle(GOOD, 0, 0, 1, 1, 2, 2, -1), ValueError, "colour"),
    (lambda: k.draw_rectangle(GOOD, 0, 0, -1, 1, 1), ValueError, "width"),
    (lambda: k.draw_number(GOOD, 1, 256, 0, 0, 1), ValueError, "min_digits"),
    (lambda: k.draw_circle(GOOD, 2**32, 0, 0, 1), ValueError, "diameter"),
    (lambda: k.set_pixel(GOOD, -1, 0, 1), ValueError, "y"),
    (lambda: k.set_pixel(GOOD, 0, 2**16, 1), ValueError, "x"),
])
def test_refuses_bad_arguments(call, error, words):
    with pytest.raises(error, match=words):
        call()
