# shellcheck shell=bash
# For the other scripts: what they build with, and the build itself.
tree=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
export TPD_BUILD_DIR=${TPD_BUILD_DIR:-$tree/build}

# need FILE PACKAGE...: installs Debian's packages of the files that are missing.
need() {
    local missing=()
    while (($# > 0)); do
        [[ -e $1 ]] || missing+=("$2")
        shift 2
    done
    ((${#missing[@]} > 0)) || return 0
    local as_root=()
    if ((EUID != 0)); then
        as_root=(sudo)
    fi
    echo "installing ${missing[*]}" >&2
    if ! command -v apt-get >/dev/null || ! { "${as_root[@]}" apt-get update -q &&
        DEBIAN_FRONTEND=noninteractive "${as_root[@]}" apt-get install -qy --no-install-recommends \
            "${missing[@]}"; } >&2; then
        echo "error: cannot install ${missing[*]}; install by hand, then try again" >&2
        exit 1
    fi
}

need_compiler() {
    need /usr/bin/g++ g++ /usr/bin/cmake cmake /usr/bin/ninja ninja-build
}

# What the tests are made of and call.
need_test_tools() {
    need /usr/include/gtest/gtest.h libgtest-dev /usr/bin/groff groff-base /usr/bin/zsh zsh \
        /usr/bin/python3 python3 /usr/bin/pgrep procps
}

# build TARGET...: configures when that was not done yet, and builds.
build() {
    if [[ ! -f $TPD_BUILD_DIR/build.ninja ]]; then
        echo "building in $TPD_BUILD_DIR" >&2
        cmake -S "$tree" -B "$TPD_BUILD_DIR" -G Ninja
    fi
    cmake --build "$TPD_BUILD_DIR" --target "$@" -- --quiet
}
