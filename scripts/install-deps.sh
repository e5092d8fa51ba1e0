#!/bin/sh
# install-deps.sh GROUP...: installs the Debian packages of the groups that are not there yet.
# Groups: build test demo bench fuzz lint. Says what it installs; silent when nothing is missing.
set -eu

packages_of() {
    case $1 in
    build)
        echo g++ cmake ninja-build ccache pkg-config libasio-dev libexpat1-dev libsqlite3-dev \
            libssl-dev systemtap-sdt-dev libcli11-dev nlohmann-json3-dev libsystemd-dev libseccomp-dev
        ;;
    test) echo libgtest-dev libgmock-dev binutils ;;
    demo | bench) ;;
    fuzz) echo clang-19 libclang-rt-19-dev llvm-19 ;;
    lint) echo git clang-format-19 clang-tidy-19 ;;
    *)
        echo "install-deps.sh: unknown group: $1" >&2
        exit 2
        ;;
    esac
}

is_installed() {
    [ "$(dpkg-query -W -f '${db:Status-Status}' "$1" 2>/dev/null)" = installed ]
}

as_root() {
    if [ "$(id -u)" -eq 0 ]; then
        "$@"
    else
        sudo "$@"
    fi
}

missing=
for group in "$@"; do
    for package in $(packages_of "$group"); do
        is_installed "$package" || missing="$missing $package"
    done
done
[ -n "$missing" ] || exit 0

echo "Installing what is missing:$missing"
# The lists are split into words on purpose.
# shellcheck disable=SC2086
{
    as_root apt-get update -q
    as_root env DEBIAN_FRONTEND=noninteractive \
        apt-get install -q -y --no-install-recommends $missing
}
