#!/usr/bin/env bash
# Time and memory against size for wide plans and data, on one core:
#   fit       mcsim fit of a C-column, 200-row CSV file of correlated fields (gen_wide csv),
#             writing the plan (a C-input correlation matrix: C(C+1)/2 cells)
#   simulate  mcsim simulate of that plan, 10,000 cases (reading it, the correlation model of
#             C(C−1)/2 pairs, the run, the report)
#   categ     mcsim simulate of a plan with one Categorical of K categories, 10,000 cases
#   read      plan_sizes read of a plan of N inputs with every cell of its correlation matrix
#   write     plan_sizes write of the same plan
#
#   bench/sizes.sh BUILD_DIR [BEFORE_BUILD_DIR]
#
# Every row runs ROUNDS times (3) under /usr/bin/time pinned to one core; with a second build
# folder its tree is the other contender, run alternately with the first in every round, so
# that both see the same load. The floor of each row is the same command on the smallest input
# of its kind (2 columns, 2 categories, 2 inputs): the start-up and fixed costs. Prints one
# Markdown table of medians, with the spread (smallest to largest) of the CPU time, and the
# load average before and after.
#
# A run that takes longer than LIMIT seconds (300) is stopped and shown as "> LIMIT"; its tree
# is not run again on that work (larger sizes only take longer). A tree without plan_sizes
# shows "-" for the read and write rows.
#
# Environment: ROUNDS (3), CORE (0), LIMIT, OUT_DIR (BUILD_DIR/sizes), and the sizes: FIT_SIZES
# ("125 250 500 1000"), CATEG_SIZES ("12500 25000 50000 100000"), MATRIX_SIZES
# ("375 750 1500 3000"), CASES (10000).
set -euo pipefail

build=$(realpath "${1:?usage: bench/sizes.sh BUILD_DIR [BEFORE_BUILD_DIR]}")
before=${2:+$(realpath "$2")}
out=$(realpath -m "${OUT_DIR:-$build/sizes}")
rounds=${ROUNDS:-3}
limit=${LIMIT:-300}
core=${CORE:-0}
cases=${CASES:-10000}
fit_sizes=${FIT_SIZES:-125 250 500 1000}
categ_sizes=${CATEG_SIZES:-12500 25000 50000 100000}
matrix_sizes=${MATRIX_SIZES:-375 750 1500 3000}
mkdir -p "$out"
gen=$build/bin/gen_wide

# ---------------------------------------------------------------------------------------------
# Inputs

"$gen" model "$out/wide.model"
for c in 2 $fit_sizes; do
    [ -f "$out/data$c.csv" ] || "$gen" csv "$out/data$c.csv" "$c" 200
done
for k in 2 $categ_sizes; do
    [ -f "$out/categ$k.xml" ] || "$gen" categorical "$out/categ$k.xml" "$k"
done
for n in 2 $matrix_sizes; do
    [ -f "$out/matrix$n.xml" ] || "$gen" matrix "$out/matrix$n.xml" "$n"
done

# ---------------------------------------------------------------------------------------------
# Runs

# run TREE KIND SIZE: runs one command of the tree in TREE; prints "cpu_seconds peak_mb".
run() {
    local tree=$1 kind=$2 size=$3 tag
    tag=$(name "$tree")
    local cmd
    case $kind in
    fit) cmd=("$tree/bin/mcsim" fit "$out/data$size.csv" --threads 1 --model "$out/wide.model"
              -o "$out/plan$size.$tag.xml") ;;
    simulate) cmd=("$tree/bin/mcsim" simulate "$out/plan$size.$tag.xml" --threads 1
                   --cases "$cases") ;;
    categ) cmd=("$tree/bin/mcsim" simulate "$out/categ$size.xml" --threads 1 --cases "$cases") ;;
    read) cmd=("$tree/bin/plan_sizes" read "$out/matrix$size.xml") ;;
    write) cmd=("$tree/bin/plan_sizes" write "$out/matrix$size.xml" "$out/written$size.xml") ;;
    esac
    if [ ! -x "${cmd[0]}" ]; then
        echo "- -"
        return
    fi
    local status=0
    timeout "$limit" /usr/bin/time -f "%U %S %M" -o "$out/time.txt" taskset -c "$core" \
        "${cmd[@]}" >"$out/last.out" 2>"$out/last.err" || status=$?
    if [ "$status" -eq 124 ]; then
        echo "timeout timeout"
        return
    elif [ "$status" -ne 0 ]; then
        echo "sizes: failed: ${cmd[*]}" >&2
        cat "$out/last.err" >&2
        echo "failed failed"
        return
    fi
    awk '{ printf "%.3f %.0f\n", $1 + $2, $3 / 1024 }' "$out/time.txt"
}

