#!/usr/bin/env bash
# One thread against two for every command, run as whole processes the way a
# host runs them (TELLURIX_THREADS=1 and 2), on simulated SIDE x SIDE scenes:
# ratio of 2 images, min and max of 8, texture 7x7, correlation 7x7, the
# temporal features (all 14) of 8 images, the coherence command (the whole
# chain) and its interferogram step alone; and the commands that mostly move
# bytes against the byte baseline (cat of the inputs, head -c of outputs of
# the same size). Every case runs ROUNDS times, alternately; medians and
# ratios are printed. The figures depend on what else the machine runs.
#
# Usage: bench/bench_threads.sh [side] [rounds]    (default 4096, 3)
set -euo pipefail
source "$(dirname "$0")/bench_common.sh"

SIDE=${1:-4096}
ROUNDS=${2:-3}
HALF=$((SIDE / 2))
bench_start bench_threads "" main_features_extraction main_delete_file tlrx_simulate bench_interferogram
NULL=$(sed -n 14p "$TELLURIX_INIT_DIR/Tellurix_configuration.ini")
SIM="$BUILD/bin/tlrx_simulate"
quiet() { "$@" >>"$WORK/simulate.log" 2>&1 || { cat "$WORK/simulate.log" >&2; exit 1; }; }
common=(--cell-type FLOAT --null "$NULL" --nodata-fraction 0.001)
quiet "$SIM" series --out "$WORK/r" --count 2 --lines "$SIDE" --pixels "$SIDE" "${common[@]}"
quiet "$SIM" series --out "$WORK/m" --count 8 --lines "$HALF" --pixels "$HALF" "${common[@]}"
quiet "$SIM" pair --out "$WORK/p" --coherence 0.6 --lines "$SIDE" --pixels "$SIDE" "${common[@]}"
quiet "$SIM" slc --out "$WORK/c" --lines "$SIDE" --pixels "$SIDE" --shift-field 0.4,2e-4,0,-0.3,0,1e-4 \
  --coherence-ramp 0.2,0.95 --phase-ramp 0.01,0.03 --command-file "$WORK/cc.xml" --seed 5
mapfile -t STACK <"$WORK/m_list.txt"

printf 'ratio\n%s\n%s\n0\nx\nNO\n0\n' "$WORK/r_list.txt" "$WORK/out" >"$WORK/ratio.txt"
printf 'minmax\n%s\n%s\n2\n3\n4\n5\n6\nNO\n0\n' "$WORK/m_list.txt" "$WORK/mm" >"$WORK/minmax.txt"
printf 'texture\n%s\n%s\n0\n7\n7\nx\nNO\n0\n' "$WORK/p_1" "$WORK/tex" >"$WORK/texture.txt"
printf 'correlation\n%s\n%s\n%s\n%s\n7\n7\n7\n7\nNO\nNO\n0\n' "$WORK/p_1" "$WORK/p_2" "$WORK/coh" "$NULL" \
  >"$WORK/correlation.txt"
temporal_parameters "$WORK/temporal.xml" "$WORK/tf" nearest_neighbour "${STACK[@]}"
# The interferogram step alone, on the chain's pair with the shifts known.
sed 's:</HEADER_INFO>::' "$WORK/c_1.sml" >"$WORK/c_par.sml"
cat >>"$WORK/c_par.sml" <<XML
<interferometric_processing>
<DRangePoly><VectorDouble NumberOfElements = "1"><ValueDouble ID = "0">0.4</ValueDouble></VectorDouble></DRangePoly>
<DAzimuthPoly><VectorDouble NumberOfElements = "1"><ValueDouble ID = "0">-0.3</ValueDouble></VectorDouble></DAzimuthPoly>
<DRangePolyInv><VectorDouble NumberOfElements = "1"><ValueDouble ID = "0">-0.4</ValueDouble></VectorDouble></DRangePolyInv>
<DAzimuthPolyInv><VectorDouble NumberOfElements = "1"><ValueDouble ID = "0">0.3</ValueDouble></VectorDouble></DAzimuthPolyInv>
</interferometric_processing>
</HEADER_INFO>
XML

MAIN="$BUILD/bin/main_features_extraction"
W="$WORK"
RBYTES=$((SIDE * SIDE * 4))
MBYTES=$((HALF * HALF * 4))
declare -A RUN=(
  [ratio]="$MAIN main_ratio#$W/ratio.txt"
  [minmax]="$MAIN main_min_and_max#$W/minmax.txt"
  [texture]="$MAIN main_texture#$W/texture.txt"
  [correlation]="$MAIN main_correlation#$W/correlation.txt"
  [temporal]="$MAIN main_temporal_feature_extraction#$W/temporal.xml"
  [coherence]="$MAIN main_coherence#$W/cc.xml"
  [interferogram]="$BUILD/bin/bench_interferogram run $W/c_1 $W/c_2 $W/c_par $W/i_mpwr $W/i_spwr $W/i_int 1 5 NotOK - OK OK 1024 50"
)
declare -A BASE=(
  [ratio]="sh -c 'cat $W/r_01 $W/r_02 >/dev/null; head -c $RBYTES /dev/zero >$W/b1'"
  [minmax]="sh -c 'cat ${STACK[*]} >/dev/null; for k in 1 2 3 4; do head -c $MBYTES /dev/zero >$W/b\$k; done'"
  [temporal]="sh -c 'cat ${STACK[*]} >/dev/null; for k in \$(seq 14); do head -c $MBYTES /dev/zero >$W/b\$k; done'"
)
COMMANDS="ratio minmax texture correlation temporal coherence interferogram"
for c in $COMMANDS; do : >"$W/${c}_1.times"; : >"$W/${c}_2.times"; done
for c in "${!BASE[@]}"; do : >"$W/${c}_base.times"; done
for ((r = 0; r < ROUNDS; ++r)); do
  for c in $COMMANDS; do
    for t in 1 2; do eval "timed env TELLURIX_THREADS=$t ${RUN[$c]}" >>"$W/${c}_$t.times"; done
    [ -z "${BASE[$c]:-}" ] || eval "timed ${BASE[$c]}" >>"$W/${c}_base.times"
  done
done

printf "%d rounds on %d x %d, medians (wall s; cpu s; peak RSS MB)\n" "$ROUNDS" "$SIDE" "$SIDE"
printf "%-14s %22s %22s %8s %14s\n" "" "1 thread" "2 threads" "1 / 2" "1 thr / bytes"
for c in $COMMANDS; do
  line=$(printf "%-14s %7.2f %6.2f %7.1f  %7.2f %6.2f %7.1f %8s" "$c" \
    "$(stat ${c}_1 1)" "$(stat ${c}_1 23)" "$(awk -v k="$(stat ${c}_1 4)" 'BEGIN { print k / 1024 }')" \
    "$(stat ${c}_2 1)" "$(stat ${c}_2 23)" "$(awk -v k="$(stat ${c}_2 4)" 'BEGIN { print k / 1024 }')" \
    "$(ratio ${c}_1 ${c}_2 1)")
  [ -z "${BASE[$c]:-}" ] || line+=$(printf " %14s" "$(ratio ${c}_1 ${c}_base 1) ($(ratio ${c}_2 ${c}_base 1))")
  echo "$line"
done
echo "aims: 1 / 2 >= 1.7 for texture, correlation, temporal, coherence and interferogram;"
echo "      ratio, min and max and temporal within 1.3 of the byte baseline (2 threads in brackets)"
