#!/usr/bin/env bash
# Builds and runs firmwares against a Cortex-M build of the library, on the emulated board of
# that build's core: MPS2-AN386 for a Cortex-M4, MPS3-AN547 for a Cortex-M55.
#   tests/mcu/firmware.sh build BUILD_DIR OUT.elf SOURCE... [FLAG...]
#       compiles the sources with the build's own CPU flags and links them with the board's
#       start-up, BUILD_DIR's libkel_images.a and libkel_images_outside.a, and newlib's
#       semihosting
#   tests/mcu/firmware.sh run BUILD_DIR ELF [QEMU FLAG...]
#       runs the firmware; its output and exit status come back through semihosting. It is
#       stopped after KEL_QEMU_SECONDS (default 120) seconds.
set -euo pipefail
here=$(cd "$(dirname "$0")" && pwd)
command=$1 build=$2
shift 2

# The build's compiler flags name its core, which names the board.
read -r -a cpu_flags < <(sed -n 's/^CMAKE_CXX_FLAGS:STRING=//p' "$build/CMakeCache.txt")
case " ${cpu_flags[*]} " in
  *" -mcpu=cortex-m4 "*) board=mps2-an386 ;;
  *" -mcpu=cortex-m55 "*) board=mps3-an547 ;;
  *) echo "no emulated board for the flags of $build: ${cpu_flags[*]}" >&2; exit 2 ;;
esac

case $command in
  build)
    out=$1
    shift
    c_flags=()
    for flag in "${cpu_flags[@]}"; do [[ $flag == -fno-* ]] || c_flags+=("$flag"); done
    mkdir -p "$(dirname "$out")"
    arm-none-eabi-gcc "${c_flags[@]}" -Os -Wall -Wextra -Werror --specs=rdimon.specs \
      -c "$here/startup.c" -o "$out.startup.o"
    arm-none-eabi-g++ "${cpu_flags[@]}" --specs=rdimon.specs -nostartfiles -Wall -Wextra \
      -Wconversion -Wshadow -Werror "$@" "$out.startup.o" "$build/libkel_images.a" "$build/libkel_images_outside.a" \
      -L"$here" -T "$here/$board.ld" -o "$out"
    ;;
  run)
    elf=$1
    shift
    # Every firmware here ends in seconds. A fault that makes one spin must not leave the
    # emulator running after the test that started it was killed, so it has its own limit.
    exec timeout "${KEL_QEMU_SECONDS:-120}" qemu-system-arm -M "$board" -nographic -monitor none -serial none \
      -semihosting-config enable=on,target=native "$@" -kernel "$elf"
    ;;
  *)
    echo "usage: $0 build|run BUILD_DIR ..." >&2
    exit 2
    ;;
esac
