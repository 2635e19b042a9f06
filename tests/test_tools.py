"""The device's shell commands, its faults by name, and adb"""
import os
import re
from subprocess import PIPE, Popen

import pytest

from virtual_device import PASS, PERMISSIVE, SOURCE, wait_until


def shell(device, command, **options):
    return device.run("adb", "shell", command, **options).stdout


def test_accepts_any_valid_property_name(device):
    device.setprop("-e", "value")
    assert device.getprop("-e") == "value"
    assert "[-e]: [value]\n" in device.output("getprop")


def test_failed_write_leaves_no_file(device):
    done = device.run("sh", "-c", "trap '' XFSZ; ulimit -f 0; setprop key value")
    assert done.returncode == 1
    assert done.stderr.startswith("Failed to set property 'key' to 'value'.\n")
    assert device.getprop("key") == ""
    assert os.listdir(device.root / "tmp") == []


def test_getprop_prints_long_values_and_defaults(device):
    device.setprop("ro.long", "x" * 200)
    assert device.getprop("ro.long") == "x" * 200
    assert f"[ro.long]: [{'x' * 200}]\n" in device.output("getprop")
    assert device.output("getprop", "unset", "default") == "default\n"


def test_setenforce_switches_selinux(device):
    modes = [device.output("sh", "-c", f"setenforce {n}; getenforce") for n in (0, 1)]
    assert modes == ["Permissive\n", "Enforcing\n"]


def test_shows_a_missing_setting_as_null(device):
    assert device.output("settings", "get", "system", "missing") == "null\n"


@pytest.mark.parametrize("key", ["system/../.. selinux", "system ../../selinux"])
def test_keeps_settings_in_their_directory(device, key):
    device.run("settings", "put", *key.split(), "Permissive")
    assert device.output("getenforce") == "Enforcing\n"


def test_logcat_filters_by_tag_and_priority(device):
    device.output("logcat", "-c")
    device.tpd("captest")
    logged = device.output("logcat", "-d", "-s", "-v", "brief", "tpd:E")
    texts = re.findall(r"^E/tpd *\( *\d+\): (.*)\n", logged, re.M)
    assert texts == ["enter", "ThpGetBinder ret = 0"]


@pytest.mark.parametrize(
    "name, value, rule",
    [(".a", "1", "name"), ("a", "x" * 92, "91 bytes"), ("a", b"\xff", "UTF-8")],
)
def test_setprop_names_the_broken_rule(device, name, value, rule):
    assert rule in device.run("setprop", name, value).stderr


def test_reboots_from_the_shell(device):
    shell(device, "setenforce 0; setprop persist.a 1; setprop a 1")
    assert shell(device, "reboot; getenforce; getprop a") == "Enforcing\n\n"
    assert device.getprop("persist.a") == "1"
    assert device.is_up()


def test_logcat_follows_the_log(device):
    command = ["logcat", "-v", "raw", "-s", "corvane_daemon:E"]
    with Popen(command, env=device.env, stdout=PIPE) as logcat:
        device.tpd("debugRawEnable")
        assert b"thp.debug.raw, [new]true" in logcat.stdout.readline()
        logcat.kill()


def test_daemon_returns_recorded_answers(device):
    device.output("device", "answer", "THP_GetVersion", "v%d")
    device.output("device", "answer", "THP_SetFoldState 1", "-", input="\xff\n\n")
    device.output("device", "stop")
    device.start()
    device.setprop(PERMISSIVE, "true")
    assert device.tpd("THP_GetVersion", "x") == "v%d\n"
    assert device.tpd("THP_SetFoldState", "1") == "\xff\n\n"
    assert device.tpd("THP_SetFoldState", "0") == "THP_SetFoldState: done (0)\n"


def test_forgets_removed_answers(device):
    device.output("device", "answer", "captest a/b", "recorded")
    assert device.output("device", "answer") == "captest a/b\n"
    device.output("device", "answer", "--remove", "captest a/b")
    assert device.output("device", "answer") == ""
    assert device.tpd("captest") == PASS


def test_rejects_answers_that_the_daemon_cannot_send(device):
    largest = "r" * 1040383
    device.output("device", "answer", "captest", "-", input=largest)
    assert device.run("device", "answer", "captest", "-", input=largest + "r").returncode == 1
    assert device.run("device", "answer", "captest", "-", input="a\0b").returncode == 1
    assert device.tpd("captest") == largest + "\n"


