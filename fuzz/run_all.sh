#!/usr/bin/env bash
# Builds the fuzz preset (if needed) and runs the libFuzzer harness for SECONDS seconds, starting
# from its seed corpus in fuzz/corpus/fuzz_all. Fails on a crash, a failed model check, a
# sanitizer report, a leak or a timeout; the input that caused it is kept in
# build/fuzz/artifacts/, and KEL_FUZZ_TRACE=1 build/fuzz/fuzz/fuzz_all <file> prints its call.
#   fuzz/run_all.sh 20
set -euo pipefail
cd "$(dirname "$0")/.."

seconds=${1:?usage: fuzz/run_all.sh SECONDS}
cmake --preset fuzz >/dev/null
cmake --build --preset fuzz

export ASAN_OPTIONS=${ASAN_OPTIONS:-detect_leaks=1:abort_on_error=1}
export UBSAN_OPTIONS=${UBSAN_OPTIONS:-print_stacktrace=1:halt_on_error=1}

work=build/fuzz/corpus-work
artifacts=build/fuzz/artifacts/
mkdir -p "$work" "$artifacts"
# New inputs go to the work corpus; the checked-in seeds are only read.
if build/fuzz/fuzz/fuzz_all -max_total_time="$seconds" -timeout=10 -rss_limit_mb=2048 \
     -print_final_stats=1 -artifact_prefix="$artifacts" "$work" fuzz/corpus/fuzz_all \
     >build/fuzz/fuzz_all.log 2>&1; then
  grep -E '^stat::number_of_executed_units|^Done' build/fuzz/fuzz_all.log || true
  echo "fuzzing: ${seconds} s without a finding"
else
  tail -n 60 build/fuzz/fuzz_all.log
  ls "$artifacts"
  exit 1
fi
