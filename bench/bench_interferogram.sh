#!/usr/bin/env bash
# Interferogram generation on a simulated SIDE x SIDE SLC pair (coherence 0.8,
# shift 0.3, -0.45, Doppler centroids 0.05 and -0.05 of the PRF, range bands
# moved by 10 % of the bandwidth), 5 azimuth looks, both filters on, blocks of
# 1024 lines:
#   - the slave resampling alone (in memory, one core): output pixels per CPU
#     second, target >= 15 million;
#   - the whole step against a numpy/scipy peer (cubic-spline resampling,
#     product, multilook, no filters): target peer / ours >= 5, ours under
#     about 6 s, peak RSS under 256 MB; the peer forms its product at the
#     input sampling ("peer") and, doing what the step does, on lines
#     oversampled by 2 in range ("peer_os");
#   - peak RSS of the step on half the lines: memory follows the block, not the
#     image.
# Medians of ROUNDS runs.
#
# Usage: bench/bench_interferogram.sh [side] [rounds]    (default 4096, 3)
# The build goes to $TLRX_BENCH_BUILD (default build_bench) in Release.
set -euo pipefail
source "$(dirname "$0")/bench_common.sh"
SIDE=${1:-4096}
ROUNDS=${2:-3}
bench_start bench_interferogram "numpy scipy" bench_interferogram tlrx_simulate

simulate() {
  "$BUILD/bin/tlrx_simulate" slc --out "$1" --lines "$2" --pixels "$SIDE" --coherence 0.8 --shift 0.3,-0.45 \
    --doppler 0.05,-0.05 --range-band-shift 0.1 >>"$WORK/simulate.log" 2>&1 || { cat "$WORK/simulate.log" >&2; exit 1; }
}
simulate "$WORK/pair" "$SIDE"
simulate "$WORK/half" $((SIDE / 2))
# The co-registration parameters: the master's header with the shifts.
parameters() {
  sed 's:</HEADER_INFO>::' "$1_1.sml" >"$2.sml"
  cat >>"$2.sml" <<XML
<interferometric_processing>
<DRangePoly><VectorDouble NumberOfElements = "1"><ValueDouble ID = "0">0.3</ValueDouble></VectorDouble></DRangePoly>
<DAzimuthPoly><VectorDouble NumberOfElements = "1"><ValueDouble ID = "0">-0.45</ValueDouble></VectorDouble></DAzimuthPoly>
<DRangePolyInv><VectorDouble NumberOfElements = "1"><ValueDouble ID = "0">-0.3</ValueDouble></VectorDouble></DRangePolyInv>
<DAzimuthPolyInv><VectorDouble NumberOfElements = "1"><ValueDouble ID = "0">0.45</ValueDouble></VectorDouble></DAzimuthPolyInv>
</interferometric_processing>
</HEADER_INFO>
XML
}
parameters "$WORK/pair" "$WORK/pair_par"
parameters "$WORK/half" "$WORK/half_par"

B="$BUILD/bin/bench_interferogram"
step() { echo "$B run $WORK/$1_1 $WORK/$1_2 $WORK/$1_par $WORK/$2_mpwr $WORK/$2_spwr $WORK/$2_int 1 5 NotOK - OK OK 1024 50"; }
declare -A RUN=(
  [ours]="$(step pair ours)"
  [half]="$(step half half)"
  [peer]="$PYTHON $ROOT/bench/bench_interferogram_peer.py $WORK/pair_1 $WORK/pair_2 $WORK/peer $SIDE $SIDE 0.3 -0.45 5"
  [peer_os]="$PYTHON $ROOT/bench/bench_interferogram_peer.py $WORK/pair_1 $WORK/pair_2 $WORK/peeros $SIDE $SIDE 0.3 -0.45 5 512 2"
)
CASES="ours half peer peer_os"
for aCase in $CASES; do : >"$WORK/$aCase.times"; done
: >"$WORK/resample.txt"
for ((aRound = 0; aRound < ROUNDS; ++aRound)); do
  "$B" resample "$WORK/pair" 0.3 -0.45 >>"$WORK/resample.txt"
  for aCase in $CASES; do eval "timed ${RUN[$aCase]}" >>"$WORK/$aCase.times"; done
done

RESAMPLE=$(awk '{ print $6 }' "$WORK/resample.txt" | median)
printf "Interferogram of a %dx%d SLC pair, 5 azimuth looks, both filters, %d rounds, medians\n" "$SIDE" "$SIDE" "$ROUNDS"
printf "  slave resampling: %.1f million pixels per CPU second  target >= 15: %s\n" "$RESAMPLE" \
  "$(check "$RESAMPLE" ">=" 15)"
printf "%-8s %9s %9s %12s\n" "" "wall s" "cpu s" "peak RSS MB"
for aCase in $CASES; do
  printf "%-8s %9.3f %9.3f %12.1f\n" "$aCase" "$(stat $aCase 1)" "$(stat $aCase 23)" \
    "$(awk -v k="$(stat $aCase 4)" 'BEGIN { print k / 1024 }')"
done
R=$(ratio peer ours 1)
printf "  peer / ours           %s (cpu %s)  target >= 5: %s\n" "$R" "$(ratio peer ours 23)" "$(check "$R" ">=" 5)"
R=$(ratio peer_os ours 1)
printf "  peer_os / ours        %s (cpu %s)  target >= 5: %s\n" "$R" "$(ratio peer_os ours 23)" "$(check "$R" ">=" 5)"
printf "  ours wall             %.2f s  target <= 6: %s\n" "$(stat ours 1)" "$(check "$(stat ours 1)" "<=" 6)"
PEAK=$(stat ours 4)
printf "  peak RSS              %.1f MB  target < 256: %s\n" "$(awk -v k="$PEAK" 'BEGIN { print k / 1024 }')" \
  "$(check "$PEAK" "<=" $((256 * 1024)))"
printf "  peak RSS full / half of the lines  %s\n" "$(ratio ours half 4)"
((PEAK < 256 * 1024)) || { echo "bench_interferogram: peak RSS not below 256 MB" >&2; exit 1; }
