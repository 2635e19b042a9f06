"""The tool when its peer, its files, its surroundings or its arguments are not as they should be"""
import os
import signal
import subprocess
import threading

import pytest

from virtual_device import (
    LIMIT_S,
    NO_SERVICE,
    PASS,
    PERMISSIVE,
    REFUSED,
    RESTART,
    TIMEOUT,
    Service,
    reply,
    wait_until,
)

LARGEST = 1040384 - 1  # the receive buffer less the terminator

FAILED_CALLS = {
    "hangs up unread": Service.UNREAD,
    "nothing at all": b"",
    "header cut short": b"\0\0\0",
    "body shorter than announced": reply(b"ab\0", size=8),
    "size beyond the receive buffer": reply(b"x\0", size=2**32 - 1),
    "text beyond the receive buffer": reply(b"r" * LARGEST + b"rr\0"),
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
    "empty": (b"\0", ""),
    "failure marker and format": (b"%s%n ERROR \xff\n\0", "%s%n ERROR \xff\n"),
    "largest": (b"r" * LARGEST + b"\0", "r" * LARGEST),
}


@pytest.mark.parametrize("body, text", ANSWERS.values(), ids=ANSWERS)
def test_prints_an_answer_as_it_is(stopped_device, service, body, text):
    service.answer(reply(body))
    assert stopped_device.tpd("x") == text + "\n"
    assert stopped_device.written() == []


def test_calls_again_after_a_failed_call(stopped_device, service):
    service.answer(Service.UNREAD, reply())
    assert stopped_device.tpd("x") == "done\n"
    assert stopped_device.written() == []


def test_reports_a_service_that_goes_for_good(stopped_device, service):
    service.answer(Service.GONE)
    assert stopped_device.tpd("x") == NO_SERVICE
    assert stopped_device.written() == RESTART


def test_finds_a_service_that_comes_during_the_lookup(stopped_device, service):
    late = threading.Timer(0.5, service.answer, [reply()])
    late.start()
    environment = stopped_device.env | {"TPD_GET_SERVICE_MS": "20000"}
    assert stopped_device.tpd("x", env=environment) == "done\n"
    assert stopped_device.events("lookup")[0]["us"] >= 100000


@pytest.mark.parametrize("end", [signal.SIGINT, signal.SIGTERM, signal.SIGKILL])
def test_ends_by_a_signal_while_the_daemon_hangs(stopped_device, service, end):
    service.answer(Service.HANG, reply())
    tool = subprocess.Popen([*stopped_device.tool, "x"], env=stopped_device.env)
    wait_until(lambda: stopped_device.events("lookup"))
    tool.send_signal(end)
    assert tool.wait(LIMIT_S) == -end
    assert stopped_device.tpd("x") == "done\n"


OUTPUTS = {
    "closed": ["sh", "-c", 'exec "$@" >&-', "sh"],
    "full": ["sh", "-c", 'exec "$@" >/dev/full', "sh"],
    "all descriptors closed": ["sh", "-c", 'exec "$@" <&- >&- 2>&-', "sh"],
}


@pytest.mark.parametrize("launcher", OUTPUTS.values(), ids=OUTPUTS)
def test_sends_the_command_whatever_its_output(device, launcher):
    device.output(*launcher, *device.tool, "captest")
    assert device.events("command")[0]["command"] == "captest"


def test_ends_as_usual_when_nobody_reads_its_output(device):
    reader, writer = os.pipe()
    os.close(reader)
    device.tpd("captest", stdout=writer)
    os.close(writer)
    assert device.events("command")[0]["command"] == "captest"


ARGUMENTS = {
    "empty": "",
    "marker": "[TPD]",
    "format": "%s%n",
    "no UTF-8": b"\xff\xc0",
    "shell syntax": "$(touch x);`touch x`|touch x&",
    "longest": "x" * 131071,
}


@pytest.mark.parametrize("argument", ARGUMENTS.values(), ids=ARGUMENTS)
def test_forwards_any_argument(device, tmp_path, argument):
    text = argument.decode("latin-1") if isinstance(argument, bytes) else argument
    assert device.tpd(argument, cwd=tmp_path) == f"unknown command: {text}\n"
    assert os.listdir(tmp_path) == []


GETENFORCE = {
    "nothing": ("", REFUSED),
    "killed": ("kill -9 $$", REFUSED),
    "slow": ("sleep 0.5; echo Permissive", PASS),
    "longer than the buffer": ("printf 'Permissive%200s' | tr ' ' x", REFUSED),
}


@pytest.mark.parametrize("script, text", GETENFORCE.values(), ids=GETENFORCE)
def test_passes_commands_only_when_getenforce_prints_so(device, script, text):
    program = device.programs / "getenforce"
    program.write_text(f"#!/bin/sh\n{script}\n")
    program.chmod(0o755)
    device.setprop(PERMISSIVE, "null")
    assert device.tpd("captest") == text


def test_does_without_shell_commands(device):
    device.setprop(PERMISSIVE, "null")
    environment = device.env | {"PATH": "/var/empty"}
    assert device.tpd("captest", env=environment) == REFUSED
    assert device.tpd("showtouch", env=environment) == "\n"


def test_takes_a_folder_in_place_of_the_kernel_command_line(device):
    device.setprop(PERMISSIVE, "null")
    (device.root / "proc/cmdline").mkdir(parents=True)
    assert device.tpd("captest") == REFUSED


def test_gives_up_on_a_property_that_is_a_folder(device):
    (device.root / "properties/thp.debug.raw").mkdir()
    assert device.tpd("debugRawEnable") == "\n"
    assert device.written() == [("thp.debug.raw", "true")] * 6


def test_takes_a_pipe_for_no_log(device):
    log = device.root / "log"
    log.unlink()
    os.mkfifo(log)
    with open(os.open(log, os.O_RDONLY | os.O_NONBLOCK), "rb"):
        pass
    assert device.tpd("captest") == PASS


def test_keeps_files_to_the_user(stopped_device):
    stopped_device.tpd("debugRawEnable", umask=0)
    files = [stopped_device.root, *stopped_device.root.rglob("*")]
    assert [file for file in files if file.stat().st_mode & 0o077] == []


@pytest.fixture
def own_mounts(device):
    """Runs a script with mounts of its own over the device root."""

    def run(script):
        return device.output("unshare", "--map-root-user", "--mount", "sh", "-ec", script)

    if device.run("unshare", "--map-root-user", "--mount", "true").returncode != 0:
        pytest.skip("this machine allows no user namespaces")
    return run


def test_works_on_a_read_only_device_root(device, own_mounts):
    assert own_mounts(
        f"mount --bind $TPD_DEVICE_ROOT $TPD_DEVICE_ROOT;"
        f"mount -o remount,bind,ro $TPD_DEVICE_ROOT;"
        f"cd $TPD_DEVICE_ROOT; {device.tool[-1]} debugRawEnable; {device.tool[-1]} captest"
    ) == "\n" + PASS


def test_loses_no_property_when_the_disk_is_full(device, own_mounts):
    assert own_mounts(
        f"export TPD_DEVICE_ROOT=/mnt/root; mount -t tmpfs -o size=64k none /mnt;"
        f"mkdir -m 700 /mnt/root; {device.tool[-1]} debugRawEnable;"
        f"head -c 99999 /dev/zero >/mnt/full || true; {device.tool[-1]} debugDifEnable;"
        f"getprop thp.debug.raw; ls /mnt/root/tmp"
    ) == "\n\ntrue\n"
