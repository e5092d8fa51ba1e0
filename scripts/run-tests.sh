#!/bin/sh
# run-tests.sh PRESET [CTEST-ARGUMENT...]: runs the tests that are built in build/PRESET.
set -eu
cd "$(dirname "$0")/.."

preset=$1
shift

# The thread sanitizer of g++ 12 cannot place its shadow memory where the kernel spreads mappings
# over more than 28 bits.
run=
if [ "$preset" = tsan ] && [ "$(cat /proc/sys/vm/mmap_rnd_bits 2>/dev/null || echo 0)" -gt 28 ]; then
    run="setarch $(uname -m) -R"
fi

exec $run ctest --preset "$preset" --no-tests=error -j "${JOBS:-$(nproc)}" "$@"
