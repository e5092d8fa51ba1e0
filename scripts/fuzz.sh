#!/bin/sh
# fuzz.sh SECONDS [TARGET...]: runs the named fuzz targets of build/fuzz, or each one, for that long, as
# many at a time as JOBS says.
# New inputs are kept in build/fuzz/corpus/, seeds come from fuzz/corpus/TARGET/, words to try from
# fuzz/TARGET.dict, and what made a target fail is left in build/fuzz/failures/.
set -eu
cd "$(dirname "$0")/.."

seconds=$1
shift
mkdir -p build/fuzz/failures

# So that stacks show names; without it they still show places in the program.
if symbolizer=$(command -v llvm-symbolizer-19); then
    export ASAN_SYMBOLIZER_PATH="$symbolizer"
fi

[ $# -gt 0 ] || set -- build/fuzz/bin/fuzz_*
if [ ! -x "build/fuzz/bin/$(basename "$1")" ]; then
    echo "fuzz.sh: no fuzz target is built" >&2
    exit 1
fi

printf '%s\n' "$@" | xargs -P "${JOBS:-$(nproc)}" -I '{}' sh -c '
    target=$(basename "$1")
    corpus=build/fuzz/corpus/$target
    mkdir -p "$corpus"
    seeds=fuzz/corpus/$target
    words=
    [ ! -f "fuzz/$target.dict" ] || words=-dict=fuzz/$target.dict
    log=build/fuzz/$target.log
    if build/fuzz/bin/"$target" $words -max_total_time="$2" -timeout=10 -rss_limit_mb=2048 -print_final_stats=1 \
        -artifact_prefix=build/fuzz/failures/"$target"- "$corpus" "$seeds" >"$log" 2>&1; then
        coverage=$(sed -n "s/.*DONE *\(cov: [0-9]* ft: [0-9]*\).*/\1/p" "$log")
        echo "$target: clean, $(sed -n "s/^stat::number_of_executed_units: *//p" "$log") inputs, $coverage"
    else
        tail -n 40 "$log"
        echo "$target: FAILED, see $log"
        exit 1
    fi' fuzz '{}' "$seconds"
