# shellcheck shell=sh disable=SC2016,SC2034
# Functions for POSIX shell scripts, and for zsh, that drive tpd on a device through adb:
#
#   . ./tpd.sh
#   tpd_wait 30 || exit 1
#   tpd_send THP_SetFoldState 1 || echo "$TPD_OUTCOME: $TPD_RESULT" >&2
#
# ADB is the adb command, by default `adb`. It is split into words: ADB="adb -s SERIAL" selects a
# device. TPD_LIMIT is the time limit for one command in seconds, by default 30. A command can take
# up to 22 seconds while the daemon restarts.

# tpd_adb ARGUMENT...: runs adb with an empty standard input, because `adb shell` would read that of
# the caller.
tpd_adb() {
    [ -z "${ZSH_VERSION-}" ] || setopt local_options sh_word_split
    # shellcheck disable=SC2086
    ${ADB:-adb} "$@" </dev/null
}

# tpd_quote ARGUMENT...: prints the arguments, quoted for the device's shell.
tpd_quote() {
    for tpd_rest in "$@"; do
        printf " '"
        while [ "$tpd_rest" != "${tpd_rest#*\'}" ]; do
            printf "%s'\\\\''" "${tpd_rest%%\'*}"
            tpd_rest=${tpd_rest#*\'}
        done
        printf "%s'" "$tpd_rest"
    done
}

# tpd_wait SECONDS: waits until the daemon is alive and its service is published. Returns 1 on
# time-out.
tpd_wait() {
    tpd_left=$1
    until tpd_alive; do
        [ "$tpd_left" -gt 0 ] || return 1
        tpd_left=$((tpd_left - 1))
        sleep 1
    done
}

# tpd_alive: succeeds if the daemon is alive and its service is published. Checks the properties
# that the tool checks.
tpd_alive() {
    case $(tpd_adb shell 'echo "$(getprop odm.thp.dae_alive),$(getprop odm.thp.binder)"') in
        1,1 | 1,true | true,1 | true,true) ;;
        *) return 1 ;;
    esac
}

# tpd_send ARGUMENT...: runs tpd with the arguments and sets TPD_RESULT to its result text and
# TPD_OUTCOME to one of:
#
#   answered  the daemon answered, perhaps after executing the command twice, or a local command ran
#   refused   not sent: SELinux is enforcing
#   unsent    not sent: the daemon is not alive or is updating its firmware, or out of memory
#   failed    no answer; the daemon may have executed the command, even twice
#   late      no answer within TPD_LIMIT; the daemon is being restarted
#   unusable  not sent: tpd does not accept these arguments
#   broken    adb or the device failed; see their messages on standard error
#
# Returns 0 for "answered", otherwise 1.
tpd_send() {
    TPD_RESULT=
    TPD_OUTCOME=unusable
    case $#,${1-},${2-} in
        0,* | 1,* | 2,* | 3,TSA_ExecuteCommand,?*) ;;
        *) return 1 ;;
    esac
    tpd_status=0
    TPD_RESULT=$(tpd_adb shell "timeout ${TPD_LIMIT:-30} tpd$(tpd_quote "$@")") || tpd_status=$?
    case $tpd_status,$TPD_RESULT in
        124,*)
            TPD_OUTCOME=late
            tpd_adb shell tpd reboot >/dev/null
            ;;
        0,"please exe 'adb shell setenforce 0' in g_tpdCmd"*) TPD_OUTCOME=refused ;;
        0,"0P_1P; "* | 0,"can NOT alloc memory for "*) TPD_OUTCOME=unsent ;;
        0,"0F_1F; "* | 0,"corvane_daemon binder server execute command return ERROR, "*)
            TPD_OUTCOME=failed
            ;;
        0,*)
            TPD_OUTCOME=answered
            return 0
            ;;
        *) TPD_OUTCOME=broken ;;
    esac
    return 1
}
