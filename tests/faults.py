"""faults.py [ROUNDS]: the fault campaign on the shipped tool, each fault on a device of its own"""
import os, struct, subprocess, sys

from virtual_device import (BUILD, GONE, HANG, NO_SERVICE, REAL, REFUSED, RESET, SERVICE, TIMEOUT,
                            UNREAD, campaign)


def frame(body=b"done\0\0\0\0", status=0, size=None):
    return struct.pack("<iI", status, len(body) if size is None else size) + body


# What the service replies to each call and then to all, words that set up, words typed, what is
# printed, what the tool writes and which of its steps fail, the seconds that it waits.
def rows():
    ok, done, dead, absent = [frame()], "done\n", "retry =*2 " + RESET, "failed*2 " + RESET
    null, other, own = "debug.selinux.permissive=null", "unknown command: x\n", "unshare -rm sh -c "
    down = "0P_1P; check_time: 10.thp.dae_alive : {}. thp.binder: {} reboot_times: 0\n"
    flip = "put odm.thp.dae_alive 0; printf true >y; when 'CheckAlive {}' mv y $P/odm.thp.{}"
    late = f"mv {SERVICE} x; (sleep {{}}; mv x {SERVICE}) & TPD_GET_SERVICE_MS=1000 tpd x"
    yield from (
        ([], "", "tpd x", NO_SERVICE, absent, .4), ([UNREAD, *ok], "", "tpd x", done, "retry ="),
        (ok, "", late.format(.5), done, "", .4), (ok, "", late.format(1.4), done, "failed", 1),
        ([GONE], "", "tpd x", NO_SERVICE, "retry = " + absent, .4),
        ([frame(b"")], "", "tpd x", "\n", ""), ([frame(b"abcd")], "", "tpd x", "\n", ""),
        ([frame(b"%s%n ERROR \xff\n\0x\0") + frame()], "", "tpd x", "%s%n ERROR \xff\n\n", ""),
        (ok, flip.format(1, "dae_alive"), "tpd x", done, "CheckAlive*2"),
        (ok, flip.format(4, "dae_alive"), "tpd x", done, "CheckAlive*5", .8),
        (ok, flip.format(9, "dae_alive"), "tpd x", done, "CheckAlive*10", 1.8),
        (ok, flip.format(4, "is_updating_fw"), "tpd x", "0P_1P; bypass-when-fw-updatingcheck_time: "
         "5.thp.dae_alive : 0. thp.binder: 1\n", "CheckAlive*5", .8),
        (ok, "put odm.thp.binder 0; put x 0; put y 1; when 'Alive 4' sh -c 'cd $P; mv x odm.thp."
         "dae_alive; mv y odm.thp.binder'", "tpd x", down.format(0, 1), "CheckAlive*11", 2),
        (REAL, "setprop sim.fault_arg 9000; setprop sim.fault hang", "when 'Binder ret' setprop "
         "odm.thp.service_enable 0; tpd x", NO_SERVICE, "retry = failed*2 service_enable=1", .4))
    for die, *got in (("before", TIMEOUT, dead), ("during", TIMEOUT, dead), ("after", other, "")):
        yield REAL, f"setprop sim.fault die_{die}", "tpd x", *got
    for reply in (UNREAD, b"", b"\0\0\0", frame(b"", 0, 4), frame(b"ab\0", 0, 8), b"\xff" * 64,
                  frame(b"x\0", 0, 2**32 - 1), frame(b"r" * 1040384 + b"\0"), *(
                      frame(b"x\0", status) for status in (-1, -2, -12, -22, -32, -74, -2**31, 1))):
        yield [reply], "", "tpd x", TIMEOUT, dead
    for size in (0, 1, 91, 92, 4096, 1040384 - 1):
        yield [frame(b"r" * size + b"\0")], "", "tpd x", "r" * size + "\n", ""
    yield ([HANG] * 3 + ok, "", "for s in INT TERM KILL; do timeout -s $s .3 tpd x version:3+main;"
           " done; tpd x", done, "screen_status=version:3+main", .9)
    # Every property in every state: key, words, default, readings, value written, what follows
    for key, words, default, reads, value, after in (
        ("odm.thp.dae_alive", "x", "false", 11, "", "CheckAlive*11"),
        ("odm.thp.binder", "x", "0", 11, "", "CheckAlive*11"),
        ("odm.thp.is_updating_fw", "x", "false", 11, "", "CheckAlive*11"),
        ("odm.thp.dae_reboot_times", "x", "0", 2, "", ""),
        ("odm.thp.debug.selinux.permissive", "x", "null", 1, "true", ""),
        ("ro.logsystem.usertype", "log_enable", "", 1, "", "persist.thplog_enabled=true " + RESET),
        ("persist.odm.thp.thplog_enabled", "log_enable", "", 1, "true", RESET),
        ("odm.thp.debug.afelog", "log_afe_disable", "", 0, "false", RESET),
        ("odm.thp.service_enable", "stop", "", 0, "0", ""),
        ("odm.thp.screen_status", "x version:3+whole", "", 0, "version:3+whole", "")):
        text = done if words[0] == "x" else "\n"
        text = text if reads < 11 else down.format(int("binder" in key), int("binder" not in key))
        for state, damage in enumerate((
                "rm -f $P/{}", "rm -f $P/{0}; mkdir $P/{0}", "put {0} junk; chmod 400 $P/{0}",
                "put {} " + "x" * 91, r"put {} '\303\244'", r"put {} 't\0rue'", r"put {} '1\n'")):
            each = [default + f"*{6 * reads}" * state] * (default > "" and state < 2)
            each += [value + "*6" * (state in (1, 2))] * (value > "")
            trail = [f"{key.replace('odm.thp.', '')}={put}" for put in each] + after.split()
            damage = damage.format(key) + "; put odm.thp.dae_alive 0" * ("fw" in key)
            yield ok, damage, f"tpd {words}", text, " ".join(trail), 2 * (reads == 11)
    for passes, given in ((0, "echo >selinux"), (0, "echo >selinux; mkdir proc/cmdline"), *(
            (passes, f"echo >selinux; printf '{line}' >proc/cmdline") for passes, line in (
                (0, ""), (0, "%8175s enter_recovery=1"), (1, "%8174s enter_recovery=1"),
                (0, "%8176s enter_recovery=1"), (0, "%99983s enter_recovery=1"),
                (1, "enter_erecovery=1 %99982s"), (0, r"a\0 enter_recovery=1"),
                (1, "a=b  enter_recovery==1"), (1, "a=  enter_recovery===2"), (0, "enter_recovery"),
                (1, "enter_recovery=9999999999 enter_erecovery=-1e99"), (1, r"enter_recovery=1\0"),
                (0, "enter_recovery=" + "9" * 99), (1, "androidboot.swtype=xfactory"))), *(
            (passes, f"fake getenforce '{said}'") for passes, said in (
                (0, "true"), (1, "sleep 1; echo Permissive"), (0, "exit 1"), (0, "kill -9 $$"),
                (0, 'printf Permissive%290s | tr " " x'), (1, "echo PermissiveX"),
                (1, 'printf Permissive%189s | tr " " x'), (0, "echo NotPermissive")))):
        yield (ok, "rm $P/*permissive; " + given, "tpd x", done if passes else REFUSED, null +
               " debug.selinux.permissive=true" * (passes and "fake" in given), "sleep" in given)
    yield ok, "rm $P/*permissive", f"PATH={BUILD}:/bin; tpd x; tpd showtouch", REFUSED + "\n", null
    yield from ((ok, "fake settings 'exit 1'", typed, text, "") for typed, text in (
        ("tpd showtouch", "\n"), ("tpd x >&-", ""), ("tpd x >/dev/full", ""),
        ("tpd x <&- >&- 2>&-; sed '/^[0-9][0-9]-/d' log", ""),
        ("(sleep .1; tpd x; echo $? >ended) | :; exit $(cat ended)", "")))
    for word, text in (
            ("''", ""), ("'[TPD]'", "[TPD]"), ("'x[TPD]' ''", "x[TPD]"), ("'stop\n' ' '", "stop\n"),
            (r"$(printf '\377\300')", "\xff\xc0"), ("$(printf %131071s | tr ' ' x)", "x" * 131071),
            ("%s%n%n %n%s", "%s%n%n"), ("'`touch x`' '$(touch x);touch x|&'", "`touch x`"),
            ("x 'a\nversion:3+main'; getprop odm.thp.screen_status", "x\na\nversion:3+main")):
        yield REAL, "", f"tpd {word}; [ ! -e x ]", f"unknown command: {text}\n", ""
    yield REAL, "", "rm -r $R; tpd x", REFUSED, null
    yield REAL, "", "tpd x; find $R -type f -perm /077 -o ! -user $(id -u)", other, ""
    for given, said in (
            ("mkdir -m 755 x", "is open to other users; its mode must be 0700"),
            ("mkdir -m 700 y; ln -s y x", "Not a directory"),
            ("python3 -c 'import socket; socket.socket(1).bind(\"x\")'", "Not a directory"),
            *[("mkdir -m 700 x; chown 1 x", "belongs to another user")][os.geteuid():]):
        text = f"device root ROOT/x: {said}\n{REFUSED}"
        yield ok, given, "TPD_DEVICE_ROOT=$R/x tpd x 2>&1", text, ""
    yield [], "rm -r $P; touch $P", "tpd debugRawEnable", "\n", "thp.debug.raw=true*6"
    if subprocess.run(["unshare", "-rm", "true"], check=False).returncode != 0:
        print("left out, for want of user namespaces: read-only and full device root")
        return
    yield (ok, "", own + "'mount --bind $R $R && mount -o remount,bind,ro $R && cd $R && tpd "
           "debugRawEnable && tpd x && ! touch x 2>log'", "\ndone\n", "")
    yield ([], "", own + "'mount -t tmpfs -o size=16k,mode=700 x $R/proc && cd proc || exit; TPD"
           "_DEVICE_ROOT=$R/proc; tpd debugRawEnable; head -c 99999 /dev/zero >full; "
           "tpd debugDifEnable; cat properties/*; ls tmp'", "\n\ntrue", "")


if __name__ == "__main__":
    campaign(list(rows()), int((sys.argv + ["1"])[1]))
