#!/usr/bin/env bash
# Checks all properties of the cache's update protocol in every state that the model cache.pml can reach.
# Promised properties must hold. Those that the protocol does not promise, or that a change of the protocol
# breaks, must be broken.
#
#   run.sh FOLDER                         checks all properties, building in FOLDER
#   run.sh FOLDER CHECK_... [VARIANT...]  checks one property, and prints how it breaks: the state of each
#                                         process, the id in the pid file, and what each has read from it
set -euo pipefail
model=$(dirname "$(readlink -f "$0")")/cache.pml
folder=$1
max_depth=1000000
max_memory_mb=8000
wrong=() # properties with an unexpected result

# What the library promises, and under which conditions.
holds='
CHECK_ONE_UPDATER
CHECK_ONE_UPDATER ID_ONLY
CHECK_ONE_UPDATER LOCK_FAULTS
CHECK_OWN_REMOVAL
CHECK_OWN_REMOVAL ID_ONLY
CHECK_OWN_REMOVAL OUTSIDER
CHECK_READ_ENDS
CHECK_READ_ENDS ID_ONLY
CHECK_READ_ENDS_IN_A_CROWD
CHECK_READ_ENDS_IN_A_CROWD ID_ONLY
CHECK_READ_ENDS_WITH_REFRESHES CERTAIN_LOCKS
CHECK_LONE_READER
CHECK_NO_SELF_WAIT CERTAIN_LOCKS
CHECK_NO_MARK_STAYS CERTAIN_LOCKS
CHECK_ONE_UPDATER WITHIN
CHECK_ONE_UPDATER WITHIN ID_ONLY
CHECK_ONE_UPDATER WITHIN LOCK_FAULTS
CHECK_OWN_REMOVAL WITHIN
CHECK_OWN_REMOVAL WITHIN OUTSIDER CERTAIN_LOCKS
CHECK_NO_LATE_REFRESH ALL_WITHIN ONLY_OLD ONLY_MARKED
CHECK_NO_LATE_REFRESH ALL_WITHIN ONLY_OLD ONLY_MARKED LOCK_FAULTS
CHECK_ENDS_IN_TIME WITHIN LOCK_FAULTS
CHECK_ENDS_IN_TIME ALL_WITHIN LOCK_FAULTS READ_FAULTS OUTSIDER
CHECK_READ_ENDS WITHIN PATIENT ONLY_OLD LOCK_FAULTS
CHECK_LONE_READER WITHIN
CHECK_NO_MARK_STAYS ALL_WITHIN LOCK_FAULTS READ_FAULTS
'
# What it does not promise: README.md explains each case.
surprises='
CHECK_NO_LATE_REFRESH ONLY_OLD ONLY_MARKED NO_KILLS CERTAIN_LOCKS
CHECK_LOSER_WAITS ALL_BLOCK ONLY_OLD ONLY_MARKED NO_KILLS CERTAIN_LOCKS
CHECK_WAIT_BRINGS_FRESH ALL_BLOCK ONLY_OLD ONLY_MARKED CERTAIN_LOCKS
CHECK_WAIT_BRINGS_NEWS CERTAIN_LOCKS ONLY_MARKED
CHECK_NO_MARK_STAYS NO_KILLS
CHECK_NO_SELF_WAIT ONLY_OLD ONLY_MARKED NO_KILLS
CHECK_NO_SELF_WAIT LOCK_FAULTS ONLY_OLD ONLY_MARKED NO_KILLS
CHECK_READ_ENDS_WITH_REFRESHES
CHECK_READ_ENDS_WITH_REFRESHES LOCK_FAULTS
CHECK_READ_ENDS LOCK_FAULTS
CHECK_READ_ENDS_BY_FRESH_MOMENTS CERTAIN_LOCKS
CHECK_LONE_READER UNNOTICED_BIRTHS
CHECK_LONE_READER ID_ONLY
CHECK_READ_ENDS_WITH_REFRESHES ID_ONLY CERTAIN_LOCKS
CHECK_NO_SELF_WAIT ID_ONLY CERTAIN_LOCKS
CHECK_ONE_UPDATER OUTSIDER
CHECK_ONE_UPDATER READ_FAULTS
CHECK_OWN_REMOVAL READ_FAULTS
CHECK_NO_LATE_REFRESH WITHIN ONLY_OLD ONLY_MARKED
CHECK_READ_ENDS WITHIN PATIENT
CHECK_OWN_REMOVAL WITHIN OUTSIDER
'
# What breaks when the protocol is changed: each of its precautions is needed, and the checks notice.
mutants='
CHECK_ONE_UPDATER NO_LOCK
CHECK_ONE_UPDATER SHARED_MARKING
CHECK_ONE_UPDATER NO_SECOND_LOOK
CHECK_OWN_REMOVAL OUTSIDER BLIND_REMOVAL
CHECK_OWN_REMOVAL OUTSIDER UNLOCKED_REMOVAL
CHECK_LONE_READER NO_LIFE_CHECK
CHECK_READ_ENDS NO_LIFE_CHECK
CHECK_READ_ENDS WAIT_FOR_FRESH
CHECK_READ_ENDS WAIT_FOR_UPDATER
CHECK_ONE_UPDATER ALL_WITHIN NO_LOCK
CHECK_ONE_UPDATER ALL_WITHIN NO_CHECK_UNDER_LOCK
CHECK_NO_LATE_REFRESH ALL_WITHIN ONLY_OLD ONLY_MARKED NO_LOOK_UNDER_LOCK
CHECK_ENDS_IN_TIME WITHIN NO_TIME
CHECK_NO_MARK_STAYS ALL_WITHIN STUBBORN_MARK
'

