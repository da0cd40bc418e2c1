#!/usr/bin/env bash
# Builds the libFuzzer targets with clang into build_fuzz and runs each for
# the given number of seconds (default 60), starting from its seed corpus in
# fuzz/corpus/<target>/. Fails on any crash, sanitizer report, leak, timeout
# or out-of-memory; the failing input is kept in build_fuzz/artifacts/.
# Usage: scripts/run_fuzzers.sh [seconds]
set -euo pipefail
top=$(cd "$(dirname "$0")/.." && pwd)
seconds=${1:-60}
build=${TLRX_FUZZ_BUILD_DIR:-$top/build_fuzz}

mkdir -p "$build"
if ! { CC=clang CXX=clang++ cmake -S "$top" -B "$build" -DTLRX_FUZZ=ON -DCMAKE_BUILD_TYPE=RelWithDebInfo &&
       cmake --build "$build" --target tlrx_fuzzers -j2; } >"$build/fuzz_build.log" 2>&1; then
  echo "FAILED: building the fuzz targets"
  tail -n 40 "$build/fuzz_build.log"
  exit 1
fi

export ASAN_OPTIONS=${ASAN_OPTIONS:-detect_leaks=1:abort_on_error=1}
export UBSAN_OPTIONS=${UBSAN_OPTIONS:-halt_on_error=1:print_stacktrace=1}
mkdir -p "$build/artifacts"
status=0
while read -r target; do
  [ -n "$target" ] || continue
  work=$(mktemp -d)
  log="$build/artifacts/$target.log"
  echo "== $target (${seconds} s)"
  # New inputs go to the scratch folder; the seed corpus stays untouched.
  if "$build/bin/$target" -max_total_time="$seconds" -timeout=20 -rss_limit_mb=2048 -print_final_stats=1 \
       -artifact_prefix="$build/artifacts/$target-" "$work" "$top/fuzz/corpus/$target" >"$log" 2>&1 &&
     ! grep -q "runtime error:\|ERROR: AddressSanitizer\|ERROR: LeakSanitizer" "$log"; then
    grep -E "^stat::number_of_executed_units|^stat::peak_rss_mb" "$log" | tr '\n' ' '
    echo "corpus $(ls "$work" | wc -l) new inputs"
  else
    echo "FAILED: $target, see $log"
    tail -n 40 "$log"
    status=1
  fi
  rm -rf "$work"
done <"$build/fuzz_targets.txt"
exit $status
