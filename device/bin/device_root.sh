# shellcheck shell=sh
# For the device's shell commands: $root is the device root, as the platform finds it.
# shellcheck disable=SC2034
root=${TPD_DEVICE_ROOT:-${XDG_STATE_HOME:-$HOME/.local/state}/tpd-device}
umask 077
