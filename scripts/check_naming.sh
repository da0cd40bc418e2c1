#!/usr/bin/env bash
# The naming check of CONVENTIONS.md: clang-tidy's identifier naming over
# every translation unit of the program, the simulator, the tests and the
# fuzz targets, with the compile commands of a build folder.
# Usage: scripts/check_naming.sh [build-dir]
set -euo pipefail
top=$(cd "$(dirname "$0")/.." && pwd)
build=${1:-$top/build}
[ -f "$build/compile_commands.json" ] ||
  cmake -S "$top" -B "$build" -DCMAKE_EXPORT_COMPILE_COMMANDS=ON >/dev/null
tidy=$(command -v clang-tidy || command -v clang-tidy-14)
# clang does not know GCC's vectoriser options: a copy of the compile
# commands without them.
db=$(mktemp -d)
sed 's/-fvect-cost-model=dynamic//g' "$build/compile_commands.json" >"$db/compile_commands.json"
mapfile -t units < <(cd "$top" && git ls-files 'source/*.cpp' 'tools/*.cpp' 'tests/*.cpp' 'fuzz/*.cpp')
log=$(mktemp)
trap 'rm -rf "$log" "$db"' EXIT
printf '%s\n' "${units[@]}" | (cd "$top" && xargs -P "$(nproc)" -n 4 "$tidy" -p "$db" --quiet) >"$log" 2>&1 || true
if grep -q "error:" "$log"; then
  grep "error:" "$log" | sort -u
  echo "naming check: $(grep -c "error:" "$log") names break CONVENTIONS.md"
  exit 1
fi
echo "naming check: ${#units[@]} units follow CONVENTIONS.md"
