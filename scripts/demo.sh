#!/usr/bin/env bash
# Runs the bundled example end to end on a built tree (argument: the build folder): `mcsim demo`
# fits the distributions of examples/data/sales.csv, writes the plan and simulates it with
# examples/models/profit.model.
set -euo pipefail
build="${1:-build}"
here="$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)"
if [ ! -x "$build/bin/mcsim" ]; then
    echo "demo: $build/bin/mcsim was not built" >&2
    exit 1
fi
"$build/bin/mcsim" demo --examples "$here/examples"
