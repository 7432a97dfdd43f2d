# Shared by all scripts in this folder, which begin with: source "$(dirname "$0")/common.sh"
# shellcheck shell=bash
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."

# To build and run the library and its examples.
# shellcheck disable=SC2034  # used by the scripts that read this file
build_packages=(g++ make cmake libsqlite3-dev libjsoncpp-dev uuid-runtime
    libcpp-httplib-dev pkg-config # these two for examples/node_service
    libcli11-dev)                 # for tools/orvadr, examples/node_registry and node_service
# shellcheck disable=SC2034
test_packages=(libgtest-dev libgmock-dev sqlite3)
# shellcheck disable=SC2034
bench_packages=(libbenchmark-dev libcli11-dev pkg-config)
# shellcheck disable=SC2034
plot_packages=(gnuplot-nox)
# Other libraries that the benchmarks measure. Those that cannot be installed are left out.
# shellcheck disable=SC2034
peer_packages=(libsqlitecpp-dev libsoci-dev libinih-dev libglib2.0-dev libboost-dev)
# shellcheck disable=SC2034
package_packages=(dpkg-dev file)

step() { printf '==> %s\n' "$*"; }

fail() {
    printf 'error: %s\n' "$*" >&2
    exit 1
}

# help_if_asked ARGUMENT...: for -h or --help, prints the comment at the top of the script and exits.
help_if_asked() {
    [[ ${1:-} == -h || ${1:-} == --help ]] || return 0
    sed -n '2,/^$/s/^# \{0,1\}//p' "scripts/$(basename "$0")"
    exit
}

# quietly NAME COMMAND...: writes the output to build/NAME.log, and shows its end if the command fails.
quietly() {
    local log=build/$1.log
    shift
    mkdir -p build
    if ! ("$@") >"$log" 2>&1 </dev/null; then
        tail -n 60 "$log" >&2
        fail "'$*' failed; the whole output is in $log"
    fi
}

# install_missing PACKAGE...: installs those Debian packages that are not installed yet.
install_missing() {
    local package missing=() as_root=()
    for package; do
        if [[ $(dpkg-query -W -f '${db:Status-Status}' "$package" 2>/dev/null) != installed ]]; then
            missing+=("$package")
        fi
    done
    if ((${#missing[@]} == 0)); then
        step "packages: all installed"
        return
    fi
    command -v apt-get >/dev/null || fail "apt-get not found; please install: ${missing[*]}"
    if ((EUID != 0)); then
        command -v sudo >/dev/null || fail "neither root nor sudo; please install as root: ${missing[*]}"
        as_root=(sudo)
    fi
    step "packages: installing ${missing[*]} (only once; takes a minute or two)"
    quietly apt-update "${as_root[@]}" apt-get update
    quietly apt-install "${as_root[@]}" env DEBIAN_FRONTEND=noninteractive \
        apt-get install -y --no-install-recommends "${missing[@]}"
}

# debian_mirror: where this system gets Debian from.
debian_mirror() {
    local mirror
    mirror=$(sed -nE 's#^(URIs:|deb( \[[^]]*\])?) *(https?://[^ ]+).*#\3#p' \
        /etc/apt/sources.list /etc/apt/sources.list.d/* 2>/dev/null | grep debian.org | grep -v security |
        head -n 1 || true)
    echo "${mirror:-http://deb.debian.org/debian}"
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

# build_package [PRESET]: builds with the flags of Debian's own packages. CMake ignores CPPFLAGS, so they
# are added to CXXFLAGS.
build_package() (
    CXXFLAGS="$(dpkg-buildflags --get CXXFLAGS) $(dpkg-buildflags --get CPPFLAGS)"
    LDFLAGS="$(dpkg-buildflags --get LDFLAGS) -Wl,-z,now"
    export CXXFLAGS LDFLAGS
    build "${1:-package}"
)

# prepare_cross_build ARCH: installs Debian's cross compiler and fetches that machine's libraries.
prepare_cross_build() {
    [[ -e cmake/toolchains/$1.cmake ]] || fail "cannot build for '$1'; see cmake/toolchains"
    install_missing dpkg-dev
    # It warns that the compiler of this machine is another one.
    install_missing "g++-$(dpkg-architecture -a "$1" -q DEB_HOST_GNU_TYPE 2>/dev/null)" qemu-user-static
    [[ -e build/sysroot/$1.dpkg/status ]] || scripts/sysroot "$1"
}

# read_by_tidy GREP-OPTION...: runs clang-tidy on the sources whose paths grep selects.
read_by_tidy() {
    install_missing clang clang-tidy
    quietly tidy-configure cmake --preset tidy
    sed -n 's/^  "file": "\(.*\)",\{0,1\}$/\1/p' build/tidy/compile_commands.json |
        grep "$@" | sort >build/tidy-sources
    step "checking $(wc -l <build/tidy-sources) sources"
    xargs -d '\n' -P "$(nproc)" -n 1 clang-tidy -p build/tidy --quiet <build/tidy-sources 2>build/tidy.log
}
