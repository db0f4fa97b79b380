#!/usr/bin/env python3
"""Counts the instructions every routine takes on an emulated Cortex-M4 and Cortex-M55.

    bench/mcu/count.py                  build both presets, count, print the table
    bench/mcu/count.py --check          also run each count twice, and fail when the two runs
                                        differ or a case takes more than its budget (CI)
    bench/mcu/count.py --write-budgets  write the counts, rounded up, as bench/mcu/budgets.txt
    bench/mcu/count.py --readme         rewrite the README's table, beside bench/mcu/before.txt
    bench/mcu/count.py --raw BUILD_DIR  print one build's counts as before.txt holds them

The firmware (count.cpp) runs every routine on fixed inputs under qemu-system-arm -icount
shift=0, where one instruction is one nanosecond of virtual time, so the counts are exact and
the same on every run. The cortex-m4 preset (MinSizeRel) is the build users ship; the cortex-m55
preset is the same build with Helium on.
"""
import argparse
import math
import os
import subprocess
import sys

ROOT = os.path.dirname(os.path.dirname(os.path.dirname(os.path.abspath(__file__))))
HERE = os.path.join(ROOT, "bench", "mcu")
BUDGETS = os.path.join(HERE, "budgets.txt")
BEFORE = os.path.join(HERE, "before.txt")
PRESETS = ("cortex-m4", "cortex-m55")
README = os.path.join(ROOT, "README.md")
README_BEGIN = "<!-- instruction counts: bench/mcu/count.py --readme -->"
README_END = "<!-- end of instruction counts -->"

# case: what the README calls it, and the targets (instructions per unit) on each core.
CASES = {
    "histogram": ("`kel_image_histogram`", 4.5, 4.5),
    "histogram_n/4": ("`kel_image_histogram_n`, 4 bits", 4.5, 4.5),
    "var": ("`kel_image_var`", 2.5, 1.5),
    "std": ("`kel_image_std`", 2.5, 1.5),
    "brighten/37": ("`kel_image_brighten`, 37 %", 4, 1),
    "darken/37": ("`kel_image_darken`, 37 %", 4, 1),
    "get_mask": ("`kel_get_mask`", 2, 0.5),
    "paste/no-key": ("`kel_image_draw_image`, key 256", 0.8, 0.6),
    "paste/key-20": ("`kel_image_draw_image`, key hitting 20 %", 2.5, 1),
    "blend/no-key": ("`kel_image_blend_image`, key 256", 2, 1),
    "blend/key-20": ("`kel_image_blend_image`, key hitting 20 %", 3, 1.2),
    "mask_image/5": ("`kel_mask_image`, 5 % hole", 35, 20),
    "rotate": ("`kel_image_rotate`, per canvas pixel", 18, "M4"),
    "rotate_int8": ("`kel_image_rotate_int8`, per canvas pixel", 18, "M4"),
    "rotate_int8_nn": ("`kel_image_rotate_int8_nn`, per canvas pixel", 8, "M4"),
    "line": ("`kel_image_draw_line`, per pixel written", 8, None),
    "triangle": ("`kel_image_draw_triangle`, per pixel written", 8, None),
    "rectangle": ("`kel_image_draw_rectangle`, per pixel written", 8, None),
    "circle": ("`kel_image_draw_circle`, per pixel written", 8, None),
    "number": ("`kel_image_draw_number`, per pixel written", 25, None),
}


def run(*command, **kwargs):
    return subprocess.run(command, check=True, capture_output=True, text=True, cwd=ROOT,
                          **kwargs).stdout


def firmware(build):
    """Builds the counting firmware against a build directory's libraries."""
    elf = os.path.join(build, "count.elf")
    run(os.path.join(ROOT, "tests", "mcu", "firmware.sh"), "build", build, elf, "-O2",
        "-I" + os.path.join(ROOT, "include"), os.path.join(HERE, "count.cpp"))
    return elf


def counts_of(build, elf):
    """{case: (instructions, units)} from one run of the firmware."""
    out = subprocess.run([os.path.join(ROOT, "tests", "mcu", "firmware.sh"), "run", build, elf,
                          "-icount", "shift=0"], capture_output=True, text=True, cwd=ROOT)
    if out.returncode != 0:
        sys.exit(f"{elf}: exit status {out.returncode}\n{out.stdout}{out.stderr}")
    counts = {}
    for line in out.stdout.splitlines():
        word, case, instructions, units = line.split()
        assert word == "count" and case in CASES, line
        counts[case] = (int(instructions), int(units))
    return counts, out.stdout


