# What the scripts of this folder share; each begins with: source "$(dirname "$0")/common.sh"
# shellcheck shell=bash
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."

# What the library and its examples are built with and run with.
# shellcheck disable=SC2034  # used by the scripts that read this file
build_packages=(g++ make cmake libsqlite3-dev libjsoncpp-dev uuid-runtime
    libcpp-httplib-dev pkg-config) # these two for examples/node_service
# shellcheck disable=SC2034
test_packages=(libgtest-dev libgmock-dev)
# shellcheck disable=SC2034
bench_packages=(libbenchmark-dev pkg-config)
# shellcheck disable=SC2034
plot_packages=(gnuplot-nox)
# What the benchmarks measure beside the library; they do without what is not to be had.
# shellcheck disable=SC2034
peer_packages=(libsqlitecpp-dev libsoci-dev libinih-dev libglib2.0-dev libboost-dev)
# shellcheck disable=SC2034
package_packages=(dpkg-dev file)

step() { printf '==> %s\n' "$*"; }

fail() {
    printf 'error: %s\n' "$*" >&2
    exit 1
}

# help_if_asked ARGUMENT...: for -h and --help prints the comment at the head of the script, and ends.
help_if_asked() {
    [[ ${1:-} == -h || ${1:-} == --help ]] || return 0
    sed -n '2,/^$/s/^# \{0,1\}//p' "scripts/$(basename "$0")"
    exit
}

# quietly NAME COMMAND...: keeps the command's output in build/NAME.log, shows it when it fails.
quietly() {
    local log=build/$1.log
    shift
    mkdir -p build
    if ! "$@" >"$log" 2>&1 </dev/null; then
        tail -n 60 "$log" >&2
        fail "'$*' failed; all of its output is in $log"
    fi
}

# install_missing PACKAGE...: installs the Debian packages that are not there yet.
install_missing() {
    local package missing=() as_root=()
    for package; do
        if [[ $(dpkg-query -W -f '${db:Status-Status}' "$package" 2>/dev/null) != installed ]]; then
            missing+=("$package")
        fi
    done
    if ((${#missing[@]} == 0)); then
        step "packages: all there"
        return
    fi
    command -v apt-get >/dev/null || fail "no apt-get here; install by hand: ${missing[*]}"
    if ((EUID != 0)); then
        command -v sudo >/dev/null || fail "neither root nor sudo; install as root: ${missing[*]}"
        as_root=(sudo)
    fi
    step "packages: installing ${missing[*]} (once, takes a minute or two)"
    quietly apt-update "${as_root[@]}" apt-get update
    quietly apt-install "${as_root[@]}" env DEBIAN_FRONTEND=noninteractive \
        apt-get install -y --no-install-recommends "${missing[@]}"
}

# build PRESET [CMAKE-OPTION...]: configures and builds build/PRESET.
build() {
    local preset=$1
    shift
    step "configuring build/$preset"
    quietly "$preset-configure" cmake --preset "$preset" "$@"
    step "building build/$preset"
    quietly "$preset-build" cmake --build --preset "$preset" -j "$(nproc)"
}

# build_package: builds what is packaged, with the flags of Debian's own packages; CMake knows no
# CPPFLAGS.
build_package() (
    CXXFLAGS="$(dpkg-buildflags --get CXXFLAGS) $(dpkg-buildflags --get CPPFLAGS)"
    LDFLAGS="$(dpkg-buildflags --get LDFLAGS) -Wl,-z,now"
    export CXXFLAGS LDFLAGS
    build package
)

# read_by_tidy GREP-OPTION...: has clang-tidy read the sources whose paths grep picks.
read_by_tidy() {
    install_missing clang clang-tidy
    quietly tidy-configure cmake --preset tidy
    sed -n 's/^  "file": "\(.*\)",\{0,1\}$/\1/p' build/tidy/compile_commands.json |
        grep "$@" | sort >build/tidy-sources
    step "reading $(wc -l <build/tidy-sources) sources"
    xargs -P "$(nproc)" -n 1 clang-tidy -p build/tidy --quiet <build/tidy-sources 2>build/tidy.log
}
