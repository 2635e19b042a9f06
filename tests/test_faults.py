"""The tool with a faulty peer, unusable files or a broken environment"""
import fcntl
import os
import pathlib
import signal
import socketserver
import struct
import subprocess
import threading

import pytest

from virtual_device import LIMIT_S, PASS, PERMISSIVE, RESTART, SERVICE, TIMEOUT, wait_until


class Call(socketserver.BaseRequestHandler):
    def handle(self):
        self.request.recv(4096)
        self.request.sendall(self.server.reply)


@pytest.fixture
def service(stopped_device):
    """A service without init or daemon. It answers every call with `reply`."""
    stopped_device.start_tracing()
    for key in (PERMISSIVE, "odm.thp.dae_alive", "odm.thp.binder"):
        stopped_device.setprop(key, "1")
    path = stopped_device.root / SERVICE
    path.parent.mkdir(parents=True)
    with socketserver.UnixStreamServer(str(path), Call) as server:
        threading.Thread(target=server.serve_forever, args=[0.01]).start()
        yield server
        server.shutdown()


def reply(body=b"", status=0, size=None):
    """The bytes of a reply on a socket of the host's binder driver."""
    return struct.pack("<iI", status, size or len(body)) + body


FAILED_CALLS = {
    "header cut short": b"\0\0\0",
    "body shorter than announced": reply(b"ab\0", size=8),
    "larger than the receive buffer": reply(b"r" * 1040384 + b"\0"),
    "status of a failure": reply(status=-22),
}


@pytest.mark.parametrize("raw", FAILED_CALLS.values(), ids=FAILED_CALLS)
def test_restarts_the_daemon_after_two_failed_calls(stopped_device, service, raw):
    service.reply = raw
    assert stopped_device.tpd("x") == TIMEOUT
    assert stopped_device.written()[-2:] == RESTART


def test_prints_the_largest_answer_unchanged(stopped_device, service):
    text = "%s%n\xff".ljust(1040384 - 1, "r")
    service.reply = reply(text.encode("latin-1") + b"\0")
    assert stopped_device.tpd("x") == text + "\n"


# fault, result text, whether the daemon dies
RESULTS = [
    ("die_before 1", PASS, True),
    ("die_before", TIMEOUT, True),
    ("die_during 1", PASS, True),
    ("die_during", TIMEOUT, True),
    ("die_after", PASS, True),
    ("captest_restart", PASS, True),
    ("hang 100", PASS, False),
    ("status -22", TIMEOUT, False),
    ("status 7", "\n", False),
    ("no_text", "\n", False),
    ("huge 3", "###\n", False),
    ("huge 1040384", TIMEOUT, False),
]


@pytest.mark.parametrize("fault, text, dies", RESULTS, ids=[row[0] for row in RESULTS])
def test_fault_has_its_documented_result(device, fault, text, dies):
    device.output("device", "fault", *fault.split())
    assert device.tpd("captest") == text
    assert device.events("fault")[0]["name"] == fault
    wait_until(lambda: bool(device.events("daemon_exit")) == dies)


def test_captest_restart_applies_to_captest_only(device):
    device.output("device", "fault", "captest_restart")
    device.tpd("THP_GetVersion")
    assert device.events("fault") == []


USAGE_ERRORS = {
    "hangg": "unknown fault 'hangg'; 'device fault' lists them",
    "hang": "fault hang: invalid MILLISECONDS ''; use 0 to 1000000000",
    "hang 1O0": "fault hang: invalid MILLISECONDS '1O0'; use 0 to 1000000000",
    "huge 67108865": "fault huge: invalid BYTES '67108865'; use 0 to 67108864",
    "no_text 0": "fault no_text: invalid COUNT '0'; use 1 to 2147483647",
    "none 1": "fault none: unexpected argument '1'",
}


@pytest.mark.parametrize("arguments", USAGE_ERRORS)
def test_names_the_invalid_argument(device, arguments):
    done = device.run("device", "fault", *arguments.split())
    assert (done.returncode, done.stdout) == (2, "")
    assert done.stderr == f"device: {USAGE_ERRORS[arguments]}\n"
    assert device.getprop("sim.fault") == ""


def test_new_fault_waits_for_a_count_down(device):
    device.output("device", "fault", "hang", "0", "9")
    properties = os.open(device.root / "properties", os.O_RDONLY)
    inode = f":{os.stat(properties).st_ino} "

    def waiting():
        locks = pathlib.Path("/proc/locks").read_text().splitlines()
        return sum("->" in lock and inode in lock for lock in locks)

    fcntl.flock(properties, fcntl.LOCK_EX)
    tool = subprocess.Popen([*device.tool, "captest"], env=device.env)
    wait_until(lambda: waiting() == 1)
    setter = subprocess.Popen(["device", "fault", "no_text"], env=device.env)
    wait_until(lambda: waiting() == 2)
    os.close(properties)
    assert (tool.wait(LIMIT_S), setter.wait(LIMIT_S)) == (0, 0)
    assert device.getprop("sim.fault") == "no_text"


def test_tool_can_be_interrupted_while_the_daemon_hangs(device):
    device.output("device", "fault", "hang", "60000", "1")
    tool = subprocess.Popen([*device.tool, "captest"], env=device.env)
    wait_until(lambda: device.events("fault"))
    tool.send_signal(signal.SIGINT)
    assert tool.wait(LIMIT_S) == -signal.SIGINT
    assert device.tpd("captest") == PASS


OUTPUTS = {
    "full": ">/dev/full",
    "no reader": "> >(:); wait $!",
    "no descriptors": "<&- >&- 2>&-",
}


@pytest.mark.parametrize("redirection", OUTPUTS.values(), ids=OUTPUTS)
def test_sends_the_command_when_output_fails(device, redirection):
    script = f'exec {redirection}; "$@"'
    device.output("bash", "-c", script, "bash", *device.tool, "captest")
    assert len(device.events("command")) == 1
    assert not (device.root / "log").read_bytes().endswith(PASS.encode())


def test_daemon_survives_a_killed_client(device):
    device.output("device", "fault", "hang", "200")
    with subprocess.Popen([*device.tool, "captest"], env=device.env) as tool:
        wait_until(lambda: device.events("fault"))
        tool.kill()
    wait_until(lambda: device.events("answer"))
    assert device.tpd("captest") == PASS
    assert device.restarts() == 0


def test_writes_no_log_to_a_pipe(device):
    (device.root / "log").unlink()
    os.mkfifo(device.root / "log")
    reader = os.open(device.root / "log", os.O_RDONLY | os.O_NONBLOCK)
    assert device.tpd("captest") == PASS
    assert os.read(reader, 1) == b""
    os.close(reader)
