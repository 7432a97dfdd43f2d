#!/usr/bin/env bash
# An example prints the output in the file beside it, in an empty directory of its own. Ends with 77,
# for skipped, where the program needs root and the caller is somebody else.
#
#   program_test.sh PROGRAM EXPECTED-OUTPUT [root]
set -euo pipefail

if [[ ${3:-} == root ]] && ((EUID != 0)); then
    exit 77
fi
work=$(mktemp -d)
trap 'rm -rf "$work" "/tmp/.orvadr_lock$work"' EXIT
cd "$work"
"$1" >"$work.out" && status=0 || status=$?
mv "$work.out" "$work/output of the program"
diff -u "$2" "$work/output of the program"
exit "$status"
