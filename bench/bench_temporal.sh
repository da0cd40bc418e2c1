#!/usr/bin/env bash
# Temporal feature extraction on simulated series of 8 FLOAT images, run as
# whole processes the way a host runs them:
#   all fourteen outputs of 8 co-registered SIDE x SIDE images against a
#   numpy peer (mean, deviation, median, min, max, largest increment and
#   decrement; bench_temporal_peer.py): target peer / ours >= 3;
#   the read-and-write baseline (cat of the 8 inputs, dd of 14 outputs'
#   worth of bytes): target ours / baseline <= 3;
#   the same series geocoded (UTM, three images moved by a quarter cell, so
#   every cell is interpolated) with bilinear resampling: target
#   geocoded / co-registered <= 2;
#   peak RSS below 64 MB, and flat in the number of lines (a series with a
#   quarter of the lines peaks within 2 MB of the full one).
# Every case runs ROUNDS times, alternately; medians and ratios are printed.
# Exit status 1 when a memory limit is missed.
#
# Usage: bench/bench_temporal.sh [side] [rounds]    (default 2048, 3)
# The build goes to $TLRX_BENCH_BUILD (default build_bench) in Release.
set -euo pipefail
source "$(dirname "$0")/bench_common.sh"

SIDE=${1:-2048}
ROUNDS=${2:-3}
COUNT=8
PEAK_LIMIT_KB=$((64 * 1024))
FLAT_LIMIT_KB=2048
bench_start bench_temporal "numpy" main_features_extraction main_delete_file tlrx_simulate
NULL=-9999

simulate() {
  "$BUILD/bin/tlrx_simulate" series --count "$COUNT" --pixels "$SIDE" --cell-type FLOAT --null "$NULL" \
    --nodata-fraction 0.001 --change 100,100,200,200,4,4 --seed 3 "$@" >>"$WORK/simulate.log" 2>&1 ||
    { cat "$WORK/simulate.log" >&2; exit 1; }
}
simulate --out "$WORK/s" --lines "$SIDE"
simulate --out "$WORK/q" --lines $((SIDE / 4))
simulate --out "$WORK/g" --lines "$SIDE" --utm 32N --origin 600000,5100000 --spacing 20 \
  --image-origin 3:600005,5100000 --image-origin 5:600000,5099995 --image-origin 7:600005,5099995
names() { for ((i = 1; i <= COUNT; ++i)); do printf '%s_%02d ' "$1" "$i"; done; }

# Parameter files: every feature, inputs in the simulator's (temporal) order.
temporal_parameters "$WORK/ours.xml" "$WORK/ours" nearest_neighbour $(names "$WORK/s")
temporal_parameters "$WORK/quarter.xml" "$WORK/quarter" nearest_neighbour $(names "$WORK/q")
temporal_parameters "$WORK/geo.xml" "$WORK/geo" bilinear_interpolation $(names "$WORK/g")
OUTPUT_MB=$((14 * SIDE * SIDE * 4 / 1048576))

MAIN="$BUILD/bin/main_features_extraction"
PEER="$ROOT/bench/bench_temporal_peer.py"
# The peer reads the images in temporal order (the simulator's order).
declare -A RUN=(
  [ours]="$MAIN main_temporal_feature_extraction#$WORK/ours.xml"
  [peer]="$PYTHON $PEER $WORK/peer $SIDE $SIDE $NULL $(names "$WORK/s")"
  [base]="sh -c 'cat $(names "$WORK/s") >/dev/null; dd if=/dev/zero of=$WORK/base bs=1M count=$OUTPUT_MB 2>/dev/null'"
  [geo]="$MAIN main_temporal_feature_extraction#$WORK/geo.xml"
  [quarter]="$MAIN main_temporal_feature_extraction#$WORK/quarter.xml"
)
CASES="ours peer base geo quarter"
for aCase in $CASES; do : >"$WORK/$aCase.times"; done
for ((aRound = 0; aRound < ROUNDS; ++aRound)); do
  for aCase in $CASES; do
    eval "timed ${RUN[$aCase]}" >>"$WORK/$aCase.times"
  done
done


MB=$(awk -v s="$SIDE" 'BEGIN { print s * s * 4 / 1048576 }')
printf "Temporal features of %d FLOAT images of %dx%d (%.0f MB each), %d rounds, medians\n" "$COUNT" "$SIDE" "$SIDE" \
  "$MB" "$ROUNDS"
printf "%-10s %9s %9s %12s %14s\n" "" "wall s" "cpu s" "peak RSS MB" "input MB/s"
for aCase in $CASES; do
  aInput=$(awk -v m="$MB" -v n="$COUNT" 'BEGIN { print m * n }')
  [[ $aCase == quarter ]] && aInput=$(awk -v m="$aInput" 'BEGIN { print m / 4 }')
  printf "%-10s %9.3f %9.3f %12.1f %14.1f\n" "$aCase" "$(stat $aCase 1)" "$(stat $aCase 23)" \
    "$(awk -v k="$(stat $aCase 4)" 'BEGIN { print k / 1024 }')" \
    "$(awk -v m="$aInput" -v w="$(stat $aCase 1)" 'BEGIN { print m / w }')"
done

echo "ratios (wall; cpu in brackets):"
R=$(ratio peer ours 1); printf "  numpy peer / ours              %s (%s)  target >= 3: %s\n" "$R" "$(ratio peer ours 23)" "$(check "$R" ">=" 3)"
R=$(ratio ours base 1); printf "  ours / read-and-write baseline %s (%s)  target <= 3: %s\n" "$R" "$(ratio ours base 23)" "$(check "$R" "<=" 3)"
R=$(ratio geo ours 1); printf "  geocoded bilinear / ours       %s (%s)  target <= 2: %s\n" "$R" "$(ratio geo ours 23)" "$(check "$R" "<=" 2)"

aStatus=0
for aCase in ours geo quarter; do
  aPeak=$(stat $aCase 4)
  if ((aPeak >= PEAK_LIMIT_KB)); then
    echo "bench_temporal: $aCase peak RSS ${aPeak} kB not below 64 MB" >&2
    aStatus=1
  fi
done
aGrowth=$(($(stat ours 4) - $(stat quarter 4)))
printf "  peak RSS, full minus quarter of the lines: %d kB  target < %d: %s\n" "$aGrowth" "$FLAT_LIMIT_KB" \
  "$(check "$aGrowth" "<=" "$FLAT_LIMIT_KB")"
((aGrowth < FLAT_LIMIT_KB)) || aStatus=1
exit $aStatus
