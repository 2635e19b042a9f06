#!/usr/bin/env bash
# packaging_test CHECK [MODULE=SOURCE;SOURCE...]: what is shipped beside the program, and the words
# about it. CTest runs each check by itself, with TPD_BUILD_DIR.
set -euo pipefail
tree=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
scratch=$(mktemp -d)
export TPD_DEVICE_ROOT=$scratch/device
trap '"$tree/scripts/device" stop 2>/dev/null; rm -rf "$scratch"' EXIT

# same WHAT EXPECTED ACTUAL
same() {
    diff <(echo "$2") <(echo "$3") && return
    echo "$1: expected <, got >" >&2
    exit 1
}

soong_sources() {
    awk -F'"' -v module="$1" '/name: / { inside = $2 == module } /srcs: / { list = inside }
        list { for (i = 2; i <= NF; i += 2) print $i } /]/ { list = 0 }' "$tree/Android.bp"
}

android_bp() {
    for pair in "$@"; do
        same "${pair%%=*}" "$(tr ';' '\n' <<<"${pair#*=}" | sort)" \
            "$(soong_sources "${pair%%=*}" | sort)"
    done
}

# The page renders; page and README explain every result text and local command that the sources hold.
page() {
    same warnings "" "$(groff -man -Tutf8 -ww -z "$TPD_BUILD_DIR/docs/tpd.1" 2>&1)"
    sed 's/\\f[A-Z]//g; s/\\-/-/g' "$tree/docs/tpd.1" >"$scratch/page"
    for text in "please exe 'adb shell setenforce 0' in g_tpdCmd to disable selinux" \
        "0P_1P; " "check_time: " bypass-when-fw-updating "0F_1F; failed to get binder service" \
        "corvane_daemon binder server execute command return ERROR, may caused by processing" \
        "can NOT alloc memory for g_tpdCmd" "can NOT Init g_tpdCmd"; do
        for place in "$scratch/page" "$tree/README.md" "$tree"/{main,daemon,binder}; do echo "$place"; done |
            xargs grep -rlF -- "$text" | sed "s,^$tree/[mdb].*,source," | sort -u >"$scratch/found"
        same "$text" "$(printf '%s\n' "$scratch/page" "$tree/README.md" source | sort)" "$(<"$scratch/found")"
    done
    sed -n 's/.*AddTpdCmd("\([^"]*\)".*/.B \1/p' "$tree/main/TpdMain.cpp" | while read -r command; do
        grep -qxF -- "$command" "$scratch/page" || same "$command" present missing
    done
}

bash_words() { bash -c '. "$1"; shift; COMP_WORDS=(tpd "$@"); COMP_CWORD=$#; _tpd
    printf "%s\n" "${COMPREPLY[@]}" | sort' - "$TPD_BUILD_DIR/completions/tpd.bash" "$@"; }

zsh_words() { zsh -f -c '_describe() { print -l ${${(P)4}%%:*} }; compadd() { print -l $@ }
    fpath=($1); autoload -U _tpd; shift; words=(tpd "$@"); CURRENT=$#words
    _tpd | grep "^$@[-1]" | sort' - "$TPD_BUILD_DIR/completions" "$@"; }

# Both shells offer what the help lists, and know where a second word is a command again.
completions() {
    "$tree/scripts/device" start
    help=$("$tree/scripts/device" shell "setenforce 0; tpd help" | sed '/:$/d; /^$/d; /^\/\//d' | sort)
    for words in bash_words zsh_words; do
        same "$words" "$help" "$($words "")"
        same "$words" "$(printf '%s\n' showtouch showtouch_close)" "$($words show)"
        same "$words" "$(printf '%s\n' THP_SetAccData)" "$($words TSA_ExecuteCommand THP_SetA)"
        same "$words" "$(printf '%s\n' running_test running_test_lasttime)" "$($words captest "")"
        same "$words" "" "$($words stop "")"
    done
}

# The words of the README's session print what stands below them.
session() {
    shown=$(awk '/^```$/ { if (inside) exit; inside = 1; next } inside' "$tree/README.md")
    cd "$tree"
    same session "$shown" "$(grep '^\$ ' <<<"$shown" | while read -r _ words; do
        printf '$ %s\n' "$words"
        bash -c "$words" </dev/null 2>/dev/null
    done)"
}

install_tree() {
    DESTDIR=$scratch/root cmake --install "$TPD_BUILD_DIR" --prefix /usr
    same "installed files" "$(printf 'usr/%s\n' bin/tpd share/bash-completion/completions/tpd \
        share/man/man1/tpd.1 share/zsh/vendor-completions/_tpd)" \
        "$(cd "$scratch/root" && find usr -type f | sort)"
}

"$@"
