#!/usr/bin/env bash
# The whole coherence command (main_coherence) on a simulated SIDE x SIDE
# single-look complex pair, against a numpy/scipy peer of the same chain
# (bench_coherence_command_peer.py): co-registration estimated, interferogram
# with both common-band filters (range oversampled by 2, one look), synthetic
# phase from the fringes, flattening, the fringe-adaptive filter, 5 x 5
# coherence, GeoTIFF quick-look. The pair: affine shift 0.4 + 2e-4 x in range
# and -0.3 + 1e-4 y in azimuth, coherence rising from 0.2 to 0.95 across the
# columns, fringes 0.01 and 0.03 cycles per line and pixel, hills of 20 rad.
# Targets: ours under 20 s wall on one core, peak RSS under 256 MB,
# peer / ours >= 5. Medians of ROUNDS; our per-step seconds come from the
# trace; the coherence means over the four column quarters of both are
# printed beside the simulated truth and must agree within 0.03.
#
# Usage: bench/bench_coherence_command.sh [side] [rounds]    (default 4096, 3)
# The build goes to $TLRX_BENCH_BUILD (default build_bench) in Release.
set -euo pipefail
source "$(dirname "$0")/bench_common.sh"
SIDE=${1:-4096}
ROUNDS=${2:-3}
bench_start bench_coherence_command "numpy scipy" main_features_extraction main_delete_file tlrx_simulate
# One core for both: no BLAS or OpenMP threads in the peer.
export OMP_NUM_THREADS=1 OPENBLAS_NUM_THREADS=1 MKL_NUM_THREADS=1

"$BUILD/bin/tlrx_simulate" slc --out "$WORK/pair" --lines "$SIDE" --pixels "$SIDE" \
  --shift-field 0.4,2e-4,0,-0.3,0,1e-4 --coherence-ramp 0.2,0.95 --phase-ramp 0.01,0.03 --topography 20 \
  --dem 400 --command-file "$WORK/cc.xml" --seed 5 >"$WORK/simulate.log" 2>&1 ||
  { cat "$WORK/simulate.log" >&2; exit 1; }
# The chain measured: filter on, blocks of 1024 lines, a quick-look. A key the
# edit missed would time another chain, so each is checked.
sed -i -e 's:<adat_filter_flag>[^<]*<:<adat_filter_flag>OK<:' -e 's:<int_blocksize>[^<]*<:<int_blocksize>1024<:' \
  -e 's:<make_tiff>[^<]*<:<make_tiff>OK<:' "$WORK/cc.xml"
for aKey in "<adat_filter_flag>OK<" "<int_blocksize>1024<" "<make_tiff>OK<"; do
  grep -q "$aKey" "$WORK/cc.xml" || { echo "bench_coherence_command: $aKey not set in the parameter file" >&2; exit 1; }
done
# Tracing on (line 12 of the configuration) for the step durations.
mkdir "$WORK/etc"
sed '12s/.*/ACTIVE/' "$BUILD/etc/tellurix/Tellurix_configuration.ini" >"$WORK/etc/Tellurix_configuration.ini"
export TELLURIX_INIT_DIR="$WORK/etc"

