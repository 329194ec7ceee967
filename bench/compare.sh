#!/usr/bin/env bash
# Side-by-side benchmark of mcsim with peers doing the same work, on one core:
#   W-FIT-1  fitting a 200,000-row CSV file (bench/wfit1_data.h): mcsim fit, SciPy,
#            R fitdistrplus;
#   W-SIM-1  simulating 1,000,000 cases of six correlated inputs, one categorical input and a
#            linear target (bench/gen_wsim1.cpp): mcsim simulate, NumPy/SciPy, OpenTURNS,
#            and the same run inside the component with the target compiled
#            (simulation_bench), on one and on two cores.
#
#   bench/compare.sh [BUILD_DIR]        BUILD_DIR defaults to build-release in the repository
#
# Installs the peers' Debian packages that are missing, builds mcsim in Release in BUILD_DIR
# when needed, writes the workloads with fixed seeds, runs every row REPEAT times under
# /usr/bin/time -v pinned with taskset, checks that the answers agree, and prints one table
# (also written to OUT_DIR/table.md). Exit status 1 when a run fails or the answers disagree.
#
# Environment: REPEAT (3), OUT_DIR (BUILD_DIR/compare), CORE (0, the core of the one-core
# rows), CORES2 (0,1, the cores of the two-core row), WSIM_CASES (1000000), SEED (20261206).
set -euo pipefail

repo=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
build=$(realpath -m "${1:-$repo/build-release}")
out=$(realpath -m "${OUT_DIR:-$build/compare}")
repeat=${REPEAT:-3}
core=${CORE:-0}
cores2=${CORES2:-0,1}
cases=${WSIM_CASES:-1000000}
seed=${SEED:-20261206}
python=/usr/bin/python3 # Debian's python, which sees the Debian numpy, scipy and openturns

