#!/bin/sh
# fresh-check.sh FOLDER [TARGET...]: runs `make TARGET` (default: demo, then test), each in a Debian
# root of its own that has nothing but git, make and ca-certificates, to show that the Makefile
# installs all that it needs. Needs root and debootstrap; packages come from where this machine's
# apt gets them. What is committed at HEAD is checked. FOLDER/base is made once and kept; the roots
# FOLDER/TARGET are made anew, and kept for a look.
set -eu
repository=$(cd "$(dirname "$0")/.." && pwd)
suite=bookworm

[ $# -ge 1 ] || {
    sed -n '2,6s/^# //p' "$0" >&2
    exit 2
}
mkdir -p "$1"
folder=$(cd "$1" && pwd)
shift
[ $# -gt 0 ] || set -- demo test
root=

mount_kernel_files() {
    mount -t proc proc "$root/proc"
    mount -t sysfs -o ro sysfs "$root/sys"
    mount --bind /dev "$root/dev"
    # Else what is mounted below would show up in the machine's own /dev.
    mount --make-private "$root/dev"
    mount -t tmpfs tmpfs "$root/dev/shm"
    mount -t tmpfs tmpfs "$root/run"
}

unmount_kernel_files() {
    [ -n "$root" ] || return 0
    for place in run dev/shm dev sys proc; do
        if mountpoint -q "$root/$place"; then
            umount "$root/$place"
        fi
    done
}

make_base() {
    [ ! -e "$folder/base/.complete" ] || return 0
    mirror=$(apt-get indextargets --format '$(REPO_URI) $(CODENAME)' |
        sed -n "s/ $suite\$//p" | head -n 1)
    debootstrap --variant=minbase --include=git,make,ca-certificates \
        "$suite" "$folder/base" "$mirror"
    rm -f "$folder/base/etc/apt/sources.list"
    cp -a /etc/apt/sources.list* /etc/apt/apt.conf.d "$folder/base/etc/apt/"
    cp /etc/resolv.conf "$folder/base/etc/"
    : >"$folder/base/.complete"
}

remove_root() {
    ! mountpoint -q "$root/dev" || {
        echo "fresh-check.sh: $root is in use" >&2
        exit 1
    }
    rm -rf --one-file-system "$root"
}

check() {
    root=$folder/$1
    remove_root
    cp -a "$folder/base" "$root"
    git clone -q --no-local "$repository" "$root/root/zpd"
    mount_kernel_files
    start=$(date +%s)
    result=passed
    env -i PATH=/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin HOME=/root TERM=dumb \
        chroot "$root" make -C /root/zpd "$1" </dev/null || result=FAILED
    unmount_kernel_files
    echo "fresh-check.sh: make $1 $result in $(($(date +%s) - start)) s"
    [ "$result" = passed ] || failed=1
}

trap unmount_kernel_files EXIT
failed=0
make_base
for target in "$@"; do
    check "$target"
done
exit $failed
