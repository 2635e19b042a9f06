"""The life of the virtual device: who runs it, how it starts and how it ends"""
import concurrent.futures
import os
import random
import signal
import subprocess

import pytest

from virtual_device import LIMIT_S, PASS, wait_until

STOPPED = 3


def in_parallel(*commands):
    """Runs functions all at once and returns their results in order."""
    with concurrent.futures.ThreadPoolExecutor(len(commands)) as pool:
        return [each.result() for each in [pool.submit(command) for command in commands]]


def test_is_up_when_start_returns(stopped_device):
    stopped_device.start()
    assert stopped_device.is_up()
    assert str(stopped_device.init()) in stopped_device.output("device", "status")


def test_starts_only_once(device):
    before = device.init()
    device.start()
    assert device.init() == before


def test_says_that_it_is_stopped(device):
    device.stop()
    done = device.run("device", "status")
    assert (done.returncode, done.stdout) == (STOPPED, "stopped\n")


def test_answers_all_who_ask_at_once(stopped_device):
    stopped_device.stop()
    asked = in_parallel(*[lambda: stopped_device.run("device", "status")] * 16)
    assert {done.returncode for done in asked} == {STOPPED}


def test_stops_no_stranger(stopped_device):
    stopped_device.start()
    stopped_device.stop()
    with subprocess.Popen(["sleep", str(LIMIT_S)]) as stranger:
        for file in stopped_device.root.iterdir():
            if file.is_file():
                file.write_text(f"{stranger.pid}\n")
        status = lambda: stopped_device.run("device", "status")
        in_parallel(*[status, stopped_device.stop] * 8)
        assert stranger.poll() is None
        stranger.kill()


def test_starts_and_stops_in_any_order(stopped_device):
    verbs = random.choices(["start", "stop", "status"], k=60)
    in_parallel(*[lambda verb=verb: stopped_device.run("device", verb) for verb in verbs])
    running = stopped_device.init() != 0
    inits = [
        process
        for process in stopped_device.processes()
        if os.readlink(f"/proc/{process}/exe").endswith("/init")
    ]
    assert len(inits) == running
    stopped_device.start()
    assert stopped_device.is_up()


def test_runs_commands_of_all_who_start_it_at_once(stopped_device):
    run = lambda: stopped_device.output("device", "run", "captest")
    assert in_parallel(run, run, run, run) == [PASS] * 4


def test_restarts_a_daemon_that_dies(device):
    os.kill(device.daemon(), signal.SIGKILL)
    wait_until(lambda: device.restarts() == 1 and device.is_up())
    assert device.events("daemon_exit")[-1]["signal"] == signal.SIGKILL


def test_restarts_a_daemon_though_its_parent_ignores_children(stopped_device):
    stopped_device.watch()
    stopped_device.output("sh", "-c", "trap '' CHLD; exec device start")
    os.kill(stopped_device.daemon(), signal.SIGKILL)
    wait_until(lambda: stopped_device.restarts() == 1 and stopped_device.is_up())


def test_keeps_nothing_of_its_caller(stopped_device, tmp_path):
    reader, writer = os.pipe()
    stopped_device.output("device", "start", pass_fds=[writer], cwd=tmp_path)
    os.close(writer)
    assert os.read(reader, 1) == b""
    os.close(reader)
    assert os.readlink(f"/proc/{stopped_device.init()}/cwd") == "/"
    assert os.getsid(stopped_device.init()) == stopped_device.init()


def test_takes_the_daemon_along_when_init_dies(device):
    os.kill(device.init(), signal.SIGKILL)
    wait_until(lambda: not device.processes())


def test_starts_after_a_crash(device):
    os.kill(device.init(), signal.SIGKILL)
    wait_until(lambda: not device.processes())
    (device.root / "tmp/left").write_text("")
    device.start()
    assert os.listdir(device.root / "tmp") == []


def test_says_once_that_the_daemon_cannot_live(device):
    driver = device.root / "dev/vndbinder"
    os.kill(device.init(), signal.SIGSTOP)
    driver.rename(device.root / "dev/away")
    driver.write_text("no folder")
    os.kill(device.daemon(), signal.SIGKILL)
    os.kill(device.init(), signal.SIGCONT)
    wait_until(lambda: len(device.events("restart_pause")) > 4)
    pauses = [event["ms"] for event in device.events("restart_pause")]
    assert pauses == sorted(set(pauses))
    assert len(device.events("log", who="init")) == 1


def test_clears_no_folder_of_somebody_else(stopped_device):
    (stopped_device.root / "tmp").mkdir(mode=0o700, parents=True)
    stopped_device.root.chmod(0o700)
    files = [stopped_device.root / "letter", stopped_device.root / "tmp/letter"]
    for file in files:
        file.write_text("Dear")
    assert stopped_device.run("device", "start").returncode == 1
    assert [file.read_text() for file in files] == ["Dear", "Dear"]
    files[1].unlink()


def symlink(path):
    path.with_name("real").mkdir(mode=0o700)
    path.symlink_to("real")


def others(path):
    path.mkdir(mode=0o700)
    try:
        os.chown(path, 1, -1)
    except PermissionError:
        pytest.skip("only root can give a folder away")


UNSAFE_ROOTS = {
    "open to others": lambda path: path.mkdir(mode=0o755),
    "symbolic link": symlink,
    "file": lambda path: path.write_text(""),
    "another user's": others,
}


@pytest.mark.parametrize("make", UNSAFE_ROOTS.values(), ids=UNSAFE_ROOTS)
def test_refuses_a_root_that_is_not_safe(stopped_device, tmp_path, make):
    root = tmp_path / "root"
    make(root)
    environment = stopped_device.env | {"TPD_DEVICE_ROOT": str(root)}
    done = stopped_device.run("device", "start", env=environment)
    assert (done.returncode, done.stdout) == (1, "")
    assert str(root) in done.stderr


def test_refuses_a_relative_root(stopped_device, tmp_path):
    environment = stopped_device.env | {"TPD_DEVICE_ROOT": "root"}
    done = stopped_device.run("device", "start", env=environment, cwd=tmp_path)
    assert done.returncode == 1
    assert "absolute" in done.stderr
    assert os.listdir(tmp_path) == []
