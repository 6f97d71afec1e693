# bare_root.sh - the least that is a Debian 12, in a directory: for script/fresh and tests/package/clean_root.sh, which source
# this. As root, with debootstrap.
#
# Packages come from the mirror that this machine's apt uses, on the way on which its apt reaches it.

# Where Debian's packages come from.
bare_root_mirror() {
    local mirror
    mirror=$(grep -hoE 'https?://[^ ]+/debian/?( |$)' /etc/apt/sources.list /etc/apt/sources.list.d/* 2>/dev/null | head -1) || true
    echo "${mirror:-http://deb.debian.org/debian}"
}

# Unpacks a kept root. Usage: bare_root_unpack ARCHIVE ROOT
bare_root_unpack() {
    rm -rf --one-file-system "$2"
    mkdir -p "$2"
    tar -C "$2" -xf "$1"
    cp /etc/resolv.conf "$2/etc/resolv.conf"
}

# Keeps a root as it is, without downloaded packages. Usage: bare_root_keep ARCHIVE ROOT
bare_root_keep() {
    rm -f "$2"/var/cache/apt/archives/*.deb
    tar -C "$2" -cf "$1.new" .
    mv "$1.new" "$1"
}

# A bare root, made the first time, which takes two minutes, and kept. Usage: bare_root ARCHIVE ROOT [PACKAGE...]
bare_root() {
    local archive=$1 root=$2 proxy=
    shift 2
    if [ ! -f "$archive" ]; then
        rm -rf --one-file-system "$root"
        eval "$(apt-config shell proxy Acquire::http::Proxy)"
        # What it mounts is seen by no other process and ends with it, and it ends with us.
        http_proxy=${http_proxy:-$proxy} setpriv --pdeathsig KILL unshare --mount debootstrap --variant=minbase \
            ${*:+--include="$(IFS=,; echo "$*")"} bookworm "$root" "$(bare_root_mirror)" >"$archive.log" 2>&1 ||
            { tail -20 "$archive.log" >&2; return 1; }
        # The way of this machine to its mirror, and whom it trusts.
        apt-config dump Acquire::http Acquire::https | grep '::' >"$root/etc/apt/apt.conf.d/90machine" || true
        if [ -d "$root/usr/share/ca-certificates" ] && [ -d /usr/local/share/ca-certificates ]; then
            cp -r /usr/local/share/ca-certificates/. "$root/usr/local/share/ca-certificates"
            chroot "$root" update-ca-certificates >>"$archive.log" 2>&1
        fi
        bare_root_keep "$archive" "$root"
    fi
    bare_root_unpack "$archive" "$root"
}