fail() {
    printf 'error: %s\n' "$*" >&2
    exit 1
}

# explore CHECK VARIANT...: writes the result of the search to FOLDER/pan.log.
explore() {
    local options=(-DSAFETY) search=() word
    case $1 in
        CHECK_READ_ENDS* | CHECK_ENDS*) # only fair runs: every process that can go on does
            options=()
            search=(-a -f)
            ;;
    esac
    [[ $expected == broken && ${#search[@]} == 0 ]] && options+=(-DBFS) # the shortest trace
    rm -rf "$folder"
    mkdir -p "$folder"
    (
        cd "$folder"
        for word; do set -- "$@" "-D$word" && shift; done
        spin "$@" -a "$model" >spin.log 2>&1 &&
            gcc -w -O1 -DMEMLIM=$max_memory_mb "${options[@]}" -o pan pan.c >gcc.log 2>&1 &&
            ./pan "${search[@]}" "-m$max_depth" >pan.log 2>&1
    ) || fail "$* cannot be explored: see $folder"
    if grep -qE 'max search depth too small|out of memory|Search not completed' "$folder/pan.log" &&
        ! grep -q 'errors: 1' "$folder/pan.log"; then
        fail "$* is not explored completely: see $folder/pan.log"
    fi
}

# figure PATTERN: prints a number from FOLDER/pan.log
figure() { sed -nE "s/$1/\1/p" "$folder/pan.log" | head -n 1; }

# judge EXPECTED CHECK VARIANT...
judge() {
    local expected=$1 found=holds
    shift
    explore "$@"
    grep -q 'errors: 0' "$folder/pan.log" || found=broken
    printf '%-7s %10d states %7.2f s %6.0f MB  %s\n' "$found" "$(figure '^ *([0-9]+) states, stored.*')" \
        "$(figure '^pan: elapsed time ([0-9.e+-]+) seconds')" \
        "$(figure '^ *([0-9.]+)\ttotal actual memory usage')" "$*"
    [[ $found == "$expected" ]] || wrong+=("$*")
}

# judge_all EXPECTED LINES
judge_all() {
    local line
    while read -ra line; do
        ((${#line[@]} == 0)) || judge "$1" "${line[@]}"
    done <<<"$2"
}

# tell CHECK VARIANT...: prints what changes in each step of the last search's trail.
tell() {
    cd "$folder" # spin leaves a file there
    spin "${@/#/-D}" -k ./*.trail -t -p -g "$model" 2>/dev/null | awk '
        NR == FNR {
            if ($0 ~ /^#define [A-Z][A-Za-z]* [0-9]+( |$)/) name[$3] = $2
            next
        }
        /<<<<<START OF CYCLE>>>>>/ { print "from here on for ever:" }
        $2 == "=" && $3 != (($1 in value) ? value[$1] : 0) {
            value[$1] = $3
            print "    " $1 " = " ($1 ~ /^at/ ? name[$3] : $3)
        }' "$model" -
}

if (($# > 1)); then
    shift
    expected=broken
    explore "$@"
    if grep -q 'errors: 0' "$folder/pan.log"; then
        printf "'%s' holds\n" "$*"
    else
        tell "$@"
    fi
    exit
fi
echo "promised:"
judge_all holds "$holds"
echo "not promised:"
judge_all broken "$surprises"
echo "changed protocol:"
judge_all broken "$mutants"
((${#wrong[@]} == 0)) || fail "not as expected: $(printf "'%s' " "${wrong[@]}")"
