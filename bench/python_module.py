#!/usr/bin/env python3
"""Times the kel_images Python module beside the C benchmark and cv2, in one run.

    PYTHONPATH=build/release/python python3 bench/python_module.py [build/release/bench/kel_bench]

Prints three tables:
- the module's time per call on a 64 x 64 picture and on an empty one (what the binding itself
  costs: argument checks, the output array, releasing the GIL);
- its time on 2048 x 1536 beside the C benchmark's (Google Benchmark, same routine, same size;
  the C benchmark is run between the module's batches, so that both see the same machine) and
  beside cv2 on one thread where cv2 has the same routine;
- one thread making 2N rotations against two threads making N each, and how many cores the
  two kept busy, and how far another Python thread gets during one long call.
Build both with the release preset first.
"""

import json
import os
import statistics
import subprocess
import sys
import threading
import time
from pathlib import Path

import numpy as np

import kel_images as k

try:
    import cv2
    cv2.setNumThreads(1)
except ImportError:
    cv2 = None

HEIGHT, WIDTH = 1536, 2048
BATCHES = 9


def seconds_per_call(call, batch_seconds=0.05):
    """The median over BATCHES of the time per call, each batch about batch_seconds long."""
    call()
    calls, took = 1, 0.0
    while took < batch_seconds / 4:
        calls *= 4
        start = time.perf_counter()
        for _ in range(calls):
            call()
        took = time.perf_counter() - start
    calls = max(1, int(calls * batch_seconds / took))
    times = []
    for _ in range(BATCHES):
        start = time.perf_counter()
        for _ in range(calls):
            call()
        times.append((time.perf_counter() - start) / calls)
    return statistics.median(times)


def c_seconds(kel_bench, case):
    """The C benchmark's median real time per call of the case named exactly `case`."""
    out = subprocess.run(
        [kel_bench, f"--benchmark_filter=^{case}$", "--benchmark_repetitions=5",
         "--benchmark_report_aggregates_only=true", "--benchmark_format=json",
         "--benchmark_min_time=0.1"], check=True, capture_output=True, text=True).stdout
    rows = [b for b in json.loads(out)["benchmarks"] if b.get("aggregate_name") == "median"]
    if not rows:
        sys.exit(f"no C benchmark named {case}")
    scale = {"ns": 1e-9, "us": 1e-6, "ms": 1e-3, "s": 1.0}[rows[0]["time_unit"]]
    return rows[0]["real_time"] * scale


def random_picture(height, width, seed=1):
    return np.random.default_rng(seed).integers(0, 256, (height, width), np.uint8)


def rotation_matrix(img, angle):
    """cv2's affine matrix and canvas for the turn kel_images makes, so both fill a like canvas."""
    canvas, (offset_y, offset_x) = k.rotate(img, angle)
    turn = angle * 360.0 / 256.0
    matrix = cv2.getRotationMatrix2D((0, 0), -turn, 1.0)
    matrix[:, 2] += (offset_x, offset_y)
    return matrix, (canvas.shape[1], canvas.shape[0])


def throughput_cases(img, signed, mask, small):
    """(name, module call, C benchmark case, cv2 call or None) on the 2048 x 1536 picture."""
    size = f"{HEIGHT}/{WIDTH}"
    cases = [
        ("histogram", lambda: k.histogram(img), f"BM_ImageHistogram/{size}",
         cv2 and (lambda: cv2.calcHist([img], [0], None, [256], [0, 256]))),
        ("histogram_n 4 bits", lambda: k.histogram_n(img, 4), f"BM_ImageHistogram4Bits/{size}",
         cv2 and (lambda: cv2.calcHist([img], [0], None, [16], [0, 256]))),
        ("std", lambda: k.std(img), f"BM_ImageStd/{size}", cv2 and (lambda: cv2.meanStdDev(img))),
        ("brighten 37", lambda: k.brighten(img, 37), f"BM_Brighten/{size}", None),
        ("get_mask 100", lambda: k.get_mask(img, 100), f"BM_GetMask/{size}", None),
        ("draw_image 400x300", lambda: k.draw_image(img, small, 37, 29),
         f"BM_Composite<kel_image_draw_image>/h:{HEIGHT}/w:{WIDTH}/key:256", None),
        ("mask_image 5 % hole", lambda: k.mask_image(img, mask), f"BM_MaskImage/{size}", None),
    ]
    for name, picture, routine, nearest, flags in [
            ("rotate 20", img, "Routine::kBilinear", False, "INTER_LINEAR"),
            ("rotate int8 20", signed, "Routine::kBilinearInt8", False, None),
            ("rotate int8 nearest 20", signed, "Routine::kNearestInt8", True, "INTER_NEAREST")]:
        theirs = None
        if cv2 and flags:
            matrix, canvas = rotation_matrix(img, 20)
            theirs = (lambda m=matrix, c=canvas, f=getattr(cv2, flags):
                      cv2.warpAffine(img, m, c, flags=f, borderValue=255))
        cases.append((name, lambda p=picture, n=nearest: k.rotate(p, 20, n),
                      f"BM_Rotate<{routine}>/height:{HEIGHT}/width:{WIDTH}/angle:20", theirs))
    return cases


