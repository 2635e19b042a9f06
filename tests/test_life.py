"""The life cycle of the virtual device: start, supervision, reboot and stop"""
import concurrent.futures
import os
import shutil
import signal
import subprocess
import time

import pytest

from virtual_device import PASS, SERVICE, Device, wait_until


def run_at_once(device, verbs):
    """Runs `device VERB` for all verbs concurrently. Returns pairs of verb and exit status."""
    with concurrent.futures.ThreadPoolExecutor(len(verbs)) as pool:
        runs = pool.map(lambda verb: device.run("device", verb), verbs)
        return {(verb, run.returncode) for verb, run in zip(verbs, runs)}


@pytest.mark.parametrize("repeats", [3, pytest.param(100, marks=pytest.mark.soak)])
def test_concurrent_commands_succeed_and_leave_at_most_one_init(stopped_device, chance, repeats):
    assert run_at_once(stopped_device, ["start"] * 8) == {("start", 0)}
    expected = {("start", 0), ("stop", 0), ("status", 0), ("status", 3)}
    for _ in range(repeats):
        verbs = chance.choices(["start", "stop", "status"], k=20)
        assert run_at_once(stopped_device, verbs) - expected == set()
        assert len(stopped_device.processes("/init")) <= 1
    stopped_device.start()
    assert stopped_device.is_up()


def test_restarts_the_daemon_when_the_caller_ignored_sigchld(stopped_device):
    stopped_device.output("env", "--ignore-signal=CHLD", "device", "start")
    stopped_device.kill("corvane_daemon")
    wait_until(lambda: stopped_device.restarts() == 1 and stopped_device.is_up())


def test_waits_longer_before_each_restart_of_a_daemon_that_cannot_start(device):
    (device.root / "dev").rename(device.root / "away")
    (device.root / "dev").write_text("not a directory")
    device.kill("corvane_daemon")
    wait_until(lambda: len(device.events("restart_pause")) > 4)
    pauses = [event["ms"] for event in device.events("restart_pause")]
    assert pauses == sorted(set(pauses))
    assert len(device.events("log", who="init")) == 1


def test_init_is_detached_from_its_caller(stopped_device, tmp_path):
    with open(tmp_path / "file", "w") as file:
        stopped_device.start(cwd=tmp_path, pass_fds=[file.fileno()])
    (init,) = stopped_device.processes("/init")
    kept = stopped_device.output("ls", "-l", f"/proc/{init}", f"/proc/{init}/fd")
    assert str(tmp_path) not in kept
    assert os.getsid(init) == init


def test_boot_after_a_stuck_init_keeps_only_what_a_phone_keeps(device):
    device.shell("setprop persist.a 1; setprop b 1; settings put system c 1; setenforce 0; log d")
    device.kill("/init", signal.SIGSTOP)
    device.output("device", "stop")
    wait_until(lambda: not device.processes())
    (device.root / "tmp/left").write_text("")
    (device.root / SERVICE).with_name("left").write_text("")
    device.start()
    kept = device.shell("getprop persist.a; getprop b; settings get system c; getenforce")
    assert kept == "1\n\n1\nEnforcing\n"
    assert os.listdir(device.root / "tmp") == device.shell("logcat -d -s log").split() == []
    assert os.listdir((device.root / SERVICE).parent) == [os.path.basename(SERVICE)]


def test_files_are_private_under_any_umask(stopped_device):
    stopped_device.output("sh", "-c", "umask 0777; exec device start")
    assert stopped_device.shell("setprop a 1; reboot; getprop a") == "\n"
    assert (stopped_device.root / "properties").stat().st_mode & 0o777 == 0o700


def test_device_keeps_running_when_its_root_is_renamed(device, build, tmp_path):
    moved = Device(tmp_path, build, device.tool)
    device.root.rename(moved.root)
    moved.kill("corvane_daemon")
    wait_until(lambda: moved.restarts() == 1 and moved.is_up())
    assert moved.tpd("captest") == PASS
    moved.output("device", "stop")
    assert not device.root.exists()


@pytest.mark.parametrize("repeats", [3, pytest.param(100, marks=pytest.mark.soak)])
@pytest.mark.parametrize("verb", ["start", "stop"])
def test_starts_beside_a_killed_command(device, chance, repeats, verb):
    for _ in range(repeats):
        with subprocess.Popen(["device", verb], env=device.env, stderr=subprocess.DEVNULL) as other:
            time.sleep(chance.uniform(0, 0.01))
            other.kill()
        device.start()
        assert device.run("device", "status").returncode == 0


@pytest.mark.parametrize("removed", [".tpd-device", "properties"])
def test_init_exits_when_its_device_is_removed(device, removed):
    (device.root / removed).rename(device.root / "away")
    wait_until(lambda: not device.processes())
    if removed == ".tpd-device":
        (device.root / "away").rename(device.root / removed)


def test_services_are_controlled_by_name(device):
    device.shell("stop corvane_daemon")
    wait_until(lambda: device.getprop("init.svc.corvane_daemon") == "stopped")
    assert device.processes("corvane_daemon") == []
    device.shell("start corvane_daemon")
    wait_until(device.is_up)
    (daemon,) = device.processes("corvane_daemon")
    device.shell("start corvane_daemon")
    assert device.processes("corvane_daemon") == [daemon]
    device.setprop("ctl.restart", "corvane_daemon")
    wait_until(lambda: device.is_up() and device.processes("corvane_daemon") != [daemon])
    assert device.restarts() == 0


def test_reports_a_stopped_device(stopped_device):
    stopped_device.output("device", "root")
    assert "device is stopped" in stopped_device.run("device", "shell", "true").stderr
    assert stopped_device.run("device", "status").returncode == 3
    stopped_device.start()
    assert stopped_device.run("device", "status").returncode == 0


def test_start_applies_the_permissive_mode_to_a_running_device(device):
    device.output("device", "start", "--permissive")
    assert device.output("getenforce") == "Permissive\n"


def test_restarts_a_device_of_another_build(stopped_device, build, tmp_path):
    shutil.copytree(build / "device", tmp_path / "device", symlinks=True)
    stopped_device.output(tmp_path / "device/device", "start")
    (old,) = stopped_device.processes("/init")
    stopped_device.start()
    (new,) = stopped_device.processes("/init")
    assert new != old
    assert stopped_device.is_up()
