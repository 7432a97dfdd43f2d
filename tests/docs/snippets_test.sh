#!/usr/bin/env bash
# Every C++ block of the README and of the pages in docs/ shows the marked lines of a program, letter
# for letter. The line before the block names both: <!-- examples/guide/files.cpp [name] --> stands for
# what is between "// [name]" and "// [/name]" there.
#
#   snippets_test.sh SOURCE-DIRECTORY
set -euo pipefail
cd "$1"

# block PAGE LINE: the text between the fences, the first of which is that line.
block() { sed -n "$(($2 + 1)),\$p" "$1" | sed '/^```$/,$d'; }

# marked PROGRAM NAME: the marked lines without the indentation of the first mark.
marked() {
    sed -nE "/^ *\/\/ \[$2\]$/,/^ *\/\/ \[\/$2\]$/p" "$1" |
        awk 'NR == 1 { indent = index($0, "/") } { print substr($0, indent) }' | sed '1d;$d'
}

failures=0
blocks=0
for page in README.md docs/*.md; do
    while IFS=: read -r line _; do
        blocks=$((blocks + 1))
        comment=$(sed -n "$((line - 1))p" "$page")
        if [[ ! $comment =~ ^'<!-- '([^ ]+)' ['([^ ]+)'] -->'$ ]]; then
            echo "$page:$line: no line before the block says where it is from" >&2
        elif ! diff -u --label "${BASH_REMATCH[1]} [${BASH_REMATCH[2]}]" --label "$page:$line" \
            <(marked "${BASH_REMATCH[1]}" "${BASH_REMATCH[2]}") <(block "$page" "$line") >&2; then
            echo "$page:$line: not as in ${BASH_REMATCH[1]}" >&2
        else
            continue
        fi
        failures=$((failures + 1))
    done < <(grep -n '^```cpp$' "$page")
done
echo "$blocks blocks, $failures of them not as in their program"
((blocks > 0 && failures == 0))
