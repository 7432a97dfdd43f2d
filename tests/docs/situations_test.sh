#!/usr/bin/env bash
# Brings about the situations of docs/when-something-is-wrong.md and runs the commands that are shown
# there. The page must show what they print, apart from process ids. Ends with 77, for skipped, where no
# mount namespace can be made or sqlite3 is missing.
#
#   situations_test.sh PAGE PROGRAM           compares
#   situations_test.sh PAGE PROGRAM renew     puts what is printed now into the page
#
# On the page, the line before a block names its situation: <!-- situation NAME -->
set -euo pipefail

page=$(realpath "$1")
program=$(realpath "$2")
mode=${3:-compare}

# In a namespace of our own, /var and the lock directory are empty and ours.
if [[ ${SITUATIONS_INSIDE:-} != yes ]]; then
    command -v sqlite3 >/dev/null || exit 77
    mkdir -p /tmp/.orvadr_lock
    namespace=(unshare --mount)
    ((EUID == 0)) || namespace+=(--user --map-root-user)
    "${namespace[@]}" true || exit 77
    SITUATIONS_INSIDE=yes exec "${namespace[@]}" "$0" "$page" "$program" "$mode"
fi
mount -t tmpfs tmpfs /var
mount -t tmpfs -o mode=755 tmpfs /tmp/.orvadr_lock
work=$(mktemp -d)
started=()
trap 'stop_all; rm -rf "$work"' EXIT
export TZ=UTC
mkdir /var/dr
chmod 755 /var /var/dr
cd /var/dr
mkdir "$work/bin"
ln -s "$program" "$work/bin/orvadr"
PATH=$work/bin:$PATH

# ------------------------------------------------------------------------------------------ helpers

stop_all() {
    local pid
    for pid in "${started[@]}"; do
        kill -9 "$pid" 2>/dev/null || true
        wait "$pid" 2>/dev/null || true
    done
    started=()
}

# note_started PID: ends the process after the situation, and shows its id as 4242.
note_started() { started+=("$1"); }

# normalise: each process id becomes 4242.
normalise() {
    local pid script=()
    for pid in "${started[@]}"; do script+=(-e "s/\\b$pid\\b/4242/g"); done
    sed "${script[@]}" -e ''
}

# show WORD...: the command as typed, and what it prints.
show() {
    printf '$ %s\n' "$*"
    { "$@" 2>&1 || true; } | normalise
}

# show_as_user WORD...: likewise, without the rights of root.
show_as_user() {
    printf '$ %s\n' "$*"
    { setpriv --inh-caps=-all --bounding-set=-all "$@" 2>&1 || true; } | normalise
}

# cache_file NAME AGE: a cache file as a refresh writes it, last written AGE ago.
cache_file() {
    printf '%s' '{"begin_time_to_update":1795316528,"cached_data":{"up":true},' \
        '"finish_time_to_update":1795316531,"info":{"name":"nodes"},"max_updated_time":9,' \
        '"timeout":60,"updated_time":3.0}' >"$1"
    touch -d "$2" "$1"
}

# start_program NAME: a process of that name which does nothing; its id is in the variable pid.
start_program() {
    [[ -x $work/bin/$1 ]] || cp "$(command -v sleep)" "$work/bin/$1"
    "$1" 600 </dev/null >/dev/null 2>&1 &
    pid=$!
    note_started "$pid"
    until [[ $(tr '\0' ' ' <"/proc/$pid/cmdline") == "$1 600 " ]]; do sleep 0.01; done
}

make_database() {
    rm -f nodes.db*
    sqlite3 nodes.db "CREATE TABLE nodes (name TEXT PRIMARY KEY, port INTEGER);
        WITH RECURSIVE c(x) AS (SELECT 1 UNION ALL SELECT x + 1 FROM c WHERE x < 500)
        INSERT INTO nodes SELECT 'node-' || x, 5000 + x FROM c;"
}

# start_sqlite STATEMENTS: a process that has run them and keeps the database open.
start_sqlite() {
    rm -f "$work/out" # that of an earlier situation is ready, too
    mkfifo "$work/in"
    sqlite3 nodes.db <"$work/in" >"$work/out" 2>&1 &
    note_started $!
    exec 8>"$work/in"
    printf '%s\n.print ready\n' "$1" >&8
    until grep -qs ready "$work/out"; do sleep 0.01; done
    rm "$work/in"
}