def test_logcat_follows_a_cleared_log(device):
    device.output("log", "-t", "life", "first")
    command = ["logcat", "-v", "raw", "-s", "life"]
    with Popen(command, env=device.env, stdout=PIPE) as logcat:
        assert logcat.stdout.readline() == b"first\n"
        device.output("logcat", "-c")
        device.output("log", "-t", "life", "a text longer than first")
        assert b"longer" in logcat.stdout.readline()
        logcat.kill()


LOG_SELECTIONS = {
    "-v tag": "E/one     : first\nI/two     : second\n",
    "-v raw -e d$": "second\n",
    "-v raw -t 1 -b main,crash": "second\n",
    "-v raw --pid 1": "",
}


@pytest.mark.parametrize("options", LOG_SELECTIONS)
def test_logcat_selects_entries(device, options):
    device.output("logcat", "-c")
    device.output("log", "-p", "e", "-t", "one", "first")
    device.output("log", "-t", "two", "second")
    logged = device.output("logcat", "-d", *options.split(), "one", "two", "*:s")
    assert logged == LOG_SELECTIONS[options]


def test_refuses_a_fifo_as_the_log(device):
    (device.root / "log").unlink()
    os.mkfifo(device.root / "log")
    assert device.run("logcat", "-d").returncode == 1


USAGE_ERRORS = [
    "logcat -d -x",
    "logcat -d -b none",
    "log -p q text",
    "setprop a",
    "adb push a b",
    "device answer captest",
    "adb -s other shell true",
    "adb -d shell true",
]


@pytest.mark.parametrize("command", USAGE_ERRORS)
def test_reports_usage_errors(device, command):
    done = device.run(*command.split())
    assert done.returncode in (1, 2)
    assert done.stdout == ""
    assert done.stderr != ""


def test_refuses_the_shell_of_a_stopped_device(stopped_device):
    done = stopped_device.run("device", "shell", "echo", "hi")
    assert (done.returncode, done.stdout) == (1, "")
    assert "device is stopped" in done.stderr


def test_serves_adb_shell(device):
    done = device.run("adb", "shell", "tpd", "captest;", "exit", "3")
    assert (done.returncode, done.stdout) == (3, PASS)
    array = "a=(1 2); [[ ${#a[@]} = 2 ]] && echo ${a[1]}"
    assert shell(device, array) == "2\n"


def test_finds_the_listed_commands_and_no_others(device):
    lines = (SOURCE / "device/commands").read_text().splitlines()
    listed = {name for line in lines if not line.startswith("#") for name in line.split()[1:]}
    found = shell(device, 'IFS=:; for d in $PATH; do ls "$d"; done')
    assert set(found.split()) == listed
    for name in ["mount", "python3", "top", "toybox"]:
        assert shell(device, f"type {name}") == f"{name} not found\n"


def test_shell_sees_only_processes_of_its_device(device):
    daemon = device.processes("corvane_daemon")
    init = device.processes("init")
    both = "".join(f"{process}\n" for process in sorted(init + daemon))
    assert shell(device, "pidof corvane_daemon") == f"{daemon[0]}\n"
    assert shell(device, "pgrep '^(init|corvane)'") == both
    assert shell(device, "timeout 9 pgrep python; ps -p 1") == ""
    assert "init" in shell(device, "ps -A -o NAME=")
    assert "python" not in shell(device, "ps -ef")
    shell(device, "pkill -9 corvane_daemon")
    wait_until(lambda: device.restarts() == 1)


@pytest.mark.parametrize("option, count", [("", 1), ("-n", 3)])
def test_adb_shell_reads_standard_input_without_n(device, option, count):
    loop = f"while read -r x; do echo $x; adb shell {option} true; done"
    done = device.run("bash", "-c", loop, input="a\nb\nc\n")
    assert len(done.stdout.split()) == count


def test_reports_a_refused_root_once(device):
    device.root.chmod(0o755)
    done = device.run("adb", "wait-for-device")
    device.root.chmod(0o700)
    assert done.returncode == 1
    assert done.stderr.count("its mode must be 0700") == 1


def test_writes_the_log_to_a_file_with_any_name(device, tmp_path):
    file = tmp_path / "a\tb c"
    device.output("log", "-t", "life", "text")
    device.output("adb", "logcat", "-d", "-v", "raw", "-s", "-f", str(file), "life")
    assert file.read_text() == "text\n"
