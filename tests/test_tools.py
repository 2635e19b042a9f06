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


FAILED_WRITES = {"folder": 'mkdir "$0/properties/key"', "disk": "trap '' XFSZ; ulimit -f 0"}


@pytest.mark.parametrize("obstacle", FAILED_WRITES.values(), ids=FAILED_WRITES)
def test_leaves_nothing_of_a_write_that_fails(device, obstacle):
    done = device.run("sh", "-c", f"{obstacle}; setprop key value", device.root)
    assert (done.returncode, device.getprop("key")) == (1, "")
    assert done.stderr == "Failed to set property 'key' to 'value'.\n"
    assert os.listdir(device.root / "tmp") == []


def test_stores_settings(device):
    device.output("settings", "put", "system", "a", "1")
    assert device.output("settings", "get", "system", "a") == "1\n"
    device.output("settings", "delete", "system", "a")
    assert device.output("settings", "get", "system", "a") == "null\n"


@pytest.mark.parametrize("key", ["system/../.. selinux", "system ../../selinux"])
def test_keeps_settings_in_their_folder(device, key):
    assert device.run("settings", "put", *key.split(), "Permissive").returncode == 1
    assert device.output("getenforce") == "Enforcing\n"


def test_prints_what_passes_the_filter(device):
    device.output("logcat", "-c")
    device.tpd("captest")
    logged = device.output("logcat", "-d", "-s", "-v", "raw", "tpd:E")
    assert logged == "enter\nThpGetBinder ret = 0\n"


def test_prints_who_logged(device):
    device.tpd("stop")
    last = device.output("logcat", "-t", "1", "-v", "brief")
    assert last.startswith("E/corvane_daemon(")


def test_follows_the_log(device):
    command = ["logcat", "-v", "raw", "-s", "corvane_daemon:E"]
    with subprocess.Popen(command, env=device.env, stdout=subprocess.PIPE) as logcat:
        device.tpd("debugRawEnable")
        assert b"thp.debug.raw, [new]true" in logcat.stdout.readline()
        logcat.kill()


WRONG_USES = ["logcat -d -x", "setprop a", "device fault die_befor", "device fault hang 1O0"]


@pytest.mark.parametrize("command", WRONG_USES)
def test_refuses_wrong_use(device, command):
    done = device.run(*command.split())
    assert done.returncode in (1, 2)
    assert done.stdout == ""
    assert done.stderr != ""
    assert device.getprop("sim.fault") == ""


def test_works_from_anywhere(device, tmp_path):
    (tmp_path / "link").symlink_to(SOURCE / "scripts/device")
    environment = device.env | {"CDPATH": f"{SOURCE}:/"}
    stdout = device.output(tmp_path / "link", "root", env=environment, cwd="/")
    assert stdout == f"{device.root}\n"


def test_serves_adb_shell(device):
    adb = SOURCE / "device/host/adb"
    done = device.run(adb, "shell", "echo", "a;", "tpd", "captest;", "exit", "3")
    assert (done.returncode, done.stdout) == (3, "a\n" + PASS)


def test_refuses_what_adb_cannot_do_here(device):
    done = device.run(SOURCE / "device/host/adb", "push", "a", "b")
    assert done.returncode == 1
    assert "push" in done.stderr
