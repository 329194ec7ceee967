#!/usr/bin/env bash
# Runs the bundled example end to end on a built tree (argument: the build folder).
set -euo pipefail
build="${1:-build}"
if [ -x "$build/bin/mcsim_demo" ]; then
    "$build/bin/mcsim_demo"
else
    echo "demo: $build/bin/mcsim_demo was not built" >&2
    exit 1
fi
