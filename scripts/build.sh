# shellcheck shell=bash disable=SC2034
# For the other scripts: their usage, the packages they need, and the build.
tree=$(CDPATH='' cd -- "$(dirname -- "$(readlink -f -- "${BASH_SOURCE[0]}")")/.." && pwd)
script=$(readlink -f -- "$0")
export TPD_BUILD_DIR
TPD_BUILD_DIR=$(realpath -m -- "${TPD_BUILD_DIR:-$tree/build}")

# What is needed: a command on the PATH or a file, and Debian's package of it when that has another
# name.
compiler=(g++ cmake ninja:ninja-build)
test_tools=(/usr/include/gmock/gmock.h:libgmock-dev groff:groff-base man:man-db
    pytest-3:python3-pytest /usr/lib/python3/dist-packages/xdist:python3-pytest-xdist zsh)

# Prints the comment that the script begins with.
usage() { sed -n '2,/^[^#]/s/^# \{0,1\}//p' "$script"; }

# answer_help ARGUMENT...: prints the usage and ends the script when the first argument asks for it.
answer_help() {
    if [[ ${1-} == -h || ${1-} == --help ]]; then
        usage
        exit
    fi
}

# Ends the script, which was called with wrong arguments.
wrong_use() {
    usage >&2
    exit 2
}

# need WHAT...: installs what is missing, or says what an administrator has to install.
need() {
    local missing=() each as_root=()
    for each in "$@"; do
        command -v "${each%:*}" >/dev/null || [[ -e ${each%:*} ]] || missing+=("${each##*:}")
    done
    ((${#missing[@]} > 0)) || return 0
    if ((EUID != 0)); then
        as_root=(sudo -n)
    fi
    if ! "${as_root[@]}" true 2>/dev/null; then
        echo "missing; as an administrator: apt-get install ${missing[*]}" >&2
        exit 1
    fi
    echo "installing ${missing[*]}" >&2
    "${as_root[@]}" apt-get update -q >&2 && DEBIAN_FRONTEND=noninteractive "${as_root[@]}" \
        apt-get install -qy --no-install-recommends "${missing[@]}" >&2
}

# quietly COMMAND...: its output goes to a file in TPD_BUILD_DIR and is shown when it fails.
quietly() {
    mkdir -p "$TPD_BUILD_DIR"
    if ! "$@" >"$TPD_BUILD_DIR/build.log" 2>&1; then
        cat "$TPD_BUILD_DIR/build.log" >&2
        exit 1
    fi
}

# Configures TPD_BUILD_DIR with the preset TPD_PRESET.
configure() {
    echo "configuring $TPD_BUILD_DIR" >&2
    (cd "$tree" && quietly cmake --preset "${TPD_PRESET:-release}" -B "$TPD_BUILD_DIR")
}

# build TARGET...: configures when that was not done yet, and builds.
build() {
    [[ -f $TPD_BUILD_DIR/build.ninja ]] || configure
    quietly cmake --build "$TPD_BUILD_DIR" --target "$@"
}
