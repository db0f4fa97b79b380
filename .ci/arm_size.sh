#!/usr/bin/env bash
# Prints the code and data size of every object of the Cortex-M4 build, per library, and the
# totals: text is flash code and constants, data and bss are RAM.
set -euo pipefail
build=${1:-build/cortex-m4}
for lib in kel_images kel_images_outside; do
  echo "$lib:"
  arm-none-eabi-size -t "$build/lib$lib.a" | sed 's/^/  /'
done