PEER="$ROOT/bench/bench_coherence_command_peer.py"
declare -A RUN=(
  [ours]="$BUILD/bin/main_features_extraction main_coherence#$WORK/cc.xml"
  [peer]="$PYTHON $PEER $WORK/pair_1 $WORK/pair_2 $WORK/peer"
)
CASES="ours peer"
for aCase in $CASES; do : >"$WORK/$aCase.times"; done
: >"$WORK/steps.txt"
for ((aRound = 0; aRound < ROUNDS; ++aRound)); do
  rm -f "$WORK/Process.trace"
  for aCase in $CASES; do eval "timed ${RUN[$aCase]}" >>"$WORK/$aCase.times"; done
  # "DURATION [ <step>]  (s) = <s>" per step; the total runs from before the
  # co-registration, which the driver does itself: it is the remainder.
  awk -v r="$aRound" '
    /^DURATION \[/ { n = $0; sub(/^DURATION \[ */, "", n); sub(/\].*/, "", n); v = $NF;
                     name[++k] = n; value[k] = v; sum += v }
    /TOTAL TIME \(s\):/ { total = $NF }
    END { if (total == "") exit 1;
          printf "%s\t%s\t%s\n", r, "co-registration (total - steps)", total - sum;
          for (i = 1; i <= k; ++i) printf "%s\t%s\t%s\n", r, name[i], value[i];
          printf "%s\t%s\t%s\n", r, "total", total }' "$WORK/Process.trace" >>"$WORK/steps.txt" ||
    { echo "bench_coherence_command: no step durations in $WORK/Process.trace" >&2; exit 1; }
done

mb() { awk -v k="$1" 'BEGIN { printf "%.1f", k / 1024 }'; }
printf "Coherence command on a %dx%d SLC pair, %d rounds, medians, one core\n" "$SIDE" "$SIDE" "$ROUNDS"
printf "%-8s %9s %9s %12s\n" "" "wall s" "cpu s" "peak RSS MB"
for aCase in $CASES; do
  printf "%-8s %9.3f %9.3f %12s\n" "$aCase" "$(stat "$aCase" 1)" "$(stat "$aCase" 23)" "$(mb "$(stat "$aCase" 4)")"
done
WALL=$(stat ours 1)
printf "  ours wall             %.2f s  target <= 20: %s\n" "$WALL" "$(check "$WALL" "<=" 20)"
PEAK=$(stat ours 4)
printf "  ours peak RSS         %s MB  target < 256: %s\n" "$(mb "$PEAK")" "$(check "$PEAK" "<=" $((256 * 1024)))"
R=$(ratio peer ours 1)
printf "  peer / ours           %s (cpu %s)  target >= 5: %s\n" "$R" "$(ratio peer ours 23)" "$(check "$R" ">=" 5)"

echo "Our steps, median seconds of the rounds (wall, from the trace):"
awk -F'\t' '!($2 in seen) { seen[$2] = 1; order[++n] = $2 } { v[$2] = v[$2] " " $3 }
  END { for (i = 1; i <= n; ++i) print order[i] "\t" v[order[i]] }' "$WORK/steps.txt" |
  while IFS=$'\t' read -r aStep aValues; do
    printf "  %-36s %8.3f\n" "$aStep" "$(tr ' ' '\n' <<<"$aValues" | sed '/^$/d' | median)"
  done
echo "Peer, last round:"
sed 's/^/  /' "$WORK/peer_report.txt"

# Quarter means of the ramp 0.2 + 0.75 x / (SIDE - 1) over the columns.
TRUTH=$(awk -v n="$SIDE" 'BEGIN { q = int(n / 4); for (i = 0; i < 4; ++i)
  printf "%.3f ", 0.2 + 0.75 * (i * q + (q - 1) / 2) / (n - 1) }')
OURS=$("$PYTHON" "$PEER" --means "$WORK/pair_cc" "$SIDE" "$SIDE")
PEERM=$("$PYTHON" "$PEER" --means "$WORK/peer_cc" "$SIDE" "$SIDE")
echo "Coherence means over the column quarters:"
printf "  %-44s %s\n" "truth" "$TRUTH" "ours (filtered, the product)" "$OURS" "peer (filtered)" "$PEERM" \
  "ours before the filter (_dint, 5x5)" \
  "$("$PYTHON" "$PEER" --coherence "$WORK/pair_dint" "$WORK/pair_1_pwr" "$WORK/pair_2_pwr" "$SIDE" "$SIDE")" \
  "peer before the filter" \
  "$("$PYTHON" "$PEER" --coherence "$WORK/peer_dint" "$WORK/peer_mpwr" "$WORK/peer_spwr" "$SIDE" "$SIDE")"
AGREE=$(awk -v a="$OURS" -v b="$PEERM" 'BEGIN { split(a, x, " "); split(b, y, " "); d = 0
  for (i = 1; i <= 4; ++i) { e = x[i] - y[i]; if (e < 0) e = -e; if (e > d) d = e }; printf "%.3f", d }')
printf "  ours - peer, largest  %s  target <= 0.03: %s\n" "$AGREE" "$(check "$AGREE" "<=" 0.03)"
# The quick-look as a GIS reads it: one 8-bit band of the raster's size.
if "$PYTHON" -c "import osgeo" 2>/dev/null; then
  "$PYTHON" -c "
import sys
from osgeo import gdal
d = gdal.Open(sys.argv[1])
ok = d is not None and (d.RasterXSize, d.RasterYSize, d.RasterCount) == (int(sys.argv[2]),) * 2 + (1,)
sys.exit(0 if ok and d.GetRasterBand(1).DataType == gdal.GDT_Byte else 1)" "$WORK/pair_cc.tif" "$SIDE" ||
    { echo "bench_coherence_command: $WORK/pair_cc.tif is not an 8-bit ${SIDE}x$SIDE GeoTIFF" >&2; exit 1; }
else
  [[ -s "$WORK/pair_cc.tif" ]] || { echo "bench_coherence_command: no quick-look $WORK/pair_cc.tif" >&2; exit 1; }
fi
((PEAK < 256 * 1024)) || { echo "bench_coherence_command: peak RSS not below 256 MB" >&2; exit 1; }
# Timing a chain that computes something else would mean nothing.
[[ $(check "$AGREE" "<=" 0.03) == ok ]] ||
  { echo "bench_coherence_command: our coherence and the peer's differ by $AGREE" >&2; exit 1; }