# --------------------------------------------------------------------------------------- situations

situation_stale_status() {
    cache_file nodes.cached '2 hours ago 14 minutes ago 20 seconds ago'
    show orvadr cache /var/dr/nodes.cached
}

situation_hanging_refresh() {
    cache_file nodes.cached '2 hours ago 14 minutes ago 20 seconds ago'
    start_program node_service
    echo "$pid" >nodes.cached.pid
    touch -d '2026-11-22 03:02:11' nodes.cached.pid
    show orvadr cache /var/dr/nodes.cached
}

situation_error_code() {
    show orvadr error 517 518
    show orvadr error 117
}

situation_held_lock() {
    touch /tmp/.orvadr_lock/registry.restore
    # What the process below inherits is open here for a moment.
    exec 9</tmp/.orvadr_lock/registry.restore
    flock -x 9
    start_program backup_agent
    exec 9<&-
    show orvadr lock registry.restore
}

situation_full_disk() {
    mkdir -p status
    mount -t tmpfs -o size=64k,mode=755 tmpfs status
    cache_file status/nodes.cached '5 hours ago 3 minutes ago 20 seconds ago'
    head -c 100000 /dev/zero >status/core 2>/dev/null || true
    show orvadr cache /var/dr/status/nodes.cached
    show df --output=target,size,avail,pcent -h /var/dr/status
    umount status
}

situation_damaged_database() {
    make_database
    printf '\377\377\377\377' | dd of=nodes.db bs=1 seek=4108 conv=notrunc status=none
    show orvadr db /var/dr/nodes.db
}

situation_locked_database() {
    make_database
    start_sqlite 'BEGIN EXCLUSIVE;'
    show orvadr db /var/dr/nodes.db
    exec 8>&-
}

situation_wrong_permissions() {
    make_database
    cache_file nodes.cached '2 hours ago 14 minutes ago 20 seconds ago'
    chmod 000 nodes.db nodes.cached
    show_as_user orvadr db /var/dr/nodes.db
    show_as_user orvadr cache /var/dr/nodes.cached
    chmod 644 nodes.db nodes.cached
}

situation_clock_set_back() {
    cache_file nodes.cached 'now 5 hours 10 minutes 30 seconds'
    show orvadr cache /var/dr/nodes.cached
}

situation_interrupted_transaction() {
    make_database
    start_sqlite 'PRAGMA cache_size = 1; BEGIN IMMEDIATE; UPDATE nodes SET name = name || port;'
    stop_all # as a power cut does
    exec 8>&-
    show orvadr db /var/dr/nodes.db
    show sqlite3 /var/dr/nodes.db .tables
    show orvadr db /var/dr/nodes.db
}

# ------------------------------------------------------------------------------------------ the page

# block NAME: what the page shows.
block() {
    awk -v mark="<!-- situation $1 -->" '
        $0 == mark { found = 1; next }
        found && /^```/ { if (inside) exit; inside = 1; next }
        inside' "$page"
}

# put NAME FILE: makes the page show the file's content.
put() {
    awk -v mark="<!-- situation $1 -->" -v file="$2" '
        { if (!inside) print }
        $0 == mark { found = 1; next }
        found && /^```/ {
            if (inside) { print; inside = 0; found = 0; next }
            inside = 1
            while ((getline line <file) > 0) print line
        }' "$page" >"$work/page"
    cat "$work/page" >"$page"
}

failures=0
names=$(sed -n 's/^<!-- situation \([a-z_]*\) -->$/\1/p' "$page")
for name in $names; do
    rm -rf /var/dr/*
    "situation_$name" >"$work/printed"
    stop_all
    if [[ $mode == renew ]]; then
        put "$name" "$work/printed"
    else
        diff -u --label "the page" --label "$name" <(block "$name") "$work/printed" ||
            failures=$((failures + 1))
    fi
done
declared=$(declare -F | sed -n 's/^declare -f situation_//p' | sort)
[[ $(sort <<<"$names") == "$declared" ]] || {
    echo "the page has not all situations, or one twice" >&2
    exit 1
}
((failures == 0)) || {
    echo "$failures situations are not as the page shows; 'renew' as the last word puts them there" >&2
    exit 1
}