# ---------------------------------------------------------------------------------------------
# Packages: the peers' and the tools that time and pin the runs, only those that are missing.
install_peers() {
    local packages=(python3-numpy python3-scipy python3-openturns r-base-core
                    r-cran-fitdistrplus time util-linux)
    local missing=() p
    for p in "${packages[@]}"; do
        if ! dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q 'install ok installed'; then
            missing+=("$p")
        fi
    done
    [ ${#missing[@]} -eq 0 ] && return 0
    echo "compare: installing ${missing[*]}"
    local sudo_cmd=()
    [ "$(id -u)" -ne 0 ] && sudo_cmd=(sudo)
    export DEBIAN_FRONTEND=noninteractive
    "${sudo_cmd[@]}" apt-get update -qq
    "${sudo_cmd[@]}" apt-get install -y -qq --no-install-recommends "${missing[@]}"
}

# mcsim in Release; an existing build folder of another build type is not reconfigured.
build_mcsim() {
    bash "$repo/scripts/install-deps.sh"
    if [ -f "$build/CMakeCache.txt" ]; then
        local type
        type=$(sed -n 's/^CMAKE_BUILD_TYPE:[A-Z]*=//p' "$build/CMakeCache.txt")
        if [ "$type" != "Release" ]; then
            echo "compare: $build is a $type build; give a Release build folder" >&2
            exit 2
        fi
    else
        cmake -S "$repo" -B "$build" -DCMAKE_BUILD_TYPE=Release -DMCSIM_BUILD_TESTS=OFF \
            >/dev/null
    fi
    mkdir -p "$out"
    if ! cmake --build "$build" -j "$(nproc)" --target mcsim_cli gen_wfit1 gen_wsim1 simulation_bench \
        >"$out/build.log" 2>&1; then
        tail -n 30 "$out/build.log" >&2
        echo "compare: the build failed (whole log in $out/build.log)" >&2
        exit 2
    fi
}

install_peers
build_mcsim
load_before=$(cut -d' ' -f1-3 /proc/loadavg)
mcsim=$build/bin/mcsim
mkdir -p "$out/time" "$out/log"
rm -f "$out"/time/* "$out"/log/*
runs=$out/runs.tsv
: >"$runs"

# ---------------------------------------------------------------------------------------------
# Workloads
wfit1_rows=200000
"$build/bin/gen_wfit1" "$out/wfit1.csv" "$wfit1_rows"
"$build/bin/gen_wsim1" "$out/wsim1.xml" "$out/wsim1.model"

# run ID CORES RESULT CMD...: runs CMD REPEAT times pinned to CORES, one thread per BLAS and
# OpenMP pool; prints the comma-separated list of its time files. The command's output goes
# to log/ID.N.out and log/ID.N.err, and the RESULT file it writes is copied to
# log/ID.N.result after each run.
run() {
    local id=$1 cpus=$2 result=$3 files=() i
    shift 3
    for ((i = 1; i <= repeat; i++)); do
        rm -f "$result"
        /usr/bin/time -v -o "$out/time/$id.$i" \
            taskset -c "$cpus" env OPENBLAS_NUM_THREADS=1 OMP_NUM_THREADS=1 "$@" \
            >"$out/log/$id.$i.out" 2>"$out/log/$id.$i.err" || true
        [ -f "$result" ] && cp "$result" "$out/log/$id.$i.result"
        files+=("$out/time/$id.$i")
    done
    (IFS=,; echo "${files[*]}")
}

# row ID WORKLOAD TOOL THREADS CORES UNITS RESULT TIMES NOTE
row() {
    printf '%s\t%s\t%s\t%s\t%s\t%s\t%s\t%s\t%s\n' "$@" >>"$runs"
}

echo "compare: W-FIT-1, $wfit1_rows rows, $repeat runs each on core $core"
t=$(run fit-mcsim "$core" "$out/wfit1-fitstats.xml" \
    "$mcsim" fit "$out/wfit1.csv" --threads 1 -o "$out/wfit1-plan.xml" \
    --fit-stats "$out/wfit1-fitstats.xml")
cp "$out/log/fit-mcsim.1.out" "$out/wfit1-mcsim.txt"
row fit-mcsim W-FIT-1 mcsim 1 1 "$wfit1_rows" \
    "$out/wfit1-fitstats.xml,$out/wfit1-mcsim.txt" "$t" ""
t=$(run fit-scipy "$core" "$out/wfit1-scipy.json" \
    "$python" "$repo/bench/peers/wfit1_scipy.py" "$out/wfit1.csv" "$out/wfit1-scipy.json")
row fit-scipy W-FIT-1 SciPy 1 1 "$wfit1_rows" "$out/wfit1-scipy.json" "$t" ""
t=$(run fit-r "$core" "$out/wfit1-fitdistrplus.json" \
    Rscript "$repo/bench/peers/wfit1_fitdistrplus.R" "$out/wfit1.csv" \
    "$out/wfit1-fitdistrplus.json")
row fit-r W-FIT-1 fitdistrplus 1 1 "$wfit1_rows" "$out/wfit1-fitdistrplus.json" "$t" ""

echo "compare: W-SIM-1, $cases cases, $repeat runs each"
# The subcommand is listed by `mcsim --help` once it exists.
if "$mcsim" --help 2>/dev/null | grep -Eq '^[[:space:]]+simulate[[:space:]]'; then
    for setup in "1 $core 1" "2 $core 1" "2 $cores2 2"; do
        read -r threads cpus ncores <<<"$setup"
        id=sim-mcsim-t$threads-c$ncores
        json=$out/wsim1-mcsim-t$threads-c$ncores.json
        t=$(run "$id" "$cpus" "$json" "$mcsim" simulate "$out/wsim1.xml" --cases "$cases" \
            --seed "$seed" --threads "$threads" --json "$json")
        row "$id" W-SIM-1 mcsim "$threads" "$ncores" "$cases" "$json" "$t" ""
    done
else
    row sim-mcsim W-SIM-1 mcsim 1 1 "$cases" - - \
        "skipped: this mcsim has no simulate subcommand yet"
    echo "compare: note: $mcsim has no 'simulate' subcommand yet; its W-SIM-1 rows are skipped"
fi
t=$(run sim-numpy "$core" "$out/wsim1-numpy.json" \
    "$python" "$repo/bench/peers/wsim1_numpy.py" "$out/wsim1-numpy.json" "$cases" "$seed")
row sim-numpy W-SIM-1 NumPy/SciPy 1 1 "$cases" "$out/wsim1-numpy.json" "$t" ""
t=$(run sim-ot "$core" "$out/wsim1-openturns.json" \
    "$python" "$repo/bench/peers/wsim1_openturns.py" "$out/wsim1-openturns.json" "$cases" "$seed")
row sim-ot W-SIM-1 OpenTURNS 1 1 "$cases" "$out/wsim1-openturns.json" "$t" ""

# The same simulation inside the component, with the linear target compiled in C++ instead of
# the command's formula interpreter (bench/simulation_bench.cpp): the component's own speed.
component=$out/wsim1-component.json
: >"$component"
echo "compare: W-SIM-1 in the component, on 1 and on 2 cores"
for setup in "1 $core" "2 $cores2"; do
    read -r threads cpus <<<"$setup"
    taskset -c "$cpus" "$build/bin/simulation_bench" \
        --benchmark_filter="BM_SimulateWSim1/threads:$threads/" \
        --benchmark_repetitions="$((repeat > 5 ? repeat : 5))" --benchmark_format=json \
        >"$out/log/component-t$threads.json" 2>"$out/log/component-t$threads.err" || true
    echo "$threads $out/log/component-t$threads.json" >>"$component"
done

# ---------------------------------------------------------------------------------------------
# The table and the checks
commit=$(git -C "$repo" rev-parse --short HEAD 2>/dev/null || echo unknown)
git -C "$repo" diff --quiet HEAD 2>/dev/null || commit="$commit plus uncommitted changes"
{
    cpu=$(sed -n 's/^model name[[:space:]]*: //p' /proc/cpuinfo | head -1)
    echo "Machine: $(nproc) cores, $cpu, $(free -g | awk '/^Mem:/ {print $2}') GiB"
    echo "Date: $(date -u '+%Y-%m-%d %H:%M UTC'); commit $commit"
    echo "Load average $load_before before the runs, $(cut -d' ' -f1-3 /proc/loadavg) after"
    echo "Median of $repeat runs; one-core rows pinned with taskset -c $core"
    echo
} >"$out/header.txt"
status=0
"$python" "$repo/bench/peers/summarize.py" "$runs" "$out/table-body.md" "$component" || status=1
cat "$out/header.txt" "$out/table-body.md" >"$out/table.md"
echo
echo "compare: table written to $out/table.md"
for f in "$out"/time/*; do
    if ! grep -q 'Exit status: 0' "$f"; then
        echo "compare: a run failed: $f (logs in $out/log)" >&2
        status=1
    fi
done
exit $status