def hole_mask():
    """About 5 % of the picture in five round holes, as the C benchmark's fill uses."""
    y, x = np.mgrid[:HEIGHT, :WIDTH]
    mask = np.ones((HEIGHT, WIDTH), np.uint8)
    radius2 = 0.01 * HEIGHT * WIDTH / np.pi
    for cx, cy in [(0.2, 0.3), (0.7, 0.2), (0.5, 0.55), (0.25, 0.8), (0.8, 0.75)]:
        mask[(x - cx * WIDTH) ** 2 + (y - cy * HEIGHT) ** 2 < radius2] = 0
    return mask


def threads_against_one(img, calls=24, rounds=5):
    """Median wall seconds for `calls` rotations on one thread and split over two, and the cores
    the two kept busy (process CPU time over wall time: at most 1 if the GIL were held)."""
    def work(n):
        for _ in range(n):
            k.rotate(img, 20)

    def on_threads(count):
        threads = [threading.Thread(target=work, args=(calls // count,)) for _ in range(count)]
        start, cpu = time.perf_counter(), time.process_time()
        for thread in threads:
            thread.start()
        for thread in threads:
            thread.join()
        wall = time.perf_counter() - start
        return wall, (time.process_time() - cpu) / wall

    runs = {1: [], 2: []}
    for _ in range(rounds):  # alternating, so that other work on the machine hits both alike
        for count in runs:
            runs[count].append(on_threads(count))
    one = statistics.median(wall for wall, _ in runs[1])
    two = statistics.median(wall for wall, _ in runs[2])
    return one, two, statistics.median(cores for _, cores in runs[2])


def progress_beside_a_call(call, alone_seconds=0.1):
    """How far a pure-Python counting thread gets during one long call, as a share of how far it
    gets alone in as long. A call that holds the GIL lets it run only at the interpreter's thread
    switches, every few milliseconds; one that releases it lets it run as far as the cores allow."""
    state = {"count": 0, "stop": False}

    def count():
        while not state["stop"]:
            state["count"] += 1

    counter = threading.Thread(target=count)
    counter.start()
    time.sleep(alone_seconds)  # the counter alone
    start, before = time.perf_counter(), state["count"]
    time.sleep(alone_seconds)
    alone_rate = (state["count"] - before) / (time.perf_counter() - start)
    start, before = time.perf_counter(), state["count"]
    call()
    during_rate = (state["count"] - before) / (time.perf_counter() - start)
    state["stop"] = True
    counter.join()
    return during_rate / alone_rate


def main():
    kel_bench = sys.argv[1] if len(sys.argv) > 1 else "build/release/bench/kel_bench"
    if not Path(kel_bench).exists():
        sys.exit(f"{kel_bench} not found: cmake --build --preset release --target kel_bench")

    tiny, empty = random_picture(64, 64), np.zeros((0, 0), np.uint8)
    print("| routine | 64 x 64, us per call | empty picture, us per call |\n|---|---|---|")
    for name, call in [("histogram", k.histogram), ("std", k.std),
                       ("brighten", lambda p: k.brighten(p, 37)),
                       ("rotate 20", lambda p: k.rotate(p, 20)),
                       ("draw_line", lambda p: k.draw_line(p, 1, 2, 60, 50, 7))]:
        print(f"| {name} | {seconds_per_call(lambda: call(tiny)) * 1e6:.2f} "
              f"| {seconds_per_call(lambda: call(empty)) * 1e6:.2f} |")

    img = random_picture(HEIGHT, WIDTH)
    signed, small = img.view(np.int8), random_picture(300, 400, 2)
    print("\n| routine, 2048 x 1536 | module, ms | C, ms | module / C | cv2, ms | cv2 / module |")
    print("|---|---|---|---|---|---|")
    for name, ours, case, theirs in throughput_cases(img, signed, hole_mask(), small):
        before = seconds_per_call(ours)
        c = c_seconds(kel_bench, case)
        module = (before + seconds_per_call(ours)) / 2  # the medians before and after the C run
        row = f"| {name} | {module * 1e3:.3f} | {c * 1e3:.3f} | {module / c:.3f} |"
        if theirs:
            other = seconds_per_call(theirs)
            row += f" {other * 1e3:.3f} | {other / module:.2f} |"
        else:
            row += " | |"
        print(row, flush=True)

    one, two, cores = threads_against_one(img)
    print(f"\nrotate 20 on 2048 x 1536, 24 calls: one thread {one:.3f} s, two threads {two:.3f} s "
          f"({one / two:.2f}x, {cores:.2f} cores busy); load average {os.getloadavg()[0]:.1f} "
          f"on {os.cpu_count()} cores")
    big = random_picture(4096, 4096)
    numbers = list(range(3_000_000))
    released = progress_beside_a_call(lambda: k.rotate(big, 20))
    held = progress_beside_a_call(lambda: sorted(numbers, reverse=True))
    print(f"another thread counted at {released:.2f} of its own pace during a rotate of "
          f"4096 x 4096, at {held:.2f} during a sorted() of a list, which holds the GIL")


if __name__ == "__main__":
    main()
