"""The Dask example on a few generated pictures, with the local scheduler."""

import importlib.util
from pathlib import Path

import numpy as np
import pytest

import kel_images as k

pytest.importorskip("dask.bag")

SCRIPT = Path(__file__).resolve().parents[2] / "examples" / "dask_pictures.py"
spec = importlib.util.spec_from_file_location("dask_pictures", SCRIPT)
example = importlib.util.module_from_spec(spec)
spec.loader.exec_module(example)


def test_every_picture_is_turned_labelled_and_summarised(tmp_path, capsys):
    pictures = {f"p{i}.pgm": np.random.default_rng(i).integers(0, 256, (30 + i, 50), np.uint8)
                for i in range(3)}
    for name, pixels in pictures.items():
        example.write_pgm(tmp_path / name, pixels)

    assert example.main([str(tmp_path), str(tmp_path / "out"), "--angle", "20"]) == 0

    lines = capsys.readouterr().out.split("\n")
    for line, (name, pixels) in zip(lines, sorted(pictures.items())):
        deviation, mean = k.std(pixels)
        assert line == f"{name} 50x{pixels.shape[0]} mean {mean} std {deviation}"
        expected, _ = k.rotate(pixels, 20)
        k.draw_number(expected, deviation, 1, 2, 2, 0)
        np.testing.assert_array_equal(example.read_pgm(tmp_path / "out" / name), expected)
