"""The Dask example on a few generated pictures, with the local scheduler."""

import importlib.util
import os
from pathlib import Path

import numpy as np
import pytest

import kel_images as k

pytest.importorskip("dask.bag")

SCRIPT = Path(__file__).resolve().parents[2] / "examples" / "dask_pictures.py"
spec = importlib.util.spec_from_file_location("dask_pictures", SCRIPT)
example = importlib.util.module_from_spec(spec)
spec.loader.exec_module(example)


def pictures(folder, count):
    made = {f"p{i}.pgm": np.random.default_rng(i).integers(0, 256, (30 + i, 50), np.uint8)
            for i in range(count)}
    for name, pixels in made.items():
        example.write_pgm(folder / name, pixels)
    return made


def test_every_picture_is_turned_labelled_and_summarised(tmp_path, capsys):
    made = pictures(tmp_path, 3)
    # An output that is a hard link to another file is replaced, not written through.
    (tmp_path / "out").mkdir()
    (tmp_path / "keep.txt").write_bytes(b"kept")
    os.link(tmp_path / "keep.txt", tmp_path / "out" / "p1.pgm")

    assert example.main([str(tmp_path), str(tmp_path / "out"), "--angle", "20"]) == 0

    lines = capsys.readouterr().out.split("\n")
    for line, (name, pixels) in zip(lines, sorted(made.items())):
        assert line == f"{name} 50x{pixels.shape[0]} mean {pixels.mean():.2f} std {pixels.std():.2f}"
        expected, _ = k.rotate(pixels, 20)
        k.draw_number(expected, round(pixels.std()), 1, 2, 2, 0)
        np.testing.assert_array_equal(example.read_pgm(tmp_path / "out" / name), expected)
    assert lines[3] == f"3 of 3 pictures written to {tmp_path / 'out'}"
    assert (tmp_path / "keep.txt").read_bytes() == b"kept"


def test_a_bad_picture_is_named_and_the_others_are_done(tmp_path, capsys):
    pictures(tmp_path, 4)
    (tmp_path / "p2.pgm").write_bytes((tmp_path / "p2.pgm").read_bytes()[:-7])
    (tmp_path / "p3.pgm").write_bytes(b"P6 1 1 255\n...")

    assert example.main([str(tmp_path), str(tmp_path / "out")]) == 1

    captured = capsys.readouterr()
    assert captured.err.splitlines() == [
        "p2.pgm: cut short: 50 x 32 pixels need 1600 bytes, the file holds 1593",
        "p3.pgm: not a binary PGM (P5)"]
    assert captured.out.splitlines()[-1].endswith("2 of 4 pictures written to "
                                                  f"{tmp_path / 'out'}; 2 failed")
    assert sorted(os.listdir(tmp_path / "out")) == ["p0.pgm", "p1.pgm"]


@pytest.mark.parametrize("header, samples, expected", [
    (b"P5 4 1 15\n", bytes([0, 5, 10, 15]), [0, 85, 170, 255]),
    (b"P5\n# twelve bits\n3 1\n4095\n", bytes([0, 0, 8, 0, 15, 255]), [0, 128, 255]),
])
def test_samples_are_scaled_from_maxval(tmp_path, header, samples, expected):
    (tmp_path / "a.pgm").write_bytes(header + samples)
    assert example.read_pgm(tmp_path / "a.pgm").tolist() == [expected]
