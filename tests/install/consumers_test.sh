#!/usr/bin/env bash
# Builds programs against the installed library, outside its source tree, and runs them.
#
#   consumers_test.sh SOURCE-DIRECTORY PREFIX
set -euo pipefail

source_dir=$(realpath "$1")
prefix=$(realpath "$2")
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
cp -r "$source_dir/tests/install" "$work/callers"
cd "$work/callers"
lib_dir=$(dirname "$(find "$prefix" -name orvadrcore.pc)")/..
export LD_LIBRARY_PATH=$lib_dir

step() { printf '    %s\n' "$*"; }

# quietly COMMAND...: shows the command's output when it fails.
quietly() { "$@" >"$work/log" 2>&1 || { cat "$work/log" >&2; return 1; }; }

# run PROGRAM: checks what the program prints, with the installed library.
run() {
    mkdir "$work/data"
    diff -u consumer.out <("$1" "$work/data")
    rm -r "$work/data"
}

# cmake_caller NAME PROJECT CMAKE-OPTION...
cmake_caller() {
    local name=$1 project=$2
    shift 2
    step "$name"
    quietly cmake -S "$project" -B "$work/$name" -DCMAKE_PREFIX_PATH="$prefix" "$@"
    quietly cmake --build "$work/$name" -j "$(nproc)"
    run "$work/$name/consumer"
}

cmake_caller find_package find_package
cmake_caller c++20 find_package -DCMAKE_CXX_STANDARD=20
cmake_caller clang find_package -DCMAKE_CXX_COMPILER=clang++
cmake_caller add_subdirectory add_subdirectory -DORVADRCORE_SOURCE_DIR="$source_dir"

step "pkg-config"
export PKG_CONFIG_PATH=$lib_dir/pkgconfig
quietly make -C pkg_config
run pkg_config/consumer

step "a moved prefix"
cp -r "$prefix" "$work/moved"
PKG_CONFIG_PATH=$work/moved/${lib_dir#"$prefix"/}/pkgconfig
[[ $(pkg-config --variable=includedir orvadrcore) -ef $work/moved/include ]]
quietly cmake -S find_package -B "$work/from-moved" -DCMAKE_PREFIX_PATH="$work/moved"
quietly cmake --build "$work/from-moved"

step "the installed examples"
quietly cmake -S "$prefix/share/doc/liborvadrcore-examples/examples" -B "$work/examples" \
    -DCMAKE_PREFIX_PATH="$prefix"
quietly cmake --build "$work/examples" -j "$(nproc)"
(cd "$work" && examples/quick_start >/dev/null)
[[ -x $work/examples/node_service ]]
step "the installed examples without cpp-httplib, and without CLI11"
for missing in PkgConfig CLI11; do
    quietly cmake -S "$prefix/share/doc/liborvadrcore-examples/examples" -B "$work/no-$missing" \
        -DCMAKE_PREFIX_PATH="$prefix" -DCMAKE_DISABLE_FIND_PACKAGE_$missing=ON
    grep -q 'node_service is left out' "$work/log"
done
grep -q 'node_registry is left out' "$work/log"

step "the lock directory at boot"
grep '^d /tmp/.orvadr_lock ' "$prefix/lib/tmpfiles.d/orvadrcore.conf" |
    grep -qxFf - "$source_dir/docs/locks.md"

step "each header alone"
flags=$(pkg-config --cflags orvadrcore)
for header in "$prefix"/include/orvadrcore/*.h; do
    # shellcheck disable=SC2086  # several flags
    echo "#include <orvadrcore/$(basename "$header")>" |
        g++ -std=c++17 -Wall -Wextra -Wpedantic -Werror $flags -x c++ -fsyntax-only -
done
