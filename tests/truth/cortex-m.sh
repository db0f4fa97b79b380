#!/usr/bin/env bash
# Runs the truth table on a Cortex-M: the runner, built against a Cortex-M preset's libraries
# with newlib's semihosting, on that core's emulated board (tests/mcu/firmware.sh).
# Semihosting carries the runner's output and its exit status back to this shell.
#   tests/truth/cortex-m.sh [cortex-m4|cortex-m55]
set -euo pipefail
cd "$(dirname "$0")/../.."
preset=${1:-cortex-m4}
cmake --preset "$preset" >/dev/null
cmake --build --preset "$preset" >/dev/null || cmake --build --preset "$preset"  # errors shown
out=build/$preset/truth
mkdir -p "$out"
cmake -DIN=tests/truth/truth.txt -DOUT="$out/truth_table.inc" -P tests/truth/embed.cmake
tests/mcu/firmware.sh build "build/$preset" "$out/truth.elf" -Os -Iinclude -Isrc/outside -I"$out" \
  tests/truth/truth.cpp
tests/mcu/firmware.sh run "build/$preset" "$out/truth.elf"
