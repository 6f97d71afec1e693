#!/bin/sh
# Hosts built from the packages alone, extracted next to the system. Usage: extracted.sh WAY PACKAGES WORK; see
# build_and_run_host.sh.
set -eu
root=$3/root
rm -rf "$root"
mkdir -p "$root"
for package in "$2"/*.deb; do
    dpkg -x "$package" "$root"
done
exec sh "$(dirname "$0")/build_and_run_host.sh" "$1" "$root/usr" "$3/$1"
