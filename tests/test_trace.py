"""scripts/device trace: what it shows of a command"""
import json
import subprocess

from virtual_device import PASS, TIMEOUT


def test_shows_who_did_what(device):
    lines = device.output("device", "trace", "captest").splitlines()
    assert lines[-1] + "\n" == PASS
    tool = [line for line in lines if " tool " in line]
    assert any("lookup" in line for line in tool)
    assert any("daemon" in line and "captest" in line for line in lines)


def test_shows_the_bytes_of_the_request(device):
    shown = device.output("device", "trace", "--bytes", "captest")
    assert "63 61 70 74 65 73 74 00" in shown  # "captest" and its terminator


def test_prints_the_events_as_they_were_recorded(device):
    shown = device.output("device", "trace", "--json", "captest")
    events = [json.loads(line) for line in shown.splitlines()]
    calls = [event for event in events if event["what"] == "call"]
    assert [call["code"] for call in calls] == [0]


def test_draws_a_sequence_diagram(device):
    diagram = device.output("device", "trace", "--mermaid", "captest")
    assert diagram.startswith("sequenceDiagram")


def test_follows_the_daemon_through_its_death(device):
    device.output("device", "fault", "die_during")
    shown = device.output("device", "trace", "captest")
    assert TIMEOUT in shown
    assert shown.count("daemon_start") >= 2


def test_tells_the_second_watcher(device):
    device.output("device", "fault", "hang", "3000")
    first = subprocess.Popen(
        ["device", "trace", "captest"],
        env=device.env,
        stdout=subprocess.DEVNULL,
    )
    second = device.run("device", "trace", "captest")
    first.wait()
    assert second.returncode != 0
    assert second.stderr
