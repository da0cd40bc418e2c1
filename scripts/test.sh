#!/usr/bin/env bash
# Installs what is missing, builds, and runs every test: the unit, process and
# interoperability tests, the same suite under ASan and UBSan, and the fuzz
# targets for a bounded time.
set -euo pipefail
top=$(cd "$(dirname "$0")/.." && pwd)
fuzz_seconds=${TLRX_FUZZ_SECONDS:-60}

"$top/scripts/setup.sh" "$top/build"
(cd "$top/build" && ctest --output-on-failure -j2)

echo "== sanitizer build (ASan + UBSan)"
cmake -S "$top" -B "$top/build_sanitize" -DCMAKE_BUILD_TYPE=Debug -DTLRX_SANITIZE=ON >/dev/null
cmake --build "$top/build_sanitize" -j"$(nproc)"
(cd "$top/build_sanitize" && ASAN_OPTIONS=detect_leaks=0 UBSAN_OPTIONS=halt_on_error=1:print_stacktrace=1 \
  ctest --output-on-failure -j2)

if [ -x "$top/scripts/run_fuzzers.sh" ]; then
  echo "== fuzz targets (${fuzz_seconds} s each)"
  "$top/scripts/run_fuzzers.sh" "$fuzz_seconds"
fi
