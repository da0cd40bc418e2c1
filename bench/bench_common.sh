# Shared by the command benchmarks (sourced): the build and the folder of a
# benchmark, timing one run as a host runs it, and the medians and ratios of
# the recorded rounds.

# bench_start NAME "PYTHON MODULES" TARGET...: checks the tools, builds the
# targets in $BUILD (default build_bench, Release, with the bench programs),
# makes $WORK (removed at exit) and points the runtime's folders at it. Sets
# ROOT, BUILD, PYTHON and WORK.
bench_start() {
  local aName=$1 aModules=$2
  shift 2
  ROOT=$(cd "$(dirname "$0")/.." && pwd)
  BUILD=${TLRX_BENCH_BUILD:-$ROOT/build_bench}
  PYTHON=${TLRX_BENCH_PYTHON:-/usr/bin/python3}
  command -v /usr/bin/time >/dev/null || { echo "$aName: /usr/bin/time is not installed" >&2; exit 2; }
  for aModule in $aModules; do
    "$PYTHON" -c "import $aModule" 2>/dev/null ||
      { echo "$aName: $PYTHON lacks $aModule (apt-get install python3-$aModule)" >&2; exit 2; }
  done
  cmake -S "$ROOT" -B "$BUILD" -DCMAKE_BUILD_TYPE=Release -DTLRX_BUILD_TESTS=OFF -DTLRX_BUILD_BENCH=ON >/dev/null
  cmake --build "$BUILD" -j2 --target "$@" >/dev/null
  WORK=$(mktemp -d "/tmp/tlrx_$aName.XXXXXX")
  trap 'rm -rf "$WORK"' EXIT
  export TELLURIX_INIT_DIR="$BUILD/etc/tellurix" TELLURIX_WORKING_DIR="$WORK/" TELLURIX_BATCH_DIR="$WORK/"
  printf '0\n\n' >"$WORK/Process.working"
}

# One run: wall, user, system seconds and peak resident kilobytes.
timed() {
  printf '0\n\n' >"$WORK/Process.working"
  /usr/bin/time -f "%e %U %S %M" -o "$WORK/time.txt" "$@" >/dev/null 2>&1 ||
    { echo "$(basename "$0"): failed: $*" >&2; cat "$WORK/Process.working_error" >&2 2>/dev/null; exit 1; }
  cat "$WORK/time.txt"
}

median() { sort -g | awk '{ v[NR] = $1 } END { print (NR % 2) ? v[(NR + 1) / 2] : (v[NR / 2] + v[NR / 2 + 1]) / 2 }'; }
# Median of case $1: column 1 wall, 23 user + system, 4 peak RSS (kB).
stat() { awk -v c="$2" '{ print (c == 23) ? $2 + $3 : $c }' "$WORK/$1.times" | median; }
ratio() { awk -v a="$(stat "$1" "$3")" -v b="$(stat "$2" "$3")" 'BEGIN { printf "%.2f", a / b }'; }
check() { awk -v v="$1" -v t="$3" -v op="$2" 'BEGIN { ok = (op == "<=") ? v <= t : v >= t; print ok ? "ok" : "MISSED" }'; }
