# shellcheck shell=bash disable=SC2034
# Functions of the other scripts: usage messages and the build.
tree=$(CDPATH='' cd -- "$(dirname -- "$(readlink -f -- "${BASH_SOURCE[0]}")")/.." && pwd)
script=$(readlink -f -- "$0")
export TPD_BUILD_DIR
TPD_BUILD_DIR=$(realpath -m -- "${TPD_BUILD_DIR:-$tree/build}")

# Prints the comment that the script begins with.
usage() { sed -n '2,/^[^#]/s/^# \{0,1\}//p' "$script"; }

# answer_help ARGUMENT...: prints the usage and exits when the first argument asks for it.
answer_help() {
    if [[ ${1-} == -h || ${1-} == --help ]]; then
        usage
        exit
    fi
}

# usage_error MESSAGE: reports a usage error and exits.
usage_error() {
    echo "${script##*/}: $1; see --help" >&2
    exit 2
}

# locked COMMAND...: runs it with the lock on TPD_BUILD_DIR, so that builds do not overlap.
locked() {
    mkdir -p "$TPD_BUILD_DIR"
    (
        if ! flock -n 9; then
            echo "waiting for another build of $TPD_BUILD_DIR" >&2
            flock 9
        fi
        "$@"
    ) 9>"$TPD_BUILD_DIR/lock"
}

# quietly COMMAND...: runs it and shows its output, kept in TPD_BUILD_DIR, only when it fails.
quietly() {
    if ! "$@" >"$TPD_BUILD_DIR/build.log" 2>&1; then
        cat "$TPD_BUILD_DIR/build.log" >&2
        exit 1
    fi
}

# Configures TPD_BUILD_DIR with the preset TPD_PRESET.
configure() {
    echo "configuring $TPD_BUILD_DIR" >&2
    cd "$tree" || exit
    quietly cmake --preset "${TPD_PRESET:-release}" -B "$TPD_BUILD_DIR"
}

# up_to_date TARGET...: whether there is nothing to build.
up_to_date() { ninja -C "$TPD_BUILD_DIR" -n "$@" | grep -q "no work to do"; }

# Shows the build's progress on a terminal.
build_targets() {
    [[ -f $TPD_BUILD_DIR/build.ninja ]] || configure
    if [[ -t 2 ]] && ! up_to_date "$@"; then
        cmake --build "$TPD_BUILD_DIR" --target "$@" >&2
    else
        quietly cmake --build "$TPD_BUILD_DIR" --target "$@"
    fi
}

# build TARGET...: configures TPD_BUILD_DIR when necessary, then builds.
build() { locked build_targets "$@"; }
