"""The tool when its peer, its files or its surroundings are not as they should be"""
import os
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
    """A service without init and daemon, which answers each call with its `reply`."""
    stopped_device.watch()
    for key in (PERMISSIVE, "odm.thp.dae_alive", "odm.thp.binder"):
        stopped_device.setprop(key, "1")
    path = stopped_device.root / SERVICE
    path.parent.mkdir(parents=True)
    with socketserver.UnixStreamServer(str(path), Call) as server:
        threading.Thread(target=server.serve_forever, args=[0.01]).start()
        yield server
        server.shutdown()


def reply(body=b"", status=0, size=None):
    """A reply as it travels through a socket of the host's binder driver."""
    return struct.pack("<iI", status, len(body) if size is None else size) + body


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


def test_prints_the_largest_answer_as_it_is(stopped_device, service):
    text = "%s%n\xff".ljust(1040384 - 1, "r")
    service.reply = reply(text.encode("latin-1") + b"\0")
    assert stopped_device.tpd("x") == text + "\n"


def test_can_be_ended_while_the_daemon_hangs(device):
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
def test_sends_the_command_whatever_its_output(device, redirection):
    script = f'exec {redirection}; "$@"'
    device.output("bash", "-c", script, "bash", *device.tool, "captest")
    assert len(device.events("command")) == 1


def test_takes_a_pipe_for_no_log(device):
    (device.root / "log").unlink()
    os.mkfifo(device.root / "log")
    reader = os.open(device.root / "log", os.O_RDONLY | os.O_NONBLOCK)
    assert device.tpd("captest") == PASS
    assert os.read(reader, 1) == b""
    os.close(reader)
