#!/usr/bin/env bash
# packaging_test BUILD_DIR CHECK: what is shipped beside the program.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.." && scratch=$(mktemp -d)
export TPD_BUILD_DIR=$1 TPD_DEVICE_ROOT=$scratch/device
trap 'scripts/device stop 2>/dev/null; rm -rf "$scratch"' EXIT

# same WHAT EXPECTED ACTUAL
same() { diff <(echo "$2") <(echo "$3") || { echo "$1: expected <, got >" >&2 && exit 1; }; }

# The page renders, and tells of the local commands in the order of the sources.
page() {
    same warnings "" "$(groff -man -Tutf8 -ww -z "$TPD_BUILD_DIR/docs/tpd.1" 2>&1)"
    same commands "$(sed -n 's/.*AddTpdCmd("\([^"]*\)".*/.B \1/p' main/TpdMain.cpp)" \
        "$(sed -n '/^.SH LOCAL/,/^.SH FORW/p' docs/tpd.1 | grep -A 1 '^.TP' | grep '^.B')"
}

bash_words() { bash -c '. "$1"; shift; COMP_WORDS=(tpd "$@"); COMP_CWORD=$#; _tpd
    printf "%s\n" "${COMPREPLY[@]}" | sort' - "$TPD_BUILD_DIR/completions/tpd.bash" "$@"; }

zsh_words() { zsh -f -c '_describe() { print -l ${${(P)4}%%:*} }; compadd() { print -l $@ }
    fpath=($1); autoload -U _tpd; shift; words=(tpd "$@"); CURRENT=$#words
    _tpd | grep "^$@[-1]" | sort' - "$TPD_BUILD_DIR/completions" "$@"; }

# Both shells offer what the help lists, and know what a second word may be.
completions() {
    scripts/device start
    help=$(scripts/device shell "setenforce 0; tpd help" | sed '/:$/d; /^$/d; /^\/\//d' | sort)
    for words in bash_words zsh_words; do
        same "$words" "$help" "$($words "")"
        same "$words" $'running_test\nrunning_test_lasttime' "$($words captest r)"
        same "$words" "THP_SetAccData " "$($words TSA_ExecuteCommand THP_SetA) $($words stop "")"
    done
}

install_tree() {
    DESTDIR=$scratch cmake --install "$TPD_BUILD_DIR" --prefix /usr
    same files "$(printf '%s\n' bin/tpd share/bash-completion/completions/tpd share/man/man1/tpd.1 \
        share/zsh/vendor-completions/_tpd)" "$(cd "$scratch/usr" && find . -type f | cut -c 3- | sort)"
}

"${@:2}"
