#!/usr/bin/env bash
# Installs what is missing, builds, and runs every test: the unit, process and
# interoperability tests, the naming check, the same suite under ASan and
# UBSan, and the fuzz targets for a bounded time. Ends with one "N passed, N failed" line.
set -euo pipefail
top=$(cd "$(dirname "$0")/.." && pwd)
fuzz_seconds=${TLRX_FUZZ_SECONDS:-60}
logs=$(mktemp -d)
trap 'rm -rf "$logs"' EXIT

# Runs ctest in a build folder, keeping its summary for the closing line.
run_ctest() {
  local build=$1 name=$2
  shift 2
  (cd "$build" && env "$@" ctest --output-on-failure -j2) | tee "$logs/$name.log"
}

"$top/scripts/setup.sh" "$top/build"
run_ctest "$top/build" main

echo "== naming check"
"$top/scripts/check_naming.sh" "$top/build"

echo "== sanitizer build (ASan + UBSan)"
cmake -S "$top" -B "$top/build_sanitize" -DCMAKE_BUILD_TYPE=Debug -DTLRX_SANITIZE=ON >/dev/null
cmake --build "$top/build_sanitize" -j"$(nproc)" >"$logs/sanitize_build.txt" 2>&1 ||
  { tail -n 60 "$logs/sanitize_build.txt"; exit 1; }
run_ctest "$top/build_sanitize" sanitize ASAN_OPTIONS=detect_leaks=0 UBSAN_OPTIONS=halt_on_error=1:print_stacktrace=1

echo "== fuzz targets (${fuzz_seconds} s each)"
"$top/scripts/run_fuzzers.sh" "$fuzz_seconds"

passed=$(grep -h "tests passed" "$logs"/*.log | sed -E 's/.* out of ([0-9]+).*/\1/' | awk '{ s += $1 } END { print s }')
echo "unit, process, interoperability and sanitizer runs: $passed passed, 0 failed"