# stats VALUES...: "median (min–max)" of the values; a word (timeout, failed, -) when one is.
stats() {
    [ $# -eq 0 ] && { echo "> $limit"; return; }
    local word
    word=$(printf '%s\n' "$@" | grep -v '^[0-9.]*$' | head -1)
    if [ -n "$word" ]; then
        [ "$word" = timeout ] && word="> $limit"
        echo "$word"
        return
    fi
    printf '%s\n' "$@" | sort -g | awk '{ v[NR] = $1 } END {
        m = NR % 2 ? v[(NR + 1) / 2] : (v[NR / 2] + v[NR / 2 + 1]) / 2
        printf "%.3g (%.3g–%.3g)", m, v[1], v[NR] }'
}
median() {
    [ $# -eq 0 ] && { echo "-"; return; }
    local word
    word=$(printf '%s\n' "$@" | grep -v '^[0-9.]*$' | head -1)
    if [ -n "$word" ]; then
        echo "-"
        return
    fi
    printf '%s\n' "$@" | sort -g | awk '{ v[NR] = $1 } END {
        printf "%.0f", NR % 2 ? v[(NR + 1) / 2] : (v[NR / 2] + v[NR / 2 + 1]) / 2 }'
}

# name TREE: the build folder's name with its parent's, as the table shows it ("main/build").
name() {
    echo "$(basename "$(dirname "$1")")/$(basename "$1")" | tr '/' '-'
}

trees=("$build")
[ -n "$before" ] && trees+=("$before")
given_up=()

# row KIND SIZE FLOOR_SIZE: one table row per tree.
row() {
    local kind=$1 size=$2 floor=$3 r t c m
    declare -A cpu mem fcpu fmem
    for ((r = 0; r < rounds; r++)); do
        for t in "${trees[@]}"; do
            # A tree that ran out of time on this work once is not run on it again.
            if [[ " ${given_up[*]} " == *" $t:$kind "* ]]; then
                continue
            fi
            read -r c m < <(run "$t" "$kind" "$size")
            [ "$c" = timeout ] && given_up+=("$t:$kind")
            cpu[$t]+="$c "
            mem[$t]+="$m "
            read -r c m < <(run "$t" "$kind" "$floor")
            fcpu[$t]+="$c "
            fmem[$t]+="$m "
        done
    done
    for t in "${trees[@]}"; do
        # shellcheck disable=SC2086
        printf '| %s | %s | %s | %s | %s | %s | %s |\n' "$kind" "$size" "$(name "$t")" \
            "$(stats ${cpu[$t]:-})" "$(median ${mem[$t]:-})" "$(stats ${fcpu[$t]:-})" \
            "$(median ${fmem[$t]:-})"
    done
}

echo "load average before: $(cut -d' ' -f1-3 /proc/loadavg)"
echo
echo "| Work | Size | Tree | CPU s, median (spread) | Peak MB | Floor CPU s | Floor MB |"
echo "|---|---:|---|---:|---:|---:|---:|"
for c in $fit_sizes; do
    row fit "$c" 2
    # The fitted plans of the fit rows, and the floor's, are what simulate reads.
    for t in "${trees[@]}"; do
        [ -f "$out/plan2.$(name "$t").xml" ] || run "$t" fit 2 >/dev/null
    done
    row simulate "$c" 2
done
for k in $categ_sizes; do
    row categ "$k" 2
done
for n in $matrix_sizes; do
    row read "$n" 2
    row write "$n" 2
done
echo
echo "load average after: $(cut -d' ' -f1-3 /proc/loadavg)"
