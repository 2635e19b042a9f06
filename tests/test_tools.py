"""The device's shell commands, its faults by name, and adb"""
import os
import re
from subprocess import PIPE, Popen

import pytest

from virtual_device import PASS, PERMISSIVE


def test_takes_any_legal_name_for_a_property(device):
    device.setprop("-e", "value")
    assert device.getprop("-e") == "value"
    assert "[-e]: [value]\n" in device.output("getprop")


def test_leaves_nothing_of_a_write_that_fails(device):
    done = device.run("sh", "-c", "trap '' XFSZ; ulimit -f 0; setprop key value")
    assert done.returncode == 1
    assert done.stderr.startswith("Failed to set property 'key' to 'value'.\n")
    assert device.getprop("key") == ""
    assert os.listdir(device.root / "tmp") == []


@pytest.mark.parametrize("key", ["system/../.. selinux", "system ../../selinux"])
def test_keeps_settings_in_their_folder(device, key):
    device.run("settings", "put", *key.split(), "Permissive")
    assert device.output("getenforce") == "Enforcing\n"


def test_prints_what_passes_the_filter(device):
    device.output("logcat", "-c")
    device.tpd("captest")
    logged = device.output("logcat", "-d", "-s", "-v", "brief", "tpd:E")
    texts = re.findall(r"^E/tpd *\( *\d+\): (.*)\n", logged, re.M)
    assert texts == ["enter", "ThpGetBinder ret = 0"]


def test_follows_the_log(device):
    command = ["logcat", "-v", "raw", "-s", "corvane_daemon:E"]
    with Popen(command, env=device.env, stdout=PIPE) as logcat:
        device.tpd("debugRawEnable")
        assert b"thp.debug.raw, [new]true" in logcat.stdout.readline()
        logcat.kill()


def test_gives_recorded_answers(device):
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


def test_records_only_what_a_daemon_can_answer(device):
    largest = "r" * 1040383
    device.output("device", "answer", "captest", "-", input=largest)
    assert device.run("device", "answer", "captest", "-", input=largest + "r").returncode == 1
    assert device.run("device", "answer", "captest", "-", input="a\0b").returncode == 1
    assert device.tpd("captest") == largest + "\n"


WRONG_USES = [
    "logcat -d -x",
    "setprop a",
    "adb push a b",
    "device answer captest",
]


@pytest.mark.parametrize("command", WRONG_USES)
def test_refuses_wrong_use(device, command):
    done = device.run(*command.split())
    assert done.returncode in (1, 2)
    assert done.stdout == ""
    assert done.stderr != ""


def test_serves_adb_shell(device):
    done = device.run("adb", "shell", "tpd", "captest;", "exit", "3")
    assert (done.returncode, done.stdout) == (3, PASS)
