"""The tool when its peer, its files or its surroundings are not as they should be"""
import os
import signal
import subprocess
import threading

import pytest

from virtual_device import LIMIT_S, NO_SERVICE, PASS, PERMISSIVE, REFUSED, RESTART, TIMEOUT
from virtual_device import Service, reply, wait_until

LARGEST = 1040384 - 1  # bytes of an answer before its terminator

FAILED_CALLS = {
    "request not read": Service.UNREAD,
    "no reply": b"",
    "header cut short": b"\0\0\0",
    "body shorter than announced": reply(b"ab\0", size=8),
    "size beyond the receive buffer": reply(b"x\0", size=2**32 - 1),
    "status": reply(status=-22),
}


@pytest.mark.parametrize("raw", FAILED_CALLS.values(), ids=FAILED_CALLS)
def test_restarts_the_daemon_after_two_failed_calls(stopped_device, service, raw):
    service.answer(raw)
    assert stopped_device.tpd("x") == TIMEOUT
    assert stopped_device.written() == RESTART


ANSWERS = {
    "empty parcel": (b"", ""),
    "no terminator": (b"abcd", ""),
    "format, failure marker, no UTF-8": (b"%s%n ERROR \xff\n\0", "%s%n ERROR \xff\n"),
    "largest": (b"r" * LARGEST + b"\0", "r" * LARGEST),
}


@pytest.mark.parametrize("body, text", ANSWERS.values(), ids=ANSWERS)
def test_prints_an_answer_as_it_is(stopped_device, service, body, text):
    service.answer(reply(body))
    assert stopped_device.tpd("x") == text + "\n"
    assert stopped_device.written() == []


def test_reports_a_service_that_ends_in_the_call(stopped_device, service):
    service.answer(Service.GONE)
    assert stopped_device.tpd("x") == NO_SERVICE
    assert stopped_device.written() == RESTART


def test_finds_a_service_that_comes_during_the_lookup(stopped_device, service):
    threading.Timer(0.5, service.answer, [reply()]).start()
    environment = stopped_device.env | {"TPD_GET_SERVICE_MS": "20000"}
    assert stopped_device.tpd("x", env=environment) == "done\n"
    assert len(stopped_device.events("lookup")) == 1


@pytest.mark.parametrize("end", [signal.SIGINT, signal.SIGKILL])
def test_leaves_a_daemon_that_hangs(stopped_device, service, end):
    service.answer(Service.HANG, reply())
    tool = subprocess.Popen([*stopped_device.tool, "x"], env=stopped_device.env)
    wait_until(lambda: stopped_device.events("lookup"))
    tool.send_signal(end)
    assert tool.wait(LIMIT_S) == -end
    assert stopped_device.tpd("x") == "done\n"


OUTPUTS = {"closed": ">&-", "full": ">/dev/full", "no descriptors": "<&- >&- 2>&-"}


@pytest.mark.parametrize("redirection", OUTPUTS.values(), ids=OUTPUTS)
def test_sends_the_command_whatever_its_output(device, redirection):
    device.output("sh", "-c", f'exec "$@" {redirection}', "sh", *device.tool, "captest")
    assert len(device.events("command")) == 1


def test_ends_with_status_0_when_nobody_reads(device):
    reader, writer = os.pipe()
    os.close(reader)
    device.tpd("captest", stdout=writer)
    os.close(writer)


ARGUMENTS = {
    "no UTF-8": "\udcff\udcc0",
    "shell syntax": "$(touch x);`touch x`|touch x&",
    "longest": "x" * 131071,
}


@pytest.mark.parametrize("argument", ARGUMENTS.values(), ids=ARGUMENTS)
def test_forwards_any_argument(device, tmp_path, argument):
    text = os.fsencode(argument).decode("latin-1")
    assert device.tpd(argument, cwd=tmp_path) == f"unknown command: {text}\n"
    assert os.listdir(tmp_path) == []


def test_waits_for_a_slow_getenforce(device):
    program = device.programs / "getenforce"
    program.write_text("#!/bin/sh\nsleep 0.5; echo Permissive\n")
    program.chmod(0o755)
    device.setprop(PERMISSIVE, "null")
    assert device.tpd("captest") == PASS


def test_does_without_shell_commands(device):
    device.setprop(PERMISSIVE, "null")
    environment = device.env | {"PATH": "/var/empty"}
    assert device.tpd("captest", env=environment) == REFUSED
    assert device.tpd("showtouch", env=environment) == "\n"


def test_takes_a_pipe_for_no_log(device):
    (device.root / "log").unlink()
    os.mkfifo(device.root / "log")
    reader = os.open(device.root / "log", os.O_RDONLY | os.O_NONBLOCK)
    assert device.tpd("captest") == PASS
    assert os.read(reader, 1) == b""
    os.close(reader)


def test_keeps_a_property_when_the_disk_is_full(device):
    if device.run("unshare", "-rm", "true").returncode != 0:
        pytest.skip("this machine allows no user namespaces")
    script = (
        "export TPD_DEVICE_ROOT=/mnt/root; mount -t tmpfs -o size=64k none /mnt;"
        'mkdir -m 700 /mnt/root; "$@" debugRawEnable; ! head -c 99999 /dev/zero >/mnt/full;'
        '"$@" debugDifEnable; getprop thp.debug.raw; ls /mnt/root/tmp'
    )
    stdout = device.output("unshare", "-rm", "sh", "-ec", script, "sh", *device.tool)
    assert stdout == "\n\ntrue\n"
