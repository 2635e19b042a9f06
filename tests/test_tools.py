"""The device's shell commands, its faults by name, and adb"""
import os
import subprocess

import pytest

from virtual_device import PASS, SOURCE


def test_lists_properties_sorted(device):
    listed = device.output("getprop").splitlines()
    assert "[ro.build.display.id]: [VIRTUAL-11.0]" in listed
    assert listed == sorted(listed)


def test_takes_a_property_for_no_option(device):
    device.setprop("-e", "value")
    assert device.getprop("-e") == "value"


@pytest.mark.parametrize(
    "key, value",
    [("ro.build.display.id", "2"), ("../selinux", "1"), ("long", "x" * 92), ("folder", "2")],
    ids=["read-only", "path", "value too long", "folder"],
)
def test_refuses_a_property(device, key, value):
    (device.root / "properties/folder").mkdir()
    before = device.output("getprop")
    done = device.run("setprop", key, value)
    failure = f"Failed to set property '{key}' to '{value}'.\n"
    assert (done.returncode, done.stderr) == (1, failure)
    assert device.output("getprop") == before
    assert os.listdir(device.root / "tmp") == []


def test_stores_settings(device):
    assert device.output("settings", "get", "system", "a") == "null\n"
    device.output("settings", "put", "system", "a", "1")
    assert device.output("settings", "get", "system", "a") == "1\n"
    device.output("settings", "delete", "system", "a")
    assert device.output("settings", "list", "system") == ""


@pytest.mark.parametrize("space, key", [("system/../..", "selinux"), ("system", "../../selinux")])
def test_keeps_settings_in_their_folder(device, space, key):
    assert device.run("settings", "put", space, key, "Permissive").returncode != 0
    assert device.output("getenforce") == "Enforcing\n"


def test_prints_the_log(device):
    device.output("logcat", "-c")
    device.tpd("stop")
    logged = device.output("logcat", "-d", "-v", "raw").splitlines()
    assert logged[:2] == ["InitTpdCmds[120] +", "ExcuteTpdCmd[142] +"]
    assert device.output("logcat", "-t", "1", "-v", "brief").startswith("E/corvane_daemon(")


def test_prints_what_passes_the_filter(device):
    device.output("logcat", "-c")
    device.tpd("captest")
    logged = device.output("logcat", "-d", "-s", "-v", "raw", "tpd:E")
    assert logged == "enter\nThpGetBinder ret = 0\n"


def test_follows_the_log(device):
    command = ["logcat", "-v", "raw", "-s", "corvane_daemon:E"]
    with subprocess.Popen(command, env=device.env, stdout=subprocess.PIPE) as logcat:
        device.tpd("debugRawEnable")
        assert b"thp.debug.raw, [new]true" in logcat.stdout.readline()
        logcat.kill()


@pytest.mark.parametrize(
    "command",
    [
        "logcat -d -x",
        "logcat -d -v long",
        "setprop a",
        "setenforce 2",
        "device restart",
        "device fault die_befor",
        "device fault hang 1O0",
    ],
)
def test_refuses_wrong_use(device, command):
    done = device.run(*command.split())
    assert done.returncode in (1, 2)
    assert done.stdout == ""
    assert done.stderr != ""
    assert device.getprop("sim.fault") == ""


def test_switches_a_fault_on_and_off(device):
    device.output("device", "fault", "no_text")
    assert device.tpd("captest") == "\n"
    device.output("device", "fault", "none")
    assert device.tpd("captest") == PASS


def test_has_a_shell(device):
    done = device.run("device", "shell", "tpd captest;", "exit 7")
    assert (done.returncode, done.stdout) == (7, PASS)


def test_works_from_anywhere(device, tmp_path):
    (tmp_path / "link").symlink_to(SOURCE / "scripts/device")
    environment = device.env | {"CDPATH": f"{SOURCE}:/"}
    stdout = device.output(tmp_path / "link", "root", env=environment, cwd="/")
    assert stdout == f"{device.root}\n"


def test_works_without_standard_descriptors(device):
    device.output("sh", "-c", "exec setprop a.b 1 <&- >&- 2>&-")
    assert device.getprop("a.b") == "1"


@pytest.fixture
def adb(device):
    path = f"{SOURCE}/device/host:{device.env['PATH']}"
    return lambda *arguments: device.run("adb", *arguments, env=device.env | {"PATH": path})


def test_serves_adb_shell(adb):
    done = adb("shell", "echo", "a;", "tpd", "captest;", "exit", "3")
    assert (done.returncode, done.stdout) == (3, "a\n" + PASS)


@pytest.mark.parametrize("command", ["wait-for-device", "root", "remount", "devices", "logcat -d"])
def test_serves_adb(adb, command):
    assert adb(*command.split()).returncode == 0


def test_refuses_other_uses_of_adb(adb):
    done = adb("push", "a", "b")
    assert done.returncode == 1
    assert "push" in done.stderr


def test_leaves_no_trace_when_it_is_ended(stopped_device):
    stopped_device.output("device", "start", "--permissive")
    stopped_device.output("device", "fault", "hang", "60000")
    stopped_device.run("timeout", "1", "device", "trace", "captest")
    assert not (stopped_device.root / "trace").exists()
