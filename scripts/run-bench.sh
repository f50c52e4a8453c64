#!/usr/bin/env bash
# Runs every benchmark program of a build (BUILD_DIR/bin/bench_*), then the whole-process
# scale run of evwatch against camsim (bench/scale.py).
#
# Usage: scripts/run-bench.sh BUILD_DIR [extra arguments for bench/scale.py]
set -euo pipefail
cd "$(dirname "$0")/.."
build=${1:?usage: scripts/run-bench.sh BUILD_DIR}
shift

status=0
for program in "$build"/bin/bench_*; do
  [ -x "$program" ] || continue
  echo "== $(basename "$program")"
  "$program" || status=1
done

echo "== scale"
python3 bench/scale.py "$build" "$@" || status=1
exit $status
