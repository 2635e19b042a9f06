"""The life cycle of the virtual device: start, supervision, reboot and stop"""
import concurrent.futures
import os
import shutil
import subprocess
import time

import pytest

from virtual_device import PASS, PERMISSIVE, Device, wait_until


@pytest.fixture
def device(stopped_device):
    """A stopped device; these tests start it themselves."""
    return stopped_device


def in_parallel(device, commands):
    """Runs `device COMMAND` for all commands concurrently."""
    runs = [["device", *command.split()] for command in commands]
    with concurrent.futures.ThreadPoolExecutor(len(runs)) as pool:
        return list(pool.map(lambda run: device.run(*run), runs))


@pytest.mark.parametrize("repeats", [3, pytest.param(100, marks=pytest.mark.soak)])
def test_concurrent_commands_leave_at_most_one_init(device, chance, repeats):
    for _ in range(repeats):
        in_parallel(device, chance.choices(["start", "stop", "status"], k=20))
        assert len(device.processes("/init")) <= 1
    device.start()
    assert device.is_up()


def test_restarts_the_daemon_when_the_caller_ignored_sigchld(device):
    device.output("env", "--ignore-signal=CHLD", "device", "start")
    device.kill("corvane_daemon")
    wait_until(lambda: device.restarts() == 1 and device.is_up())


def test_waits_longer_before_each_restart_of_a_daemon_that_cannot_start(device):
    device.start_tracing()
    device.start()
    (device.root / "dev").rename(device.root / "away")
    (device.root / "dev").write_text("not a directory")
    device.kill("corvane_daemon")
    wait_until(lambda: len(device.events("restart_pause")) > 4)
    pauses = [event["ms"] for event in device.events("restart_pause")]
    assert pauses == sorted(set(pauses))
    assert len(device.events("log", who="init")) == 1


def test_init_is_detached_from_its_caller(device, tmp_path):
    with open(tmp_path / "file", "w") as file:
        device.start(cwd=tmp_path, pass_fds=[file.fileno()])
    (init,) = device.processes("/init")
    kept = device.output("ls", "-l", f"/proc/{init}", f"/proc/{init}/fd")
    assert str(tmp_path) not in kept
    assert os.getsid(init) == init


def test_boots_after_an_unclean_stop(device):
    device.start()
    device.kill("/init")
    wait_until(lambda: not device.processes())
    (device.root / "tmp/left").write_text("")
    device.start()
    assert os.listdir(device.root / "tmp") == []


def test_files_are_private_under_any_umask(device):
    device.output("sh", "-c", "umask 0777; exec device start")
    device.output("device", "reboot")
    assert (device.root / "properties").stat().st_mode & 0o777 == 0o700


def test_reboot_keeps_persistent_properties_only(device):
    device.start()
    device.setprop("persist.a", "1")
    device.setprop("b", "1")
    device.output("setenforce", "0")
    device.shell("reboot")
    assert (device.getprop("persist.a"), device.getprop("b")) == ("1", "")
    assert device.output("getenforce") == "Enforcing\n"


def test_device_keeps_running_when_its_root_is_renamed(device, build, tmp_path):
    device.start()
    moved = Device(tmp_path, build, device.tool)
    device.root.rename(moved.root)
    letter = device.root / "dev/vndbinder/letter"
    letter.parent.mkdir(parents=True)
    letter.write_text("Dear")
    moved.kill("corvane_daemon")
    wait_until(lambda: moved.restarts() == 1 and moved.is_up())
    moved.setprop(PERMISSIVE, "true")
    assert moved.tpd("captest") == PASS
    moved.output("device", "stop")
    assert letter.read_text() == "Dear"
    shutil.rmtree(device.root)


@pytest.mark.parametrize("repeats", [3, pytest.param(100, marks=pytest.mark.soak)])
@pytest.mark.parametrize("verb", ["start", "stop"])
def test_starts_beside_a_killed_command(device, chance, repeats, verb):
    for _ in range(repeats):
        with subprocess.Popen(["device", verb], env=device.env, stderr=subprocess.DEVNULL) as other:
            time.sleep(chance.uniform(0, 0.01))
            other.kill()
        device.start()
        assert device.run("device", "status").returncode == 0


def test_init_exits_when_its_device_is_removed(device):
    device.start()
    (device.root / ".tpd-device").rename(device.root / "away")
    wait_until(lambda: not device.processes())
    (device.root / "away").rename(device.root / ".tpd-device")


def test_start_applies_the_permissive_mode_to_a_running_device(device):
    device.start()
    device.output("device", "start", "--permissive")
    assert device.output("getenforce") == "Permissive\n"


def test_services_are_controlled_by_name(device):
    device.start()
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


def test_reports_a_stopped_device(device):
    device.output("device", "root")
    assert "device is stopped" in device.run("device", "shell", "true").stderr
    assert device.run("device", "status").returncode == 3
    device.start()
    assert device.run("device", "status").returncode == 0


def test_restarts_a_device_of_another_build(device, build, tmp_path):
    shutil.copytree(build / "device", tmp_path / "device", symlinks=True)
    device.output(tmp_path / "device/device", "start")
    (old,) = device.processes("/init")
    device.start()
    (new,) = device.processes("/init")
    assert new != old
    assert device.is_up()
