#!/usr/bin/env bash
# GeoTIFF quick-look of a simulated FLOAT amplitude raster (default 4096 x
# 4096) against gdal_translate -ot Byte -scale <min> <max> of the same raster
# read through an ENVI header, the same stretch window taken from our TIFF's
# header. Both run as whole processes under /usr/bin/time, alternately, for
# several rounds; the medians and their ratios (ours / GDAL) are printed.
#
# Usage: bench/bench_geotiff.sh [side] [rounds]    (default 4096, 5)
# The build goes to $TLRX_BENCH_BUILD (default build_bench) in Release.
set -euo pipefail
source "$(dirname "$0")/bench_common.sh"

SIDE=${1:-4096}
ROUNDS=${2:-5}
command -v gdal_translate >/dev/null || { echo "bench_geotiff: gdal_translate is not installed" >&2; exit 2; }
bench_start bench_geotiff "" bench_geotiff tlrx_simulate

"$BUILD/bin/tlrx_simulate" series --out "$WORK/scene" --count 1 --lines "$SIDE" --pixels "$SIDE" \
  --units AMPLITUDE --cell-type FLOAT --looks 1 --utm 32S >"$WORK/simulate.log" 2>&1 ||
  { cat "$WORK/simulate.log" >&2; exit 1; }
RASTER=$(head -n 1 "$WORK/scene_list.txt")
# Our own ENVI header, so GDAL reads exactly the raw raster.
cat >"$RASTER.hdr" <<EOF
ENVI
samples = $SIDE
lines = $SIDE
bands = 1
header offset = 0
file type = ENVI Standard
data type = 4
interleave = bsq
byte order = 0
EOF

# The first conversion also gives the stretch window for GDAL.
"$BUILD/bin/bench_geotiff" "$RASTER" "$WORK/ours.tif" >"$WORK/first.log" 2>&1 || { cat "$WORK/first.log" >&2; exit 1; }
field() { sed -n "s:.*<$1>\(.*\)</$1>.*:\1:p" "$WORK/ours.tif.sml" | head -n 1; }
MIN=$(field TiffMinValue)
MAX=$(field TiffMaxValue)

: >"$WORK/ours.txt"
: >"$WORK/gdal.txt"
for ((aRound = 0; aRound < ROUNDS; ++aRound)); do
  rm -f "$WORK/ours.tif" "$WORK/gdal.tif"
  timed "$BUILD/bin/bench_geotiff" "$RASTER" "$WORK/ours.tif" >>"$WORK/ours.txt"
  timed gdal_translate -q -of GTiff -ot Byte -scale "$MIN" "$MAX" "$RASTER" "$WORK/gdal.tif" >>"$WORK/gdal.txt"
done
[ -s "$WORK/ours.tif" ] && [ -s "$WORK/gdal.tif" ] || { echo "bench_geotiff: a conversion failed" >&2; exit 1; }

column() { awk -v c="$2" '{ print (c == 23) ? $2 + $3 : $c }' "$1" | median; }

MB=$(awk -v s="$SIDE" 'BEGIN { print s * s * 4 / 1048576 }')
printf "GeoTIFF quick-look of %dx%d FLOAT (%.0f MB), %d rounds, window [%s, %s]\n" "$SIDE" "$SIDE" "$MB" "$ROUNDS" \
  "$MIN" "$MAX"
printf "%-16s %9s %9s %12s %9s\n" "" "wall s" "cpu s" "peak RSS MB" "MB/s"
for aName in ours gdal; do
  aWall=$(column "$WORK/$aName.txt" 1)
  aCpu=$(column "$WORK/$aName.txt" 23)
  aRss=$(column "$WORK/$aName.txt" 4)
  printf "%-16s %9.3f %9.3f %12.1f %9.1f\n" "$([ $aName = ours ] && echo bench_geotiff || echo gdal_translate)" \
    "$aWall" "$aCpu" "$(awk -v k="$aRss" 'BEGIN { print k / 1024 }')" "$(awk -v m="$MB" -v w="$aWall" 'BEGIN { print m / w }')"
done
awk -v ow="$(column "$WORK/ours.txt" 1)" -v gw="$(column "$WORK/gdal.txt" 1)" \
    -v oc="$(column "$WORK/ours.txt" 23)" -v gc="$(column "$WORK/gdal.txt" 23)" \
    -v orss="$(column "$WORK/ours.txt" 4)" -v grss="$(column "$WORK/gdal.txt" 4)" \
    'BEGIN { printf "ratio ours/GDAL: wall %.2f, cpu %.2f, peak RSS %.2f\n", ow / gw, oc / gc, orss / grss }'
PEAK=$(column "$WORK/ours.txt" 4)
if ((PEAK > 32 * 1024)); then
  echo "bench_geotiff: peak RSS ${PEAK} kB above 32 MB" >&2
  exit 1
fi
