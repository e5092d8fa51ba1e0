#!/bin/sh
# build.sh PRESET TARGET...: configures build/PRESET and builds the targets there.
# JOBS is the number of compilers at a time (default: one for each processor).
set -eu
cd "$(dirname "$0")/.."

preset=$1
shift
# Programs that were found missing earlier may have been installed since.
cmake --preset "$preset" >/dev/null
cmake --build --preset "$preset" -j "${JOBS:-$(nproc)}" --target "$@"
