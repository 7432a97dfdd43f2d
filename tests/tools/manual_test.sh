#!/usr/bin/env bash
# The man pages and the completions of orvadr have all its commands and options, and the completion for
# bash completes.
#
#   manual_test.sh SOURCE-DIRECTORY PROGRAM
set -euo pipefail
cd "$1/tools/orvadr"
program=$2
failures=0

fail() {
    echo "$*" >&2
    failures=$((failures + 1))
}

commands=$("$program" --help | sed -n '/^Subcommands:/,/^$/s/^  \([a-z]\{1,\}\) .*/\1/p')
[[ -n $commands ]] || fail "the help shows no commands"
for command in $commands; do
    [[ -e man/orvadr-$command.1.in ]] || fail "man/orvadr-$command.1.in is missing"
    grep -q "^\.BR $command " man/orvadr.1.in || fail "man/orvadr.1.in lacks $command"
    for file in completion/*; do
        grep -qw "$command" "$file" || fail "$file lacks $command"
    done
done
for option in $("$program" --help | grep -o -- '--[a-z]\{1,\}' | sort -u); do
    grep -qF -- "${option//-/\\-}" man/orvadr.1.in || fail "man/orvadr.1.in lacks $option"
    for file in completion/*; do
        grep -qF -- "$option" "$file" || fail "$file lacks $option"
    done
done
for page in man/*; do
    if command -v groff >/dev/null && [[ -n $(groff -man -Tascii -ww -z "$page" 2>&1) ]]; then
        fail "$page: $(groff -man -Tascii -ww -z "$page" 2>&1)"
    fi
done

# expect WORDS EXPECTED: completes the last word.
expect() {
    local replies
    read -ra COMP_WORDS <<<"$1"
    [[ $1 != *' ' ]] || COMP_WORDS+=('')
    COMP_CWORD=$((${#COMP_WORDS[@]} - 1))
    COMPREPLY=()
    _orvadr
    replies=${COMPREPLY[*]}
    [[ $replies == "$2" ]] || fail "'$1' is completed to '$replies' instead of '$2'"
}
compopt() { :; } # works only while bash completes
# shellcheck source=/dev/null
source completion/orvadr.bash
expect "$program " "cache db error lock"
expect "$program ca" "cache"
expect "$program --json d" "db"
expect "$program --v" "--version"
expect "$program lock --" "--json --help"
expect "$program cache completion/_" "completion/_orvadr"
expect "$program error ERR_NODE_EX" "ERR_NODE_EXIST"
expect "$program error 50" "500 501 502 503 504 505 506 507 508 509"
expect "$program nothing x" ""
((failures == 0))
