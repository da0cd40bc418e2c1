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

# temporal_parameters FILE ROOT KERNEL INPUT...: a temporal-features parameter
# file asking for every feature of the inputs, results under ROOT.
temporal_parameters() {
  local aFile=$1 aRoot=$2 aKernel=$3 i=0
  shift 3
  {
    printf '<?xml version="1.0" ?>\n<HEADER_INFO>\n<MAIN_CMD>\n<input_file_list>\n'
    printf '<VectorString NumberOfElements = "%d">\n' "$#"
    for aName in "$@"; do
      printf '<ValueString ID = "%d">%s</ValueString>\n' "$i" "$aName"
      i=$((i + 1))
    done
    printf '</VectorString>\n</input_file_list>\n<out_root_file_name>%s</out_root_file_name>\n' "$aRoot"
    printf '<interp_type>%s</interp_type>\n' "$aKernel"
    for aSwitch in mean std median gradient max min span_max_less_min max_less_min_sup max_less_min_inf \
      span_max_on_min max_on_min_sup max_on_min_inf date_max date_min_before_max; do
      printf '<%s>OK</%s>\n' "$aSwitch" "$aSwitch"
    done
    printf '<saturation_default>0</saturation_default>\n'
    printf '<TellurixEnvironment>IDL_ENVI_ENV</TellurixEnvironment>\n</MAIN_CMD>\n</HEADER_INFO>\n'
  } >"$aFile"
}
