#!/usr/bin/env bash
# Runs the kernel sweep (tests/kernel_sweep.cpp: every kernel of the build's table against its
# plain body) on a Cortex-M preset's emulated board, as tests/truth/cortex-m.sh runs the truth
# table: the DSP table on the Cortex-M4, the Helium one on the Cortex-M55.
#   tests/mcu/kernel_sweep.sh [cortex-m4|cortex-m55]
set -euo pipefail
cd "$(dirname "$0")/../.."
preset=${1:-cortex-m4}
cmake --preset "$preset" >/dev/null
cmake --build --preset "$preset" >/dev/null || cmake --build --preset "$preset"  # errors shown
tests/mcu/firmware.sh build "build/$preset" "build/$preset/kernel_sweep/kernel_sweep.elf" -Os \
  -Iinclude -Isrc -Isrc/outside tests/kernel_sweep.cpp
tests/mcu/firmware.sh run "build/$preset" "build/$preset/kernel_sweep/kernel_sweep.elf"
