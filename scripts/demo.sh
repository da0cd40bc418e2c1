#!/usr/bin/env bash
# Demo: builds and installs the program, simulates a small dated SAR series,
# a correlated pair and a single-look complex pair, then runs the commands as
# a host would and lists what they wrote.
set -euo pipefail
top=$(cd "$(dirname "$0")/.." && pwd)
prefix=$top/install
out=${TLRX_DEMO_DIR:-$top/demo_out}

"$top/scripts/setup.sh" "$top/build" >/dev/null
cmake --install "$top/build" --prefix "$prefix" >/dev/null
rm -rf "$out" && mkdir -p "$out"
export TELLURIX_WORKING_DIR=$out TELLURIX_BATCH_DIR=$out
sim=$prefix/bin/tlrx_simulate

# A host creates the working file, starts one command, reads the outcome.
run() {
  printf '0\nDemo host\n' >"$out/Process.working"
  set +e
  "$prefix/bin/main_features_extraction" "$1" 2>/dev/null
  local status=$?
  set -e
  echo "== ${1%%#*} -> exit status $status"
  if [ -f "$out/Process.working_error" ]; then
    echo "-- error file:"; cat "$out/Process.working_error"; rm -f "$out/Process.working_error"
  fi
}
# An argument file: a title line, then one token per line.
args() { local f=$out/$1; shift; printf '%s\n' "demo arguments" "$@" >"$f"; echo "$f"; }

echo "== simulating a 5-date UTM series (a field brightens from date 3, a no-data strip) and a correlated pair"
"$sim" series --out "$out/s" --lines 300 --pixels 320 --count 5 --utm 32N --origin 600000,5100000 --spacing 20 \
  --change 40,40,48,64,3,4 --nodata-box 200,0,56,40 --null -9999 --seed 7 >/dev/null
"$sim" pair --out "$out/p" --lines 300 --pixels 320 --coherence-ramp 0.2,0.95 --null -9999 --seed 7 >/dev/null
"$sim" series --out "$out/amp" --count 1 --units AMPLITUDE --lines 300 --pixels 320 --null -9999 \
  --nodata-box 0,0,40,40 --seed 7 >/dev/null
echo "== simulating an SLC pair: an affine shift, fringes over hills with their elevation model, coherence 0.2 to 0.95"
"$sim" slc --out "$out/c" --lines 512 --pixels 512 --shift-field 0.4,2e-4,0,-0.3,0,1e-4 --coherence-ramp 0.2,0.95 \
  --phase-ramp 0.01,0.03 --topography 20 --dem 400 --command-file "$out/coherence.xml" --seed 5 >/dev/null

"$sim" series --out "$out/g" --count 6 --lines 400 --pixels 500 --looks 4 --utm 32N --origin 600000,5100000 \
  --spacing 20 --change 100,150,80,120,4,6 --trend 250,300,100,150,1.5 --nodata-box 300,0,60,80 --null -9999 \
  --image-origin 3:600010,5099990 --image-spacing 5:40 --image-size 5:200,250 --seed 7 >/dev/null
# The temporal command reads an XML parameter file.
{
  echo '<?xml version="1.0" ?>'
  echo '<HEADER_INFO>'
  echo '   <MAIN_CMD>'
  echo '      <input_file_list>'
  echo '         <VectorString NumberOfElements = "6">'
  for k in 1 2 3 4 5 6; do echo "            <ValueString ID = \"$((k - 1))\">$out/g_0$k</ValueString>"; done
  echo '         </VectorString>'
  echo '      </input_file_list>'
  echo "      <out_root_file_name>$out/mt</out_root_file_name>"
  for key in mean std median max_less_min_sup date_max date_min_before_max out_db make_tiff; do
    echo "      <$key>OK</$key>"
  done
  echo '      <interp_type>bilinear_interpolation</interp_type>'
  echo '      <saturation_default>0.33</saturation_default>'
  echo '      <TellurixEnvironment>IDL_ENVI_ENV</TellurixEnvironment>'
  echo '   </MAIN_CMD>'
  echo '</HEADER_INFO>'
} >"$out/temporal.xml"

run "main_principal_component_analysis#x"
run "main_min_and_max#$(args minmax.txt "$out/s_list.txt" "$out/stack" 2 3 4 5 6 OK 0.3)"
run "main_ratio#$(args ratio.txt "$out/s_list.txt" "$out/change" 1 unused OK 0.3)"
run "main_texture#$(args texture.txt "$out/amp_01" "$out/amp_tex" 0 7 7 x OK 0)"
run "main_temporal_feature_extraction#$out/temporal.xml"
run "main_correlation#$(args correlation.txt "$out/p_1" "$out/p_2" "$out/p_coh" -9999 11 11 11 11 OK OK 0)"
run "main_coherence#$out/coherence.xml"

echo "== outputs in $out"
ls -l "$out" | grep -v -e ' s_0' -e ' p_' -e ' g_0' -e ' c_[12]' || true
echo "-- date classes of the maximum (ENVI header read by GDAL):"
gdalinfo "$out/stack_max_date" 2>/dev/null | sed -n '/Categories/,/Color Table/p' | head -8 || true
echo "-- mean texture of single-look amplitude speckle (theory 0.5227) and the coherence across the ramp:"
gdalinfo -stats "$out/amp_tex" 2>/dev/null | grep -m1 STATISTICS_MEAN || true; rm -f "$out"/*.aux.xml
gdalinfo -stats "$out/p_coh" 2>/dev/null | grep -m1 STATISTICS_MEAN || true; rm -f "$out"/*.aux.xml
echo "-- the interferometric coherence as a GeoTIFF, and its mean in bands of 128 columns (true 0.29, 0.48, 0.67, 0.86; a 5 x 5 window lifts low values):"
gdalinfo "$out/c_cc.tif" 2>/dev/null | grep -E "^Driver|^Size is|Type=" || true
for x in 0 128 256 384; do
  gdal_translate -q -of VRT -srcwin $x 16 128 480 "$out/c_cc" "$out/band.vrt" 2>/dev/null &&
    gdalinfo -stats "$out/band.vrt" 2>/dev/null | grep -m1 STATISTICS_MEAN || true
  rm -f "$out/band.vrt" "$out"/*.aux.xml
done
echo "-- end of the log:"
tail -n 8 "$out/Process.log"
