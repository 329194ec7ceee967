#!/usr/bin/env bash
# The threaded tests under ThreadSanitizer: configures BUILD (default build-tsan) with
# -DMCSIM_SANITIZE=thread, builds only the test executables that hold a threaded test, and runs
# the tests whose names match TSAN_TESTS: thread groups and services, the fitting's worker tasks
# and cancellation, the NORTA pairs, the simulation workers.
#
#   scripts/tsan.sh [BUILD] [JOBS] [CMake options...]
set -euo pipefail

here="$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)"
build="${1:-$here/build-tsan}"
jobs="${2:-$(nproc)}"
shift $(($# < 2 ? $# : 2))
pattern="${TSAN_TESTS:-Thread|Cancel|Parallel|Concurren|Worker|Norta}"

# A test executable per folder of tests/ (tests/services/math -> test_services_math); a folder
# is built when one of its test or instantiation lines names a matching test.
cd "$here"
mapfile -t targets < <(
    grep -rlE "^(TEST|TEST_F|TEST_P|INSTANTIATE_TEST_SUITE_P)\(.*(${pattern})" tests \
        --include='*_test.cpp' | sed -E 's|^tests/(.*)/[^/]*$|test_\1|; s|/|_|g' | sort -u)
if [ ${#targets[@]} -eq 0 ]; then
    echo "tsan: no test matches '${pattern}'" >&2
    exit 1
fi

cmake -S "$here" -B "$build" -DMCSIM_SANITIZE=thread -DMCSIM_BUILD_BENCH=OFF "$@" >/dev/null
cmake --build "$build" -j "$jobs" --target "${targets[@]}"
# A report fails the test (exit code 66); both stacks of a lock-order problem are shown.
export TSAN_OPTIONS="${TSAN_OPTIONS:-second_deadlock_stack=1}"
cd "$build"
ctest --output-on-failure -j "$jobs" -R "${pattern}"
