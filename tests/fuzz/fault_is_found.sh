#!/bin/sh
# A fault on purpose is found, and kept: a fuzz target that passes has looked. Usage: fault_is_found.sh TARGET CORPUS WORK; the
# corpus alone must not have the fault.
set -u
target=$1 corpus=$2 work=$3
rm -rf "$work"
mkdir -p "$work/corpus"
fail() { tail -20 "$work/said"; echo "fault_is_found.sh: $*"; exit 1; }

"$target" -runs=0 "$work/corpus" "$corpus" >"$work/said" 2>&1 || fail "the seeds alone end it"
"$target" -max_total_time=60 -verbosity=0 -artifact_prefix="$work/" "$work/corpus" "$corpus" >"$work/said" 2>&1 && fail "nothing found"
grep -q 'AddressSanitizer: heap-buffer-overflow' "$work/said" || fail "it ended otherwise"
grep -q 'in keep_start_line' "$work/said" || fail "found elsewhere"
"$target" "$work"/crash-* >"$work/said" 2>&1 && fail "the kept input doesn't show it again"
grep 'SUMMARY: AddressSanitizer' "$work/said"
