#!/usr/bin/env bash
# Builds the libFuzzer targets (tests/fuzz) with clang in build-fuzz and runs each of them for
# SECONDS seconds (default 60) on a scratch copy of its seed corpus under tests/fuzz/corpus, so
# that nothing the fuzzer finds or adds is written into the repository. The targets run side by
# side, one log each. Any finding (a crash, a sanitizer report, a leak, an input slower than
# FUZZ_TIMEOUT seconds or one that needs more than FUZZ_RSS_MB of memory) fails the script; the
# scratch folder with the log and the input that caused it is kept and named.
#
#   scripts/fuzz.sh [SECONDS]        environment: FUZZ_BUILD_DIR (build-fuzz), FUZZ_JOBS (nproc)
set -euo pipefail

seconds="${1:-60}"
if ! [[ "$seconds" =~ ^[0-9]+$ ]] || [ "$seconds" -lt 1 ]; then
    echo "usage: $0 [SECONDS]" >&2
    exit 2
fi
here="$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)"
build="${FUZZ_BUILD_DIR:-$here/build-fuzz}"
jobs="${FUZZ_JOBS:-$(nproc)}"
timeout="${FUZZ_TIMEOUT:-25}"
rss="${FUZZ_RSS_MB:-2048}"
targets=(plan csv model)

if ! command -v clang++ >/dev/null 2>&1; then
    echo "fuzz: clang++ is needed (scripts/install-deps.sh installs it)" >&2
    exit 2
fi

CC=clang CXX=clang++ cmake -S "$here" -B "$build" -DMCSIM_FUZZ=ON -DMCSIM_BUILD_TESTS=OFF \
    -DMCSIM_BUILD_BENCH=OFF >/dev/null
cmake --build "$build" -j "$jobs" --target "${targets[@]/#/fuzz_}"

work="$(mktemp -d "${TMPDIR:-/tmp}/mcsim-fuzz.XXXXXX")"
pids=()
for t in "${targets[@]}"; do
    mkdir -p "$work/$t/corpus" "$work/$t/artifacts"
    cp "$here/tests/fuzz/corpus/$t/"* "$work/$t/corpus/"
    args=(-max_total_time="$seconds" -timeout="$timeout" -rss_limit_mb="$rss"
          -print_final_stats=1 -artifact_prefix="$work/$t/artifacts/")
    if [ -f "$here/tests/fuzz/$t.dict" ]; then
        args+=(-dict="$here/tests/fuzz/$t.dict")
    fi
    # The scratch folder is the working folder: a target's own scratch files land there.
    (cd "$work/$t" && TMPDIR="$work/$t" exec "$build/bin/fuzz_$t" "${args[@]}" corpus \
        >"$work/$t/log.txt" 2>&1) &
    pids+=($!)
done

failed=()
for i in "${!targets[@]}"; do
    t="${targets[$i]}"
    if ! wait "${pids[$i]}"; then
        failed+=("$t")
    fi
    runs="$(grep -o 'stat::number_of_executed_units: *[0-9]*' "$work/$t/log.txt" |
        grep -o '[0-9]*$' || echo '?')"
    echo "fuzz_$t: $runs inputs in ${seconds}s"
done

if [ ${#failed[@]} -gt 0 ]; then
    for t in "${failed[@]}"; do
        echo "fuzz_$t found a problem; its log ends:" >&2
        tail -n 40 "$work/$t/log.txt" >&2
        echo "inputs that caused it: $(ls "$work/$t/artifacts" | sed "s|^|$work/$t/artifacts/|")" >&2
        echo "reproduce: $build/bin/fuzz_$t <input>" >&2
    done
    echo "fuzz: scratch folder kept: $work" >&2
    exit 1
fi
rm -rf "$work"
