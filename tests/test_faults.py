"""Faults of the daemon, of the tool's output and of clients"""
import re
import signal
import subprocess

import pytest

from virtual_device import LIMIT_S, PASS, TIMEOUT, wait_until


# fault, result text, whether the daemon dies
RESULTS = [
    ("die_before 1", PASS, True),
    ("die_before", TIMEOUT, True),
    ("die_during 1", PASS, True),
    ("die_after", PASS, True),
    ("hang 1", PASS, False),
    ("status -22", TIMEOUT, False),
    ("status 7", "\n", False),
    ("no_text", "\n", False),
    ("huge 3", "###\n", False),
]


@pytest.mark.parametrize("fault, text, dies", RESULTS, ids=[row[0] for row in RESULTS])
def test_fault_has_its_documented_result(device, fault, text, dies):
    device.fault(fault)
    assert device.tpd("captest") == text
    assert device.events("fault")[0]["name"] == fault
    logged = [event["text"] for event in device.events("log", who="tpd")]
    assert logged.count("binder died") == len(device.events("binder_died"))
    wait_until(lambda: bool(device.events("service_exit")) == dies)


def test_every_fault_has_a_row(stopped_device):
    listed = re.findall(r"^\w+", stopped_device.output("device", "fault"), re.M)
    assert {"none", *(row[0].split()[0] for row in RESULTS)} == set(listed)


def test_oversized_reply_fails_the_call_but_keeps_the_connection(device):
    device.fault("huge 1040384 2")
    assert device.tpd("captest") == TIMEOUT
    assert device.events("binder_died") == []
    assert device.tpd("captest") == PASS


def test_delays_are_in_milliseconds(device):
    device.shell("setprop sim.boot_delay_ms 300; setprop sim.fault 'hang 300'; tpd reboot")
    device.tpd("captest")
    for begin, end in ("service_start", "publish"), ("fault", "answer"):
        delay = device.events(end)[-1]["time"] - device.events(begin)[-1]["time"]
        assert 0.3 <= delay < 30


def test_tool_can_be_interrupted_while_the_daemon_hangs(device):
    device.fault("hang 60000 1")
    command = "env", "--default-signal=INT", *device.tool, "captest"
    tool = subprocess.Popen(command, env=device.env)
    wait_until(lambda: device.events("fault"))
    tool.send_signal(signal.SIGINT)
    assert tool.wait(LIMIT_S) == -signal.SIGINT
    assert device.tpd("captest") == PASS
    assert device.restarts() == 0


@pytest.mark.parametrize("redirection", [">/dev/full", "> >(:); wait $!", "<&- >&- 2>&-"])
def test_sends_the_command_even_if_output_fails(device, redirection):
    script = f'exec {redirection}; "$@"'
    device.output("bash", "-c", script, "bash", *device.tool, "captest")
    assert len(device.events("command")) == 1
    files = [path.read_bytes() for path in device.root.rglob("*") if path.is_file()]
    assert PASS.strip().encode() not in b"\n".join(files).splitlines()