def per_unit(count):
    return count[0] / count[1]


def read_budgets():
    budgets = {}
    with open(BUDGETS) as f:
        for line in f:
            if line.strip() and not line.startswith("#"):
                case, *values = line.split()
                budgets[case] = dict(zip(PRESETS, map(float, values)))
    return budgets


def write_budgets(counts):
    with open(BUDGETS, "w") as f:
        f.write("# The instructions per unit (pixel, canvas pixel, pixel written) each case of\n"
                "# bench/mcu/count.cpp may take; bench/mcu/count.py --check fails CI above them.\n"
                "# Written by bench/mcu/count.py --write-budgets: the counts rounded up.\n")
        f.write(f"# {'case':16}" + "".join(f"{p:>12}" for p in PRESETS) + "\n")
        for case in CASES:
            values = (math.ceil(per_unit(counts[p][case]) * 100 - 1e-9) / 100 for p in PRESETS)
            f.write(f"{case:18}" + "".join(f"{v:12.2f}" for v in values) + "\n")


def read_before():
    before = {p: {} for p in PRESETS}
    with open(BEFORE) as f:
        for line in f:
            if line.strip() and not line.startswith("#"):
                preset, _, case, instructions, units = line.split()
                before[preset][case] = (int(instructions), int(units))
    return before


def target_text(target):
    if target is None:
        return "—"
    if target == "M4":
        return "≤ its M4 figure"
    return f"≤ {target:g}"


def readme_table(counts):
    before = read_before()
    rows = ["| routine (instructions per pixel) | M4 before | M4 now | M4 target | M55 before "
            "| M55 now | M55 target |", "|---|---|---|---|---|---|---|"]
    for case, (label, m4_target, m55_target) in CASES.items():
        cells = [label]
        for preset, target in zip(PRESETS, (m4_target, m55_target)):
            cells += [f"{per_unit(before[preset][case]):.2f}", f"{per_unit(counts[preset][case]):.2f}",
                      target_text(target)]
        rows.append("| " + " | ".join(cells) + " |")
    return "\n".join(rows)


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("--check", action="store_true")
    parser.add_argument("--write-budgets", action="store_true")
    parser.add_argument("--readme", action="store_true")
    parser.add_argument("--raw", metavar="BUILD_DIR", nargs="+")
    args = parser.parse_args()

    if args.raw:
        for build in args.raw:
            preset = os.path.basename(os.path.normpath(build))
            _, text = counts_of(build, firmware(build))
            sys.stdout.write("".join(f"{preset} {line}\n" for line in text.splitlines()))
        return 0

    counts = {}
    failures = []
    for preset in PRESETS:
        run("cmake", "--preset", preset)
        run("cmake", "--build", "--preset", preset)
        build = os.path.join(ROOT, "build", preset)
        elf = firmware(build)
        counts[preset], text = counts_of(build, elf)
        if args.check and counts_of(build, elf)[1] != text:
            failures.append(f"{preset}: two runs of the same firmware counted differently")

    if args.write_budgets:
        write_budgets(counts)
    if args.readme:
        with open(README) as f:
            text = f.read()
        begin, end = text.index(README_BEGIN) + len(README_BEGIN), text.index(README_END)
        with open(README, "w") as f:
            f.write(text[:begin] + "\n" + readme_table(counts) + "\n" + text[end:])
        print(readme_table(counts))
        return 0

    budgets = read_budgets()
    print(f"{'instructions per unit':44}" + "".join(f"{p:>12} {'budget':>7}" for p in PRESETS))
    for case, (label, *_) in CASES.items():
        line = f"{label.replace('`', ''):44}"
        for preset in PRESETS:
            value, budget = per_unit(counts[preset][case]), budgets.get(case, {}).get(preset)
            line += f"{value:12.2f} " + (f"{budget:7.2f}" if budget is not None else f"{'-':>7}")
            if budget is None or value > budget:
                failures.append(f"{preset} {case}: {value:.4f} instructions per unit, budget "
                                f"{budget}")
        print(line)
    if args.check and failures:
        print("\nover budget:\n  " + "\n  ".join(failures))
        return 1
    if args.check:
        print("\nevery count within its budget, and the same on a second run")
    return 0


if __name__ == "__main__":
    sys.exit(main())
