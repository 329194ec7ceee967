#!/usr/bin/env bash
# Runs every benchmark executable of a build folder: bench/run.sh <build folder> [extra flags]
# Each <build>/bin/*_bench runs with a short minimum time per case; extra arguments are passed
# on to every executable (for example --benchmark_filter=Gamma).
set -euo pipefail

if [[ $# -lt 1 ]]; then
    echo "usage: $0 <build folder> [benchmark flags...]" >&2
    exit 2
fi
build="$1"
shift
bin="${build%/}/bin"
if [[ ! -d "$bin" ]]; then
    echo "$0: no folder $bin (build the *_bench targets first)" >&2
    exit 2
fi

shopt -s nullglob
benches=("$bin"/*_bench)
if [[ ${#benches[@]} -eq 0 ]]; then
    echo "$0: no *_bench executable in $bin" >&2
    exit 1
fi

status=0
for exe in "${benches[@]}"; do
    [[ -x "$exe" ]] || continue
    echo "== $(basename "$exe")"
    "$exe" --benchmark_min_time=0.2 "$@" || status=1
done
exit "$status"
