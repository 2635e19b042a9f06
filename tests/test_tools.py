"""The device's shell commands, faults by name, and adb"""
import os
import subprocess

import pytest

from virtual_device import PASS, SOURCE


def lines(text):
    return text.splitlines()


def test_lists_properties_sorted(device):
    listed = lines(device.output("getprop"))
    assert "[ro.build.display.id]: [VIRTUAL-11.0]" in listed
    assert listed == sorted(listed)


def test_takes_any_legal_property_name(device):
    device.setprop("-e", "value")
    assert device.getprop("-e") == "value"


REFUSED_PROPERTIES = {
    "read-only": ("ro.build.display.id", "2"),
    "two dots": ("a..b", "2"),
    "no name": ("../selinux", "Permissive"),
    "value too long": ("a.b", "x" * 92),
    "a folder": ("a.folder", "2"),
}


@pytest.mark.parametrize("key, value", REFUSED_PROPERTIES.values(), ids=REFUSED_PROPERTIES)
def test_refuses_a_property(device, key, value):
    (device.root / "properties/a.folder").mkdir()
    before = device.output("getprop")
    done = device.run("setprop", key, value)
    assert done.returncode == 1
    assert done.stderr == f"Failed to set property '{key}' to '{value}'.\n"
    assert device.output("getprop") == before
    assert os.listdir(device.root / "tmp") == []


def test_stores_settings(device):
    assert device.output("settings", "get", "system", "a") == "null\n"
    device.output("settings", "put", "system", "a", "1")
    assert device.output("settings", "list", "system") == "a=1\n"
    device.output("settings", "delete", "system", "a")
    assert device.output("settings", "list", "system") == ""


@pytest.mark.parametrize("space, key", [("system/../..", "selinux"), ("system", "../x")])
def test_keeps_settings_in_their_folder(device, space, key):
    done = device.run("settings", "put", space, key, "Permissive")
    assert done.returncode != 0
    assert done.stderr
    assert device.output("getenforce") == "Enforcing\n"


def test_prints_the_log(device):
    device.output("logcat", "-c")
    device.tpd("stop")
    logged = device.output("logcat", "-d", "-v", "raw").splitlines()
    assert logged[:2] == ["InitTpdCmds[120] +", "ExcuteTpdCmd[142] +"]
    brief = lines(device.output("logcat", "-d", "-v", "brief", "-t", "1"))
    assert len(brief) == 1 and brief[0].startswith("E/corvane_daemon(")


def test_prints_only_log_lines_that_pass_the_filter(device):
    device.output("logcat", "-c")
    device.tpd("captest")
    logged = lines(device.output("logcat", "-d", "-s", "-v", "raw", "tpd:E"))
    assert logged == ["enter", "ThpGetBinder ret = 0"]


def test_follows_the_log(device):
    device.output("logcat", "-c")
    command = ["logcat", "-v", "raw", "-s", "corvane_daemon"]
    with subprocess.Popen(command, env=device.env, stdout=subprocess.PIPE) as logcat:
        device.tpd("stop")
        assert logcat.stdout.readline() == b"InitTpdCmds[120] +\n"
        logcat.kill()


WRONG_USE = {
    "unknown option": ["logcat", "-d", "-x"],
    "unknown format": ["logcat", "-d", "-v", "long"],
    "setprop without a value": ["setprop", "a"],
    "setenforce without a mode": ["setenforce", "2"],
    "unknown verb": ["device", "restart"],
    "mistyped fault": ["device", "fault", "die_befor"],
    "argument that is no number": ["device", "fault", "hang", "long"],
}


@pytest.mark.parametrize("command", WRONG_USE.values(), ids=WRONG_USE)
def test_refuses_wrong_use(device, command):
    done = device.run(*command)
    assert done.returncode in (1, 2)
    assert (done.stdout, bool(done.stderr)) == ("", True)
    assert device.getprop("sim.fault") == ""


def test_lists_faults(device):
    listed = device.output("device", "fault")
    for name in ("die_before", "hang", "status"):
        assert name in listed


def test_ends_a_fault(device):
    device.output("device", "fault", "no_text")
    assert device.tpd("captest") == "\n"
    device.output("device", "fault", "none")
    assert device.tpd("captest") == PASS


def test_finds_tools_and_status_in_its_shell(device):
    assert device.shell("getprop odm.thp.binder; tpd captest") == "1\n" + PASS
    assert device.run("device", "shell", "exit 7").returncode == 7


def test_survives_closed_descriptors_and_strange_surroundings(device, tmp_path):
    (tmp_path / "link").symlink_to(SOURCE / "scripts/device")
    environment = device.env | {"CDPATH": "/:/tmp"}
    assert device.output(tmp_path / "link", "root", env=environment, cwd="/") == f"{device.root}\n"
    device.output("sh", "-c", "exec setprop a.b 1 <&- >&- 2>&-")
    assert device.getprop("a.b") == "1"


@pytest.fixture
def adb(device):
    path = f"{SOURCE}/device/host:{device.env['PATH']}"
    return lambda *arguments: device.run("adb", *arguments, env=device.env | {"PATH": path})


def test_passes_adb_shell_on(adb):
    done = adb("shell", "echo", "a;", "tpd", "captest;", "exit", "3")
    assert (done.returncode, done.stdout) == (3, "a\n" + PASS)


@pytest.mark.parametrize("command", ["wait-for-device", "root", "remount", "devices"])
def test_knows_what_scripts_ask_of_adb(adb, command):
    assert adb(command).returncode == 0


def test_reads_the_log_through_adb(adb):
    adb("shell", "tpd captest")
    assert "ThpGetBinder" in adb("logcat", "-d").stdout


def test_refuses_other_commands_of_adb(adb):
    done = adb("push", "a", "b")
    assert done.returncode == 1
    assert "push" in done.stderr
