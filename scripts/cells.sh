# For checks that build and test the same sources several times; each time is a cell of a table. They
# source this file after common.sh.
# shellcheck shell=bash

cells=build/cells
mkdir -p "$cells"
: >"$cells/table"

# What cmake and ctest run within; nothing, unless a check sets it.
within=()

# The tests that a cell leaves out; per line a regular expression for their names, and the reason.
left_out=/dev/null

# is_wanted NAME: whether ORVADR_CELLS, which names the cells to run, is unset or names this one.
is_wanted() { [[ " ${ORVADR_CELLS:-$1} " == *" $1 "* ]]; }

# cell NAME CMAKE-ARGUMENTS CTEST-ARGUMENTS: builds everything in build/cells/NAME and runs the tests. The
# arguments are words in one text. After a failure the next cell runs; end_of_cells fails.
cell() {
    local name=$1 result
    local -a cmake_arguments ctest_arguments
    is_wanted "$name" || return 0
    read -ra cmake_arguments <<<"$2"
    read -ra ctest_arguments <<<"$3"
    step "cell $name"
    if ! build_cell "$name" "${cmake_arguments[@]}" >"$cells/$name.build.log" 2>&1; then
        result="FAILED to build: $cells/$name.build.log"
    else
        skip_tests "$name" "${ctest_arguments[@]}"
        result=
        test_cell "$name" "${ctest_arguments[@]}" >"$cells/$name.test.log" 2>&1 ||
            result=", FAILED: $cells/$name.test.log"
        result="$(count_tests "$name")$result"
    fi
    printf '%-16s %s\n' "$name" "$result" | tee -a "$cells/table"
}

# build_cell NAME CMAKE-ARGUMENT...
build_cell() {
    local dir=$cells/$1
    shift
    "${within[@]}" cmake -B "$dir" "$@" && "${within[@]}" cmake --build "$dir" -j "$(nproc)"
}

# skip_tests NAME CTEST-ARGUMENT...: says which tests are left out, and why.
skip_tests() {
    local name=$1 pattern reason names test
    shift
    sed '/^#/d' "$left_out" | while read -r pattern reason; do
        names=$("${within[@]}" ctest --test-dir "$cells/$name" -N "$@" -R "$pattern" </dev/null |
            sed -n 's/^ *Test *#[0-9]*: \([^ ]*\).*/\1/p')
        [[ -n $names ]] || fail "$left_out: no test is named '$pattern'"
        while read -r test; do
            echo "skipped: $test: $reason"
        done <<<"$names"
    done | sort | tee "$cells/$name.skipped"
}

# test_cell NAME CTEST-ARGUMENT...
test_cell() {
    local name=$1
    shift
    sed 's/^skipped: \([^ ]*\): .*/\1/' "$cells/$name.skipped" >"$cells/$name.without"
    rm -f "$cells/$name/results.xml"
    "${within[@]}" ctest --test-dir "$cells/$name" -j 4 --timeout 300 --no-tests=error --output-on-failure \
        --output-junit results.xml "$@" -E "^($(paste -s -d '|' "$cells/$name.without"))( |\$)"
}

# count_tests NAME: of those that ran what ctest counted.
count_tests() {
    local kind tests failures skipped
    for kind in tests failures skipped; do
        printf -v "$kind" %d "$(sed -n "s/^\t*$kind=\"\([0-9]*\)\".*/\1/p" "$cells/$1/results.xml")"
    done
    printf 'passed %d, failed %d, skipped %d' \
        $((tests - failures - skipped)) "$failures" $((skipped + $(wc -l <"$cells/$1.skipped")))
}

end_of_cells() {
    [[ -s $cells/table ]] || fail "no cell is named '${ORVADR_CELLS:-}'"
    step "results:"
    cat "$cells/table"
    ! grep -q FAILED "$cells/table" || fail "a cell failed"
}
