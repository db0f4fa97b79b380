#!/usr/bin/env python3
"""Turns every picture of a folder and measures it, one Dask task per picture.

    dask_pictures.py IN_DIR OUT_DIR [--angle 32] [--scheduler tcp://HOST:8786]

Reads the binary PGM pictures (P5) of IN_DIR, writes each one rotated by ANGLE/256 of a turn,
with its standard deviation written in its corner, to OUT_DIR under the same name, and prints
one line per picture: name, size, mean and deviation (the true figures, not the library's
32-bit ones). A picture that cannot be read or written is named on stderr and the others go on;
the exit status is 1 if any failed. Each output appears whole or not at all: it is written
beside its place under a temporary name and renamed over it. Without --scheduler the tasks run
on a pool of threads in this process (the module releases the GIL, so they use every core);
with it the same tasks go to the Dask cluster at that address, whose workers must see both
folders.
"""

import argparse
import os
import secrets
import sys
from pathlib import Path

import dask.bag
import numpy as np

import kel_images


def read_pgm(path):
    """The pixels of a binary PGM as a 2-D uint8 array, scaled to 0..255 from the file's maxval."""
    data = Path(path).read_bytes()
    fields, position = [], 0
    while len(fields) < 4:  # magic, width, height, maxval, with comments between them
        while data[position:position + 1].isspace():
            position += 1
        if data[position:position + 1] == b"#":
            position = data.find(b"\n", position)
            if position < 0:
                break
            continue
        end = position
        while end < len(data) and not data[end:end + 1].isspace():
            end += 1
        if end == position:
            break
        fields.append(data[position:end])
        position = end
    if not fields or fields[0] != b"P5":
        raise ValueError("not a binary PGM (P5)")
    if len(fields) < 4 or position == len(data) or not all(f.isdigit() for f in fields[1:]):
        raise ValueError("the PGM header is cut short or not three whole numbers")
    width, height, maxval = (int(f) for f in fields[1:])
    if not 0 < maxval < 65536:
        raise ValueError(f"maxval {maxval} is outside 1..65535")
    sample = np.dtype(">u2" if maxval > 255 else np.uint8)
    needed, held = width * height * sample.itemsize, len(data) - position - 1
    if held < needed:
        raise ValueError(f"cut short: {width} x {height} pixels need {needed} bytes, "
                         f"the file holds {held}")
    samples = np.frombuffer(data, sample, width * height, position + 1).reshape(height, width)
    if maxval == 255:
        return samples
    if samples.size and samples.max() > maxval:
        raise ValueError(f"a sample of {samples.max()} is above the file's maxval {maxval}")
    return ((samples.astype(np.uint32) * 255 + maxval // 2) // maxval).astype(np.uint8)


def write_pgm(path, pixels):
    """Writes an 8-bit binary PGM whole or not at all, through a temporary file beside it."""
    path = Path(path)
    header = f"P5\n{pixels.shape[1]} {pixels.shape[0]}\n255\n".encode()
    temporary = path.with_name(f".{secrets.token_hex(8)}.pgm-part")
    # Created like any new file (0666 less the umask); renamed over the output only when whole.
    descriptor = os.open(temporary, os.O_WRONLY | os.O_CREAT | os.O_EXCL, 0o666)
    try:
        with os.fdopen(descriptor, "wb") as file:
            file.write(header)
            file.write(np.ascontiguousarray(pixels).tobytes())
        os.replace(temporary, path)
    except BaseException:
        temporary.unlink(missing_ok=True)
        raise


def process(path, out_dir, angle):
    """One task: read, measure, rotate, label, write. Returns (name, summary line, error), one of
    the last two None, so that one bad picture does not stop the others."""
    name = Path(path).name
    try:
        picture = read_pgm(path)
        deviation, mean = kel_images.std(picture, exact=True)
        canvas, _ = kel_images.rotate(picture, angle)
        if picture.size:
            kel_images.draw_number(canvas, round(deviation), 1, 2, 2, 0)
        write_pgm(Path(out_dir) / name, canvas)
    except Exception as error:  # reported with the picture's name, after the others are done
        reason = str(error) if isinstance(error, (ValueError, OSError)) else repr(error)
        return name, None, reason
    height, width = picture.shape
    return name, f"{name} {width}x{height} mean {mean:.2f} std {deviation:.2f}", None


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
            results = tasks.compute()
    else:
        results = tasks.compute(scheduler="threads")
    failed = 0
    for name, line, error in results:
        if error is None:
            print(line)
        else:
            failed += 1
            print(f"{name}: {error}", file=sys.stderr)
    print(f"{len(results) - failed} of {len(results)} pictures written to {args.out_dir}"
          + (f"; {failed} failed" if failed else ""))
    return 1 if failed else 0


if __name__ == "__main__":
    sys.exit(main())
