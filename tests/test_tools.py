"""The device's shell commands, and recorded answers"""
import os
import struct
import time
from subprocess import PIPE, Popen

import pytest

from virtual_device import LIMIT_S, PASS, PERMISSIVE, wait_until


def test_getprop_prints_long_values(device):
    device.setprop("ro.long", "x" * 200)
    assert device.getprop("ro.long") == "x" * 200
    assert f"[ro.long]: [{'x' * 200}]\n" in device.output("getprop")


def test_setprop_writes_only_changes(device):
    device.shell("setprop a 1; setprop a 1; setprop a 2")
    writes = device.events("property_write", who="setprop")
    assert [write["new"] for write in writes if write["name"] == "a"] == ["1", "2"]


LOG = "log -p e -t one first; log -t two second & wait; logcat -d -s"
OUTPUTS = {
    f"{LOG} -v tag one two": "E/one     : first\nI/two     : second\n",
    f"{LOG} -v raw one:E two:E": "first\n",
    f"{LOG} -v raw -e d$ one two": "second\n",
    f"{LOG} -v raw -t 1 -b main,crash one two": "second\n",
    f"{LOG} -v raw *:E": "first\n",
    f"{LOG} -v raw --pid $! one two": "second\n",
    f"{LOG} -v raw -f file one; logcat -d -v raw -f file -s two; cat file": "first\nsecond\n",
    "tpd captest >file; logcat -d -v raw -s tpd:E": "enter\nThpGetBinder ret = 0\n",
    "getprop unset default; getprop ro.product.model": "default\nvirtual\n",
    "setenforce 0; getenforce; setenforce 1; getenforce": "Permissive\nEnforcing\n",
    "id -u; whoami; id -gn; id": "0\nroot\nroot\nuid=0(root) gid=0(root) groups=0(root)\n",
    "a=(1 2); [[ ${#a[@]} = 2 ]] && echo ${a[1]}": "2\n",
}


@pytest.mark.parametrize("command", OUTPUTS)
def test_shell_commands_print_what_a_phone_prints(device, tmp_path, command):
    assert device.shell(command, cwd=tmp_path) == OUTPUTS[command]


def test_logcat_follows_a_cleared_log(device):
    device.shell("log -t life first; log -t life last")
    command = ["timeout", str(LIMIT_S), "logcat", "-v", "raw", "-T", "1", "-s", "life"]
    with Popen(command, env=device.env, stdout=PIPE) as logcat:
        assert logcat.stdout.readline() == b"last\n"
        device.shell("logcat -c")
        device.shell("log -t life a text longer than both; log -t life next")
        assert b"longer" in logcat.stdout.readline()
        assert logcat.stdout.readline() == b"next\n"
        logcat.terminate()


def test_logcat_starts_at_a_time(device):
    device.shell("log -t one first; sleep 0.01; log -t two second")
    seconds = device.shell("logcat -d -v epoch -s two").split()[0]
    date = device.shell("logcat -d -s two")[: len("MM-DD hh:mm:ss.mmm")]
    for since in seconds, date, f"{time.localtime().tm_year}-{date}":
        shown = device.output("logcat", "-v", "raw", "-t", since, "-s", "one", "two")
        assert shown == "second\n", since


def test_logcat_prints_binary_and_long_entries(device):
    device.shell("log -p e -t one first")
    binary = device.output("logcat", "-d", "-B", "-s", "one", encoding=None)
    size, header, process, thread, seconds, ns, *_ = struct.unpack_from("<HHiIIIII", binary)
    assert (header, size, binary[28:]) == (28, 11, b"\6one\0first\0")
    when = time.strftime("%m-%d %H:%M:%S", time.localtime(seconds))
    expected = f"[ {when}.{ns // 1000000:03} {process:5}:{thread:5} E/one      ]\nfirst\n\n"
    assert device.shell("logcat -d -v long -s one") == expected


