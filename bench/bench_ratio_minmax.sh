#!/usr/bin/env bash
# Ratio of two 4096 x 4096 FLOAT images and min-and-max of 8 images of
# 2048 x 2048 (both dates), run as whole processes the way a host runs them,
# against a numpy peer (bench_ratio_minmax_peer.py) and a read-and-write
# baseline (cat of the inputs, dd of outputs of the same size), alternately,
# ROUNDS times; medians and ratios are printed. Peak RSS of our runs must stay
# below 64 MB and flat when the number of lines doubles.
#
# Usage: bench/bench_ratio_minmax.sh [rounds]    (default 5)
set -euo pipefail
source "$(dirname "$0")/bench_common.sh"

ROUNDS=${1:-5}
RATIO_SIDE=4096
STACK_SIDE=2048
STACK_COUNT=8
bench_start bench_ratio "numpy" main_features_extraction main_delete_file tlrx_simulate
NULL=$(sed -n 14p "$TELLURIX_INIT_DIR/Tellurix_configuration.ini")
SIM="$BUILD/bin/tlrx_simulate"
common=(--cell-type FLOAT --null "$NULL" --nodata-fraction 0.001)
"$SIM" series --out "$WORK/r" --count 2 --lines $RATIO_SIDE --pixels $RATIO_SIDE "${common[@]}" >/dev/null
"$SIM" series --out "$WORK/m" --count $STACK_COUNT --lines $STACK_SIDE --pixels $STACK_SIDE "${common[@]}" >/dev/null
"$SIM" series --out "$WORK/t" --count $STACK_COUNT --lines $((2 * STACK_SIDE)) --pixels $STACK_SIDE "${common[@]}" >/dev/null
printf 'ratio\n%s\n%s\n0\nx\nNO\n0\n' "$WORK/r_list.txt" "$WORK/out" >"$WORK/ratio.txt"
for s in m t; do printf 'minmax\n%s\n%s\n2\n3\n4\n5\n6\nNO\n0\n' "$WORK/${s}_list.txt" "$WORK/${s}out" >"$WORK/$s.txt"; done
mapfile -t STACK <"$WORK/m_list.txt"

MAIN="$BUILD/bin/main_features_extraction"
PEER="$ROOT/bench/bench_ratio_minmax_peer.py"
RBYTES=$((RATIO_SIDE * RATIO_SIDE * 4))
SBYTES=$((STACK_SIDE * STACK_SIDE * 4))
declare -A RUN=(
  [ratio]="$MAIN main_ratio#$WORK/ratio.txt"
  [peer_ratio]="$PYTHON $PEER ratio $WORK/r_01 $WORK/r_02 $WORK/peer_rto $RATIO_SIDE $RATIO_SIDE $NULL"
  [base_ratio]="sh -c 'cat $WORK/r_01 $WORK/r_02 >/dev/null; head -c $RBYTES /dev/zero >$WORK/base_rto'"
  [minmax]="$MAIN main_min_and_max#$WORK/m.txt"
  [minmax_2x]="$MAIN main_min_and_max#$WORK/t.txt"
  [peer_minmax]="$PYTHON $PEER minmax $WORK/peer_mm $STACK_SIDE $STACK_SIDE $NULL ${STACK[*]}"
  [base_minmax]="sh -c 'cat ${STACK[*]} >/dev/null; for k in 1 2 3 4; do head -c $SBYTES /dev/zero >$WORK/base_mm\$k; done'"
)
CASES="ratio peer_ratio base_ratio minmax minmax_2x peer_minmax base_minmax"
for c in $CASES; do : >"$WORK/$c.times"; done
for ((r = 0; r < ROUNDS; ++r)); do
  for c in $CASES; do eval "timed ${RUN[$c]}" >>"$WORK/$c.times"; done
done


printf "%d rounds, medians\n%-12s %9s %9s %12s\n" "$ROUNDS" "" "wall s" "cpu s" "peak RSS MB"
for c in $CASES; do
  printf "%-12s %9.3f %9.3f %12.1f\n" "$c" "$(stat $c 1)" "$(stat $c 23)" "$(awk -v k="$(stat $c 4)" 'BEGIN { print k / 1024 }')"
done
echo "ratios (wall; cpu in brackets):"
R=$(ratio peer_ratio ratio 1); printf "  numpy ratio / ours          %s (%s)  target >= 2.5: %s\n" "$R" "$(ratio peer_ratio ratio 23)" "$(check "$R" ">=" 2.5)"
R=$(ratio ratio base_ratio 1); printf "  ratio / baseline            %s (%s)  target <= 1.5: %s\n" "$R" "$(ratio ratio base_ratio 23)" "$(check "$R" "<=" 1.5)"
R=$(ratio peer_minmax minmax 1); printf "  numpy min-max / ours        %s (%s)  target >= 3: %s\n" "$R" "$(ratio peer_minmax minmax 23)" "$(check "$R" ">=" 3)"
R=$(ratio minmax base_minmax 1); printf "  min-max / baseline          %s (%s)  target <= 2: %s\n" "$R" "$(ratio minmax base_minmax 23)" "$(check "$R" "<=" 2)"
printf "  peak RSS min-max 2x lines / 1x  %s\n" "$(ratio minmax_2x minmax 4)"

status=0
for c in ratio minmax minmax_2x; do
  (( $(stat $c 4) < 64 * 1024 )) || { echo "bench: $c peak RSS not below 64 MB" >&2; status=1; }
done
exit $status
