#!/usr/bin/env bash
# The README shows the marked lines of the quick start, letter for letter.
#
#   readme_test.sh SOURCE-DIRECTORY
set -euo pipefail
cd "$1"

marked=$(sed -n '/\/\/ \[readme\]/,/\/\/ \[\/readme\]/p' examples/quick_start.cpp | sed '1d;$d;s/^    //')
# shellcheck disable=SC2016  # the backticks are those of the page
shown=$(sed -n '/^```cpp$/,/^```$/p' README.md | sed '1d;/^```$/,$d')
[[ -n $marked ]] || { echo "examples/quick_start.cpp has no marked lines" >&2; exit 1; }
diff <(printf '%s\n' "$marked") <(printf '%s\n' "$shown") || {
    echo "README.md (>) differs from examples/quick_start.cpp (<)" >&2
    exit 1
}
