"""The output of `device trace`"""
import json
import re
import signal
import subprocess

import pytest

from virtual_device import LIMIT_S, PASS, SOURCE, wait_until


@pytest.fixture
def trace(stopped_device):
    """Returns a function that runs `device trace` and returns its output."""
    stopped_device.output("device", "start", "--permissive")
    return lambda *arguments: stopped_device.output("device", "trace", *arguments)


def assert_in_order(shown, *parts):
    assert re.search(".*".join(map(re.escape, parts)), shown, re.S), shown


def test_shows_the_steps_of_a_command_and_of_a_restart(trace, stopped_device):
    stopped_device.shell("setprop sim.boot_delay_ms 300; setprop sim.fault die_after")
    shown = trace("captest", '"a\\b\33[2J')
    assert_in_order(
        shown,
        "tool runs getenforce",
        'tool writes odm.thp.debug.selinux.permissive: "null" -> "true"',
        "tool looks up service.corvaneinterfaceservice: found",
        "tool calls code 0, two-way",
        r'daemon receives captest, parameters ""a\b\x1b[2J"',
        "daemon answers",
        "tool receives the reply",
        r'result: captest "a\b\x1b[2J: PASS',
    )
    restart = "init reaps", "signal 9", "init waits 50 ms", "init starts", "daemon publishes"
    assert_in_order(shown, "daemon answers", *restart)


def test_shows_the_bytes_of_the_wire_format_page(trace):
    page = (SOURCE / "docs/wire-format.md").read_text()
    dump = re.findall("^[0-9a-f]{8}: .*", page, re.M)
    assert_in_order(trace("--bytes", "THP_SetFoldState", "1"), *dump)


def test_prints_the_events_as_they_were_recorded(trace):
    events = [json.loads(line) for line in trace("--json", "captest").splitlines()]
    calls = [event for event in events if event["what"] == "call"]
    assert [(call["who"], call["code"]) for call in calls] == [("tpd", 0)]


def test_draws_a_sequence_diagram(trace):
    shown = trace("--mermaid", "--", "captest", "#;")
    assert_in_order(shown, "sequenceDiagram\n", "tool->>", '"#35;#59;"', "daemon-->>")


def test_recorder_exits_when_its_terminal_closes(trace, stopped_device):
    stopped_device.fault("hang 60000")
    command = ["device", "trace", "captest"]
    recorder = subprocess.Popen(command, env=stopped_device.env, stdout=subprocess.DEVNULL)
    wait_until(lambda: (stopped_device.root / "trace").exists() and stopped_device.events("fault"))
    assert "another trace" in stopped_device.run(*command).stderr
    recorder.send_signal(signal.SIGHUP)
    recorder.wait(LIMIT_S)
    assert not (stopped_device.root / "trace").exists()


def test_prints_the_events_and_that_some_were_lost_when_interrupted(trace, stopped_device):
    stopped_device.setprop("sim.boot_delay_ms", "60000")
    command = ["device", "trace", "reboot"]
    pipes = {"stdout": subprocess.PIPE, "stderr": subprocess.PIPE, "text": True}
    with subprocess.Popen(command, env=stopped_device.env, **pipes) as recorder:
        wait_until((stopped_device.root / "trace").exists)
        wait_until(lambda: stopped_device.events("service_start"))
        wait_until(lambda: not stopped_device.processes("/tpd"))
        (stopped_device.root / "trace").chmod(0o400)
        recorder.send_signal(signal.SIGINT)
        assert_in_order(recorder.stdout.read(), "init starts corvane_daemon", "result:")
        assert "events were lost" in recorder.stderr.read()


def test_scripts_ignore_the_callers_python(trace, stopped_device, tmp_path):
    (tmp_path / "json.py").write_text("not Python")
    stopped_device.env |= {"PYTHONHOME": "/nonexistent", "PYTHONPATH": str(tmp_path)}
    assert_in_order(trace("captest"), PASS)
    assert "captest" in stopped_device.output("logcat", "-d", cwd=tmp_path)


def test_removes_the_file_of_a_killed_recorder(trace, stopped_device):
    (stopped_device.root / "trace").write_text("{}\n")
    assert_in_order(trace("captest"), "tool calls", PASS)
