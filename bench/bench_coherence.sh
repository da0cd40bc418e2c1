#!/usr/bin/env bash
# Coherence estimation of a SIDE x SIDE interferogram (made by the
# interferogram step from a simulated pair, one look) with 5 x 5 and 31 x 31
# windows, against a numpy/scipy peer (uniform_filter on the restored product
# and the powers): targets peer / ours >= 5 for 5 x 5, ours >= 50 million
# pixels per CPU second, 31 x 31 within 1.3 times 5 x 5. Medians of ROUNDS.
#
# Usage: bench/bench_coherence.sh [side] [rounds]    (default 4096, 3)
# The build goes to $TLRX_BENCH_BUILD (default build_bench) in Release.
set -euo pipefail
source "$(dirname "$0")/bench_common.sh"
SIDE=${1:-4096}
ROUNDS=${2:-3}
bench_start bench_coherence "numpy scipy" bench_interferogram tlrx_simulate

"$BUILD/bin/tlrx_simulate" slc --out "$WORK/pair" --lines "$SIDE" --pixels "$SIDE" --coherence 0.6 \
  >"$WORK/simulate.log" 2>&1 || { cat "$WORK/simulate.log" >&2; exit 1; }
sed 's:</HEADER_INFO>::' "$WORK/pair_1.sml" >"$WORK/pair_par.sml"
cat >>"$WORK/pair_par.sml" <<XML
<interferometric_processing>
<DRangePoly><VectorDouble NumberOfElements = "1"><ValueDouble ID = "0">0</ValueDouble></VectorDouble></DRangePoly>
<DAzimuthPoly><VectorDouble NumberOfElements = "1"><ValueDouble ID = "0">0</ValueDouble></VectorDouble></DAzimuthPoly>
<DRangePolyInv><VectorDouble NumberOfElements = "1"><ValueDouble ID = "0">0</ValueDouble></VectorDouble></DRangePolyInv>
<DAzimuthPolyInv><VectorDouble NumberOfElements = "1"><ValueDouble ID = "0">0</ValueDouble></VectorDouble></DAzimuthPolyInv>
</interferometric_processing>
</HEADER_INFO>
XML
B="$BUILD/bin/bench_interferogram"
"$B" run "$WORK/pair_1" "$WORK/pair_2" "$WORK/pair_par" "$WORK/m" "$WORK/s" "$WORK/i" 1 1 NotOK >/dev/null 2>&1 ||
  { echo "bench_coherence: the interferogram step failed" >&2; exit 1; }

declare -A RUN=(
  [cc5]="$B coherence $WORK/i $WORK/m $WORK/s $WORK/cc5 5"
  [cc31]="$B coherence $WORK/i $WORK/m $WORK/s $WORK/cc31 31"
  [peer5]="$PYTHON $ROOT/bench/bench_coherence_peer.py $WORK/i $WORK/m $WORK/s $WORK/peer5 $SIDE $SIDE 5"
)
CASES="cc5 cc31 peer5"
for aCase in $CASES; do : >"$WORK/$aCase.times"; done
for ((aRound = 0; aRound < ROUNDS; ++aRound)); do
  for aCase in $CASES; do eval "timed ${RUN[$aCase]}" >>"$WORK/$aCase.times"; done
done

printf "Coherence of a %dx%d interferogram, %d rounds, medians\n" "$SIDE" "$SIDE" "$ROUNDS"
printf "%-8s %9s %9s %12s\n" "" "wall s" "cpu s" "peak RSS MB"
for aCase in $CASES; do
  printf "%-8s %9.3f %9.3f %12.1f\n" "$aCase" "$(stat $aCase 1)" "$(stat $aCase 23)" \
    "$(awk -v k="$(stat $aCase 4)" 'BEGIN { print k / 1024 }')"
done
RATE=$(awk -v s="$SIDE" -v c="$(stat cc5 23)" 'BEGIN { printf "%.1f", s * s / c / 1e6 }')
printf "  5x5: %s million pixels per CPU second  target >= 50: %s\n" "$RATE" "$(check "$RATE" ">=" 50)"
R=$(ratio peer5 cc5 1)
printf "  peer / ours 5x5       %s (cpu %s)  target >= 5: %s\n" "$R" "$(ratio peer5 cc5 23)" "$(check "$R" ">=" 5)"
R=$(ratio cc31 cc5 1)
printf "  31x31 / 5x5           %s (cpu %s)  target <= 1.3: %s\n" "$R" "$(ratio cc31 cc5 23)" "$(check "$R" "<=" 1.3)"
