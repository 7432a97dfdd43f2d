# Completion of orvadr's command line for bash.
# shellcheck shell=bash

# Lines that begin with the word, as the replies.
_orvadr_reply() { mapfile -t COMPREPLY < <(compgen -W "$1" -- "$2"); }

_orvadr() {
    local word=${COMP_WORDS[COMP_CWORD]} command='' at
    for ((at = 1; at < COMP_CWORD; at++)); do
        if [[ ${COMP_WORDS[at]} != -* ]]; then
            command=${COMP_WORDS[at]}
            break
        fi
    done
    if [[ $word == -* ]]; then
        if [[ -n $command ]]; then
            _orvadr_reply "--json --help" "$word"
        else
            _orvadr_reply "--json --help --version" "$word"
        fi
        return
    fi
    case $command in
        '') _orvadr_reply "cache db error lock" "$word" ;;
        cache | db)
            compopt -o filenames
            mapfile -t COMPREPLY < <(compgen -f -- "$word")
            ;;
        error) _orvadr_reply "$("${COMP_WORDS[0]}" error | awk 'NR > 1 { print $1; print $2 }')" "$word" ;;
        lock) _orvadr_reply "$("${COMP_WORDS[0]}" lock | awk '/^[a-z]/ { print $2 }')" "$word" ;;
    esac
}

complete -F _orvadr orvadr
