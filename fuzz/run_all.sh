#!/usr/bin/env bash
# Builds the fuzz preset (if needed) and runs every libFuzzer target for SECONDS seconds each,
# starting from its seed corpus in fuzz/corpus/<target>. Fails when any target finds a crash, a
# sanitizer report, a leak or a timeout; the input that caused it is kept in
# build/fuzz/artifacts/<target>/, and KEL_FUZZ_TRACE=1 <target> <file> prints its calls.
#   fuzz/run_all.sh 20                 every target, 20 s each
#   fuzz/run_all.sh 600 fuzz_rotation  the named targets only
set -euo pipefail
cd "$(dirname "$0")/.."

seconds=${1:?usage: fuzz/run_all.sh SECONDS [TARGET...]}
shift
targets=("$@")
if ((${#targets[@]} == 0)); then
  targets=(fuzz_image_buffers fuzz_statistics fuzz_rotation fuzz_pixel_ops fuzz_drawing)
fi

cmake --preset fuzz >/dev/null
cmake --build --preset fuzz

export ASAN_OPTIONS=${ASAN_OPTIONS:-detect_leaks=1:abort_on_error=1}
export UBSAN_OPTIONS=${UBSAN_OPTIONS:-print_stacktrace=1:halt_on_error=1}

failed=()
for target in "${targets[@]}"; do
  work=build/fuzz/corpus-work/$target
  artifacts=build/fuzz/artifacts/$target/
  mkdir -p "$work" "$artifacts"
  printf '\n--- %s: %s s\n' "$target" "$seconds"
  # New inputs go to the work corpus; the checked-in seeds are only read.
  if build/fuzz/fuzz/"$target" -max_total_time="$seconds" -timeout=10 -rss_limit_mb=2048 \
       -print_final_stats=1 -artifact_prefix="$artifacts" "$work" "fuzz/corpus/$target" \
       >"build/fuzz/$target.log" 2>&1; then
    grep -E '^stat::number_of_executed_units|^Done' "build/fuzz/$target.log" || true
  else
    failed+=("$target")
    tail -n 60 "build/fuzz/$target.log"
    ls "$artifacts"
  fi
done

if ((${#failed[@]})); then
  echo "fuzzing found problems in: ${failed[*]}"
  exit 1
fi
echo "fuzzing: every target ran ${seconds} s without a finding"
