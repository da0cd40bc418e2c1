#!/usr/bin/env bash
# Window commands on simulated 4096 x 4096 FLOAT rasters, run as whole
# processes the way a host runs them:
#   texture 3x3, 7x7 and 31x31 (the cost per pixel must not grow with the
#   window: 31x31 / 3x3 <= 1.3);
#   texture 7x7 and correlation 7x7 (normalisation + coherence) against a
#   numpy/scipy peer (box filters over validity masks, bench_window_peer.py);
#   the read-and-write baseline: dd of one input to an output for texture,
#   cat of both inputs to one output for correlation.
# Every case runs ROUNDS times, alternately; medians and ratios are printed.
# Peak RSS of our runs must stay below 64 MB (exit status 1 otherwise).
#
# Usage: bench/bench_window.sh [side] [rounds]    (default 4096, 5)
# The build goes to $TLRX_BENCH_BUILD (default build_bench) in Release.
set -euo pipefail
source "$(dirname "$0")/bench_common.sh"

SIDE=${1:-4096}
ROUNDS=${2:-5}
PEAK_LIMIT_KB=$((64 * 1024))
bench_start bench_window "numpy scipy" main_features_extraction main_delete_file tlrx_simulate
NULL=$(sed -n 14p "$TELLURIX_INIT_DIR/Tellurix_configuration.ini")

simulate() {
  "$BUILD/bin/tlrx_simulate" "$@" --lines "$SIDE" --pixels "$SIDE" --cell-type FLOAT --null "$NULL" \
    --nodata-fraction 0.001 >>"$WORK/simulate.log" 2>&1 || { cat "$WORK/simulate.log" >&2; exit 1; }
}
simulate series --out "$WORK/amp" --count 1 --units AMPLITUDE
simulate pair --out "$WORK/pair" --coherence 0.6
AMP="$WORK/amp_01"

# Argument files of the commands.
texture_args() { printf 'texture\n%s\n%s\n0\n%s\n%s\nx\nNO\n0\n' "$AMP" "$WORK/tex$1" "$1" "$1" >"$WORK/tex$1.txt"; }
for aSize in 3 7 31; do texture_args "$aSize"; done
printf 'correlation\n%s\n%s\n%s\n%s\n7\n7\n7\n7\nNO\nNO\n0\n' "$WORK/pair_1" "$WORK/pair_2" "$WORK/coh" "$NULL" \
  >"$WORK/corr7.txt"

MAIN="$BUILD/bin/main_features_extraction"
PEER="$ROOT/bench/bench_window_peer.py"
declare -A RUN=(
  [tex3]="$MAIN main_texture#$WORK/tex3.txt"
  [tex7]="$MAIN main_texture#$WORK/tex7.txt"
  [tex31]="$MAIN main_texture#$WORK/tex31.txt"
  [peer_tex7]="$PYTHON $PEER texture $AMP $WORK/peer_tex7 $SIDE $SIDE 7 7 $NULL 0"
  [base_tex]="dd if=$AMP of=$WORK/base_tex bs=1M"
  [corr7]="$MAIN main_correlation#$WORK/corr7.txt"
  [peer_corr7]="$PYTHON $PEER correlation $WORK/pair_1 $WORK/pair_2 $WORK/peer_norm $WORK/peer_coh $SIDE $SIDE 7 7 $NULL"
  [base_corr]="sh -c 'cat $WORK/pair_1 $WORK/pair_2 >$WORK/base_corr'"
)
CASES="tex3 tex7 tex31 peer_tex7 base_tex corr7 peer_corr7 base_corr"
for aCase in $CASES; do : >"$WORK/$aCase.times"; done
for ((aRound = 0; aRound < ROUNDS; ++aRound)); do
  for aCase in $CASES; do
    eval "timed ${RUN[$aCase]}" >>"$WORK/$aCase.times"
  done
done


MB=$(awk -v s="$SIDE" 'BEGIN { print s * s * 4 / 1048576 }')
printf "Window commands on %dx%d FLOAT (%.0f MB per raster), %d rounds, medians\n" "$SIDE" "$SIDE" "$MB" "$ROUNDS"
printf "%-12s %9s %9s %12s %14s\n" "" "wall s" "cpu s" "peak RSS MB" "input MB/s"
for aCase in $CASES; do
  aInputs=1
  case $aCase in *corr*) aInputs=2 ;; esac
  printf "%-12s %9.3f %9.3f %12.1f %14.1f\n" "$aCase" "$(stat $aCase 1)" "$(stat $aCase 23)" \
    "$(awk -v k="$(stat $aCase 4)" 'BEGIN { print k / 1024 }')" \
    "$(awk -v m="$MB" -v n="$aInputs" -v w="$(stat $aCase 1)" 'BEGIN { print m * n / w }')"
done

echo "ratios (wall; cpu in brackets):"
R=$(ratio tex31 tex3 1); printf "  texture 31x31 / 3x3          %s (%s)  target <= 1.3: %s\n" "$R" "$(ratio tex31 tex3 23)" "$(check "$R" "<=" 1.3)"
R=$(ratio peer_tex7 tex7 1); printf "  numpy texture 7x7 / ours     %s (%s)  target >= 4: %s\n" "$R" "$(ratio peer_tex7 tex7 23)" "$(check "$R" ">=" 4)"
R=$(ratio peer_corr7 corr7 1); printf "  numpy correlation 7x7 / ours %s (%s)  target >= 4: %s\n" "$R" "$(ratio peer_corr7 corr7 23)" "$(check "$R" ">=" 4)"
printf "  texture 7x7 / dd baseline    %s (%s)\n" "$(ratio tex7 base_tex 1)" "$(ratio tex7 base_tex 23)"
printf "  correlation 7x7 / cat baseline %s (%s)\n" "$(ratio corr7 base_corr 1)" "$(ratio corr7 base_corr 23)"

aStatus=0
for aCase in tex3 tex7 tex31 corr7; do
  aPeak=$(stat $aCase 4)
  if ((aPeak >= PEAK_LIMIT_KB)); then
    echo "bench_window: $aCase peak RSS ${aPeak} kB not below 64 MB" >&2
    aStatus=1
  fi
done
exit $aStatus
