#!/usr/bin/env python3
"""Prints the Cortex-M4 build's code and stack table and fails when a budget is passed.

    .ci/arm_budget.py [build/cortex-m4]

One row per exported function: its own .text bytes, the .text of everything of ours it reaches
(what a firmware linked with --gc-sections carries for it alone, the C library aside), and its
worst stack depth, its frame plus the deepest chain of our functions below it, the outside
library included. Frames and call edges come from GCC's -fcallgraph-info=su (KEL_STACK_REPORT,
on in the cortex-m4 preset); the C library's frames (malloc, memset, ...) are not counted.

Budgets: library .text, no .data or .bss, no call to a 64-bit division helper, and every
exported function's stack. Last, it links .ci/line_firmware.c, which calls only the line drawing,
with --gc-sections, prints its size and fails if any other routine of ours came along.
"""
import glob
import os
import re
import subprocess
import sys

TEXT_BUDGET = {"kel_images": 9216, "kel_images_outside": 2048}
STACK_BUDGET = 1024
# libgcc's 64-bit division and modulo: several hundred bytes each on a Cortex-M.
WIDE_DIVISION = {"__aeabi_ldivmod", "__aeabi_uldivmod", "__divdi3", "__udivdi3", "__moddi3",
                 "__umoddi3", "__divmoddi4", "__udivmoddi4"}
# Relocations of a call; any other reference to a function takes its address.
CALLS = {"R_ARM_THM_CALL", "R_ARM_THM_JUMP24", "R_ARM_THM_JUMP19", "R_ARM_CALL", "R_ARM_JUMP24"}

NODE = re.compile(r'node: \{ title: "([^"]*)" label: "([^"]*)"')
EDGE = re.compile(r'edge: \{ sourcename: "([^"]*)" targetname: "([^"]*)"')
FRAME = re.compile(r"\\n(\d+) bytes \(([a-z,]+)\)")


def run(*command):
    return subprocess.run(command, check=True, capture_output=True, text=True).stdout


def link_line_firmware(build, exported):
    source = os.path.join(os.path.dirname(os.path.abspath(__file__)), "line_firmware.c")
    include = os.path.join(os.path.dirname(os.path.dirname(os.path.abspath(__file__))), "include")
    firmware = os.path.join(build, "line_firmware.elf")
    run("arm-none-eabi-gcc", "-mcpu=cortex-m4", "-mthumb", "-Os", "--specs=nosys.specs",
        "-Wl,--gc-sections", "-I", include, source, os.path.join(build, "libkel_images.a"),
        "-o", firmware)
    text, data, bss = (int(v) for v in run("arm-none-eabi-size", firmware).splitlines()[1].split()[:3])
    ours = {}
    for line in run("arm-none-eabi-nm", "-S", "-C", firmware).splitlines():
        parts = line.split(maxsplit=3)
        if len(parts) == 4 and parts[2] in "tT" and ("kel" in parts[3] or "anonymous" in parts[3]):
            ours[parts[3]] = int(parts[1], 16)
    print(f"\nline-only firmware (--gc-sections): text {text}, data {data}, bss {bss} (newlib's "
          f"start-up and a 3 KiB frame included); {sum(ours.values())} bytes of text in "
          f"{len(ours)} functions of ours")
    extra = sorted(name for name in exported if name in ours and name != "kel_image_draw_line")
    return [f"line-only firmware also carries {', '.join(extra)}"] if extra else []


def node_of(obj, title):
    """Global functions are one node by their name; a .ci file names local ones after their
    source file, and they are told apart by their object."""
    return (obj, title.rsplit(":", 1)[-1]) if ":" in title else title


