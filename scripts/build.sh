# shellcheck shell=bash disable=SC2034
# Functions for the other scripts: usage messages and builds.
set -o pipefail
tree=$(CDPATH='' cd -- "$(dirname -- "$(readlink -f -- "${BASH_SOURCE[0]}")")/.." && pwd)
script=$(readlink -f -- "$0")
export TPD_BUILD_DIR
TPD_BUILD_DIR=$(realpath -m -- "${TPD_BUILD_DIR:-$tree/build}")

# Prints the script's leading comment.
usage() { sed -n '2,/^[^#]/s/^# \{0,1\}//p' "$script"; }

# answer_help ARGUMENT...: prints the usage and exits if the first argument is -h or --help.
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

# locked COMMAND...: runs the command with a lock on TPD_BUILD_DIR, so that builds do not overlap.
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

# quietly COMMAND...: runs the command with its output in TPD_BUILD_DIR/build.log, and prints a line
# of it every 20 s. If the command fails, prints the output and exits.
quietly() {
    local line next=$((SECONDS + 20))
    if ! "$@" 2>&1 | while IFS= read -r line; do
        printf '%s\n' "$line"
        if ((SECONDS >= next)); then
            printf '%s\n' "$line" >&2
            next=$((SECONDS + 20))
        fi
    done >"$TPD_BUILD_DIR/build.log"; then
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

# up_to_date TARGET...: succeeds if there is nothing to build.
up_to_date() { ninja -C "$TPD_BUILD_DIR" -n "$@" | grep -q "no work to do"; }

# build_targets TARGET...: as build, without the lock. Shows progress if stderr is a terminal.
build_targets() {
    [[ -f $TPD_BUILD_DIR/build.ninja ]] || configure
    if [[ -t 2 ]] && ! up_to_date "$@"; then
        cmake --build "$TPD_BUILD_DIR" --target "$@" >&2
    else
        quietly cmake --build "$TPD_BUILD_DIR" --target "$@"
    fi
}

# build TARGET...: configures TPD_BUILD_DIR if necessary, then builds.
build() { locked build_targets "$@"; }
