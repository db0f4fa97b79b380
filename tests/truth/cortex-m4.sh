#!/usr/bin/env bash
# Runs the truth table on a Cortex-M4: the runner, built against the cortex-m4 preset's
# libraries with newlib's semihosting, on an emulated MPS2-AN386 board. Semihosting carries the
# runner's output and its exit status back to this shell.
set -euo pipefail
cd "$(dirname "$0")/../.."
cmake --preset cortex-m4 >/dev/null
cmake --build --preset cortex-m4 >/dev/null
out=build/cortex-m4/truth
mkdir -p "$out"
cmake -DIN=tests/truth/truth.txt -DOUT="$out/truth_table.inc" -P tests/truth/embed.cmake
flags=(-mcpu=cortex-m4 -mthumb -Os --specs=rdimon.specs -Wall -Wextra -Werror)
arm-none-eabi-gcc "${flags[@]}" -c tests/truth/cortex-m4/vectors.c -o "$out/vectors.o"
arm-none-eabi-g++ "${flags[@]}" -fno-exceptions -fno-rtti -Iinclude -Isrc/outside -I"$out" \
  tests/truth/truth.cpp "$out/vectors.o" build/cortex-m4/libkel_images.a \
  build/cortex-m4/libkel_images_outside.a -T tests/truth/cortex-m4/board.ld -o "$out/truth.elf"
timeout 900 qemu-system-arm -M mps2-an386 -nographic -monitor none -serial none \
  -semihosting-config enable=on,target=native -kernel "$out/truth.elf"
