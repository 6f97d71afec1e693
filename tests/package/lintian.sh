#!/bin/sh
# The packages as lintian sees them: no error, no warning. Usage: lintian.sh PACKAGES. Exit status 77: skipped, without lintian.
set -eu
command -v lintian >/dev/null || { echo "skipped: lintian is not installed"; exit 77; }
TMPDIR=$(mktemp -d) # it leaves files
export TMPDIR
trap 'rm -r "$TMPDIR"' EXIT
lintian --allow-root --fail-on error,warning --tag-display-limit 0 "$1"/*.deb
