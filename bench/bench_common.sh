# Shared by the command benchmarks (sourced): timing one run as a host runs
# it, and the medians and ratios of the recorded rounds. Expects $WORK.

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