def main():
    build = sys.argv[1] if len(sys.argv) > 1 else "build/cortex-m4"
    failures = []
    frames, edges, sizes, exported, called = {}, {}, {}, set(), set()
    # A call through a pointer may reach any function whose address its object takes: the tables
    # of row loops are built and called in one source file.
    indirect_callers, pointer_targets = [], {}

    for lib, budget in TEXT_BUDGET.items():
        archive = os.path.join(build, f"lib{lib}.a")
        total = run("arm-none-eabi-size", "-t", archive).splitlines()[-1].split()
        text, data, bss = (int(v) for v in total[:3])
        print(f"{lib}: text {text} (budget {budget}), data {data}, bss {bss}")
        if text > budget:
            failures.append(f"{lib}: text {text} > {budget}")
        if data or bss:
            failures.append(f"{lib}: data {data} + bss {bss}, none allowed")
        wide = set(run("arm-none-eabi-nm", "-u", archive).split()) & WIDE_DIVISION
        if wide:
            failures.append(f"{lib}: calls 64-bit division {', '.join(sorted(wide))}")

        for obj in glob.glob(os.path.join(build, "CMakeFiles", f"{lib}.dir", "**", "*.obj"),
                             recursive=True):
            graph = obj[: -len(".obj")] + ".ci"
            if not os.path.exists(graph):
                sys.exit(f"{graph} missing: configure with -DKEL_STACK_REPORT=ON")
            for line in run("arm-none-eabi-nm", "-S", "--defined-only", obj).splitlines():
                parts = line.split()
                if len(parts) == 4 and parts[2] in "tTW":
                    global_symbol = parts[2] != "t"
                    sizes[parts[3] if global_symbol else (obj, parts[3])] = int(parts[1], 16)
                    if parts[2] == "T" and re.match(r"^(kel_|tq_)", parts[3]):
                        exported.add(parts[3])
            with open(graph) as f:
                call_graph = f.read()
            for title, label in NODE.findall(call_graph):
                frame = FRAME.search(label)
                if frame is None:
                    continue  # declared only: defined in another object, or the C library's
                if frame.group(2) not in ("static", "dynamic,bounded"):
                    failures.append(f"{title}: stack of unbounded size")
                frames[node_of(obj, title)] = int(frame.group(1))
            for line in run("arm-none-eabi-objdump", "-r", obj).splitlines():
                parts = line.split()
                if len(parts) == 3 and parts[1].startswith("R_ARM_") and parts[1] not in CALLS:
                    name = parts[2].removeprefix(".text.")
                    pointer_targets.setdefault(obj, set()).add(
                        name if name in sizes else (obj, name))
            for source, target in EDGE.findall(call_graph):
                targets = edges.setdefault(node_of(obj, source), set())
                if target == "__indirect_call":
                    indirect_callers.append((obj, node_of(obj, source)))
                else:
                    targets.add(node_of(obj, target))
                    called.add(node_of(obj, target))

    # Calls through a pointer, to every function whose address the caller's object takes: more
    # than the code can reach, so a cycle through one of them is no recursion of the code's, and
    # such a cycle is cut where it closes (a rotation's run function, whose address its object
    # takes, calls its kernel through the table).
    indirect = {}
    for obj, caller in indirect_callers:
        indirect.setdefault(caller, set()).update(
            t for t in pointer_targets.get(obj, ()) if t in frames)
    depth, on_path = {}, set()

    def stack(node):
        if node in depth:
            return depth[node]
        on_path.add(node)
        below = 0
        for c in edges.get(node, ()):
            if c in on_path:
                failures.append(f"{node}: recursion")
            else:
                below = max(below, stack(c))
        for c in indirect.get(node, ()):
            if c not in on_path:
                below = max(below, stack(c))
        on_path.discard(node)
        depth[node] = frames.get(node, 0) + below
        return depth[node]

    def reach(node, seen):
        if node not in seen:
            seen.add(node)
            for c in edges.get(node, set()) | indirect.get(node, set()):
                reach(c, seen)

    print(f"\n{'function':34} {'text':>6} {'with callees':>13} {'stack':>6}")
    for name in sorted(set(exported)):
        seen = set()
        reach(name, seen)
        reached = sum(sizes.get(n, 0) for n in seen)
        used = stack(name)
        print(f"{name:34} {sizes.get(name, 0):6} {reached:13} {used:6}")
        if used > STACK_BUDGET:
            failures.append(f"{name}: stack {used} > {STACK_BUDGET}")
    libc = sorted(n for n in called if n not in frames)
    print(f"(stack of the C library's {', '.join(libc)} not counted)")

    failures += link_line_firmware(build, exported)
    if failures:
        print("\nover budget:\n  " + "\n  ".join(failures))
        return 1
    print("\nall budgets hold")
    return 0


if __name__ == "__main__":
    sys.exit(main())
