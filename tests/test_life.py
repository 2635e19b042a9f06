"""The life of the virtual device: who runs it, how it starts and how it ends"""
import concurrent.futures
import os
import random
import subprocess

import pytest

from virtual_device import LIMIT_S, PASS, wait_until


def in_parallel(device, *commands):
    """Runs `device COMMAND...` for all of the commands at once."""
    with concurrent.futures.ThreadPoolExecutor(len(commands)) as pool:
        return list(pool.map(lambda command: device.run("device", *command), commands))


def test_is_up_when_start_returns(stopped_device):
    stopped_device.output("device", "start")
    assert stopped_device.is_up()
    assert "running" in stopped_device.output("device", "status")


def test_is_stopped_for_all_who_ask_at_once(stopped_device):
    asked = in_parallel(stopped_device, *[["status"]] * 16)
    assert {(done.returncode, done.stdout) for done in asked} == {(3, "stopped\n")}


def test_stops_no_stranger(device):
    device.output("device", "stop")
    with subprocess.Popen(["sleep", str(LIMIT_S)]) as stranger:
        (device.root / "init.lock").write_text(f"{stranger.pid}\n")
        in_parallel(device, *[["status"], ["stop"]] * 8)
        assert stranger.poll() is None
        stranger.kill()


@pytest.mark.parametrize("count", [60, pytest.param(2000, marks=pytest.mark.soak)])
def test_is_one_device_or_none_whatever_is_asked(stopped_device, count):
    for _ in range(count // 20):
        verbs = random.choices(["start", "stop", "status"], k=20)
        in_parallel(stopped_device, *[[verb] for verb in verbs])
        assert len(stopped_device.processes("/init")) <= 1
    stopped_device.output("device", "start")
    assert stopped_device.is_up()


def test_runs_the_commands_of_all_who_start_it_at_once(stopped_device):
    ran = in_parallel(stopped_device, *[["run", "captest"]] * 4)
    assert [done.stdout for done in ran] == [PASS] * 4


def test_restarts_a_daemon_whose_caller_ignored_signals(stopped_device):
    stopped_device.output("env", "--ignore-signal=CHLD", "device", "start")
    stopped_device.kill("corvane_daemon")
    wait_until(lambda: stopped_device.restarts() == 1 and stopped_device.is_up())


def test_keeps_nothing_of_its_caller(stopped_device, tmp_path):
    reader, writer = os.pipe2(os.O_NONBLOCK)
    stopped_device.output("device", "start", pass_fds=[writer], cwd=tmp_path)
    os.close(writer)
    assert os.read(reader, 1) == b""
    os.close(reader)
    (init,) = stopped_device.processes("/init")
    assert os.readlink(f"/proc/{init}/cwd") == "/"
    assert os.getsid(init) == init


def test_starts_again_after_a_crash(device):
    device.kill("/init")
    wait_until(lambda: not device.processes())
    (device.root / "tmp/left").write_text("")
    device.output("device", "start")
    assert os.listdir(device.root / "tmp") == []


def test_says_once_that_the_daemon_cannot_live(device):
    (device.root / "dev").rename(device.root / "away")
    (device.root / "dev").write_text("no folder for a service")
    device.kill("corvane_daemon")
    wait_until(lambda: len(device.events("restart_pause")) > 4)
    pauses = [event["ms"] for event in device.events("restart_pause")]
    assert pauses == sorted(set(pauses))
    assert len(device.events("log", who="init")) == 1


def test_boots_in_no_folder_of_somebody_else(stopped_device):
    (stopped_device.root / "tmp").mkdir(parents=True)
    stopped_device.root.chmod(0o700)
    letter = stopped_device.root / "tmp/letter"
    letter.write_text("Dear")
    assert stopped_device.run("device", "start").returncode == 1
    assert letter.read_text() == "Dear"
    letter.unlink()


def test_refuses_a_relative_root(stopped_device, tmp_path):
    relative = stopped_device.env | {"TPD_DEVICE_ROOT": "root"}
    done = stopped_device.run("device", "start", env=relative, cwd=tmp_path)
    assert (done.returncode, os.listdir(tmp_path)) == (1, [])
    assert "absolute" in done.stderr


def test_boots_through_no_link(stopped_device, tmp_path):
    letter = tmp_path / "letter"
    letter.write_text("Dear")
    stopped_device.root.mkdir(mode=0o700)
    (stopped_device.root / "init.lock").write_text("")
    (stopped_device.root / "properties").symlink_to(tmp_path)
    assert stopped_device.run("device", "start").returncode == 1
    assert os.listdir(tmp_path) == ["letter"]