def test_log_continues_after_the_disk_was_full(device):
    too_large = f"logcat -c; trap '' XFSZ; ulimit -f 1; log {'x' * 1000}"
    assert "cannot log: No space left on device" in device.run("bash", "-c", too_large).stderr
    assert (device.root / "trace").stat().st_mode & 0o777 == 0o400
    device.shell("log '{\"time\":1'; log second")
    assert device.shell("logcat -d -v raw") == '{"time":1\nsecond\n'


def test_daemon_returns_recorded_answers(device):
    device.answer("THP_GetVersion", "v%d")
    device.answer("THP_SetFoldState 1", "-", input="\xff\n\n")
    device.answer("THP_SetFoldState", "other")
    device.output("device", "reboot")
    device.setprop(PERMISSIVE, "true")
    assert device.tpd("THP_GetVersion", "x") == "v%d\n"
    assert device.tpd("THP_SetFoldState", "1") == "\xff\n\n"
    for unknown in "THP_SetFoldState 1", "THP_Set", "SetFoldState":
        assert "unknown command" in device.tpd(unknown)
    device.answer("--remove", "THP_SetFoldState 1")
    assert device.tpd("THP_SetFoldState", "1") == "other\n"
    assert device.answer() == "THP_GetVersion\nTHP_SetFoldState\n"


def test_rejects_answers_that_the_daemon_cannot_send(device):
    largest = "%s%n\xff".ljust(1040383, "r")
    device.answer("captest", "-", input=largest)
    for invalid in (largest + "r", "a\0b", ""):
        done = device.run("device", "answer", "captest", "-", input=invalid)
        assert done.returncode == 1
    assert device.tpd("captest") == largest + "\n"


FULL = "trap '' XFSZ; ulimit -f 0;"
ERRORS = {
    "device answer captest a b": "expected two arguments",
    f"device answer {'x' * 256} text": "File name too long",
    "device fault hang 1O0": "invalid fault 'hang 1O0'; see 'device fault'",
    "device fault hang 1 2 3": "unexpected argument '3'",
    "device fault hangg": "invalid fault 'hangg'",
    "device fault no_text 0": "invalid fault 'no_text 0'",
    "device fault no_text 1 2": "invalid fault 'no_text 1 2'",
    "device shell mount": "not found",
    "device start --permissive x": "unexpected argument 'x'",
    "device status >/dev/full": "cannot write",
    "getprop >/dev/full": "cannot write",
    "log -p q text": "usage: log",
    "logcat -d -v none": "'none'",
    "setprop .a 1": "The name is illegal",
    "settings put system ../../selinux Permissive": "usage: settings",
    f"{FULL} log text": "cannot log",
    f"{FULL} setprop a 1": "Failed to set property 'a' to '1'",
}


@pytest.mark.parametrize("command", ERRORS)
def test_reports_errors_and_leaves_no_files(device, command):
    done = device.run("bash", "-c", command)
    assert done.returncode in (1, 2, 127)
    assert done.stdout == ""
    assert ERRORS[command] in done.stderr
    assert os.listdir(device.root / "tmp") == []


def test_refuses_a_fifo_as_the_log(device):
    (device.root / "log").unlink()
    os.mkfifo(device.root / "log")
    reader = os.open(device.root / "log", os.O_RDONLY | os.O_NONBLOCK)
    assert "not a regular file" in device.run("logcat", "-d").stderr
    assert device.tpd("captest") == PASS
    assert os.read(reader, 1) == b""


def test_toybox_provides_the_commands_linked_to_it(device):
    links = device.shell("IFS=:; find $PATH -lname '*/toybox'").split()
    names = {os.path.basename(link) for link in links}
    assert names - set(device.output("toybox").split()) == set()


def test_shell_sees_only_processes_of_its_device(device):
    (daemon,) = device.processes("corvane_daemon")
    assert device.shell("pgrep '^(corvane|python)'") == f"{daemon}\n"
    assert "python" not in device.shell("ps -ef")
    columns = "USER PID PPID VSZ RSS WCHAN ADDR S NAME"
    assert device.shell("ps --help >/dev/null && ps").splitlines()[0].split() == columns.split()
    device.shell("pkill -9 corvane_daemon")
    wait_until(lambda: device.restarts() == 1)
