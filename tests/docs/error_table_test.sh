#!/usr/bin/env bash
# The table of docs/errors.md has the numbers, names and meanings of the header, in its order, and the
# source names the same codes.
#
#   error_table_test.sh SOURCE-DIRECTORY
set -euo pipefail
cd "$1"

# "401 BAD_PARAMETER an argument is missing or malformed" for each row and each enumerator.
# shellcheck disable=SC2016  # the backticks are those of the page
shown=$(sed -nE 's/^\| ([0-9]+) \| `([A-Z_]+)` \| (.*) \|$/\1 \2 \3/p' docs/errors.md)
declared=$(sed -nE 's/^ *([A-Z_]+) = ([0-9]+), *(\/\/\/< (.*))?/\2 \1 \4/p' include/orvadrcore/errors.h)
[[ -n $declared ]] || { echo "no codes found in include/orvadrcore/errors.h" >&2; exit 1; }
diff <(printf '%s\n' "$declared") <(printf '%s\n' "$shown") || {
    echo "docs/errors.md (>) differs from include/orvadrcore/errors.h (<)" >&2
    exit 1
}

# Each enumerator's case gives its own name; a case and its text may stand on two lines.
named=$(tr '\n' ' ' <src/common/errors.cpp |
    grep -o 'case ERR::[A-Z_]*: *return "[A-Z_]*";' |
    sed 's/case ERR::\([A-Z_]*\): *return "\([A-Z_]*\)";/\1 \2/')
diff <(printf '%s\n' "$declared" | sed -E 's/^[0-9]+ ([A-Z_]+) .*/\1 \1/') <(printf '%s\n' "$named") || {
    echo "src/common/errors.cpp (>) names other codes than include/orvadrcore/errors.h (<)" >&2
    exit 1
}
