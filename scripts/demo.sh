#!/usr/bin/env bash
# Demo: builds and installs the program, then runs it as a host would in a
# fresh working folder and shows what the host gets back.
set -euo pipefail
top=$(cd "$(dirname "$0")/.." && pwd)
prefix=$top/install
out=${TLRX_DEMO_DIR:-$top/demo_out}

"$top/scripts/setup.sh" "$top/build" >/dev/null
cmake --install "$top/build" --prefix "$prefix" >/dev/null
rm -rf "$out" && mkdir -p "$out"
export TELLURIX_WORKING_DIR=$out TELLURIX_BATCH_DIR=$out
run() {
  printf '0\nDemo host\n' >"$out/Process.working"
  set +e
  "$prefix/bin/main_features_extraction" "$1" 2>/dev/null
  local status=$?
  set -e
  echo "== $1 -> exit status $status"
  [ -f "$out/Process.working_error" ] && { echo "-- error file:"; cat "$out/Process.working_error"; }
  rm -f "$out/Process.working_error"
}

echo "== installed under $prefix; configuration $prefix/etc/tellurix/Tellurix_configuration.ini"
run "main_principal_component_analysis#x"
run "MAIN_RATIO#args.txt"
echo "== outputs in $out"
ls -l "$out"
echo "-- end of the log:"
tail -n 12 "$out/Process.log"
