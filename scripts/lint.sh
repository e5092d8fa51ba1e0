#!/bin/sh
# lint.sh [format] [includes] [tidy | tidy_product]: the checks that need no running program; without
# arguments format, includes and tidy. tidy_product leaves out tests, benchmarks and fuzz targets.
set -eu
cd "$(dirname "$0")/.."

jobs=${JOBS:-$(nproc)}

check_format() {
    echo "== clang-format"
    git ls-files -z '*.h' '*.cpp' | xargs -0 -r clang-format-19 --dry-run --Werror
}

check_includes() {
    echo "== include directions"
    git ls-files '*.h' '*.cpp' | awk -f scripts/check-includes.awk
}

# Only the project's own sources that the release build compiles; headers are seen through them.
# -w: the compiler's own warnings are g++'s business, whose options clang does not all know.
# What clang-tidy says besides its findings (progress, counts) goes to a file.
check_tidy() {
    echo "== clang-tidy"
    cmake --preset release >/dev/null
    sed -n 's/^ *"file": "\(.*\)".*/\1/p' build/release/compile_commands.json | sort -u |
        grep -v "${1:-^$}" |
        xargs -r -P "$jobs" -n 4 clang-tidy-19 -p build/release --quiet \
            --extra-arg=-w --extra-arg=-Wno-unknown-warning-option 2>build/release/clang-tidy.log ||
        {
            echo "clang-tidy failed; its other output is in build/release/clang-tidy.log" >&2
            return 1
        }
}

check_tidy_product() {
    check_tidy "^$PWD/\(tests\|bench\|fuzz\)/"
}

[ $# -gt 0 ] || set -- format includes tidy
for check in "$@"; do
    "check_$check"
done
echo "lint: clean"
