#!/usr/bin/env python3
"""Turns every picture of a folder and measures it, one Dask task per picture.

    dask_pictures.py IN_DIR OUT_DIR [--angle 32] [--scheduler tcp://HOST:8786]

Reads the binary PGM pictures (P5, 8-bit) of IN_DIR, writes each one rotated by ANGLE/256 of a
turn, with its standard deviation written in its corner, to OUT_DIR under the same name, and
prints one line per picture: name, size, mean and deviation. Without --scheduler the tasks run
on a pool of threads in this process (the module releases the GIL, so they use every core); with
it the same tasks go to the Dask cluster at that address, whose workers must see both folders.
"""

import argparse
import sys
from pathlib import Path

import dask.bag
import numpy as np

import kel_images


def read_pgm(path):
    """The pixels of a binary 8-bit PGM as a 2-D uint8 array."""
    data = Path(path).read_bytes()
    fields, position = [], 0
    while len(fields) < 4:  # magic, width, height, maxval, with comments between them
        while data[position:position + 1].isspace():
            position += 1
        if data[position:position + 1] == b"#":
            position = data.index(b"\n", position)
            continue
        end = position
        while end < len(data) and not data[end:end + 1].isspace():
            end += 1
        fields.append(data[position:end])
        position = end
    if fields[0] != b"P5" or int(fields[3]) > 255:
        raise ValueError(f"{path}: not a binary 8-bit PGM")
    width, height = int(fields[1]), int(fields[2])
    pixels = np.frombuffer(data, np.uint8, width * height, position + 1)
    return pixels.reshape(height, width)


def write_pgm(path, pixels):
    header = f"P5\n{pixels.shape[1]} {pixels.shape[0]}\n255\n".encode()
    Path(path).write_bytes(header + np.ascontiguousarray(pixels).tobytes())


def process(path, out_dir, angle):
    """One task: read, measure, rotate, label, write; returns the picture's summary line."""
    picture = read_pgm(path)
    deviation, mean = kel_images.std(picture)
    canvas, _ = kel_images.rotate(picture, angle)
    kel_images.draw_number(canvas, deviation, 1, 2, 2, 0)
    write_pgm(Path(out_dir) / Path(path).name, canvas)
    return f"{Path(path).name} {picture.shape[1]}x{picture.shape[0]} mean {mean} std {deviation}"


def main(argv=None):
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("in_dir")
    parser.add_argument("out_dir")
    parser.add_argument("--angle", type=int, default=32, help="0..255, 256 to the full turn")
    parser.add_argument("--scheduler", help="address of a Dask scheduler (default: local threads)")
    args = parser.parse_args(argv)

    files = sorted(str(p) for p in Path(args.in_dir).glob("*.pgm"))
    Path(args.out_dir).mkdir(parents=True, exist_ok=True)
    tasks = dask.bag.from_sequence(files, npartitions=max(1, len(files))).map(
        process, args.out_dir, args.angle)
    if args.scheduler:
        from dask.distributed import Client
        with Client(args.scheduler):
            lines = tasks.compute()
    else:
        lines = tasks.compute(scheduler="threads")
    print("\n".join(lines))
    return 0


if __name__ == "__main__":
    sys.exit(main())
