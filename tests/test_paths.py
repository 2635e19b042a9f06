"""Each path that a command can take through the tool, against the simulated daemon"""
import pytest

from virtual_device import (
    NO_SERVICE,
    PASS,
    PERMISSIVE,
    REFUSED,
    RESTART,
    SERVICE,
    TIMEOUT,
    wait_until,
)

LOG = "persist.odm.thp.thplog_enabled"

FORWARDED = {
    "one argument": (["captest"], PASS),
    "two arguments": (["captest", "x"], "captest x: PASS\n"),
    "two for TSA": (["TSA_ExecuteCommand", "captest"], PASS),
    "three for TSA": (["TSA_ExecuteCommand", "captest", "x"], "captest x: PASS\n"),
    "local name with parameters": (["stop", "now"], "unknown command: stop\n"),
}


@pytest.mark.parametrize("arguments, answer", FORWARDED.values(), ids=FORWARDED)
def test_forwards(device, arguments, answer):
    assert device.tpd(*arguments) == answer
    assert device.written() == []


NOT_FORWARDED = {
    "empty command for TSA": ["TSA_ExecuteCommand", "", "x"],
    "three for another command": ["captest", "running_test", "x"],
    "four arguments": ["TSA_ExecuteCommand", "captest", "running_test", "x"],
}


@pytest.mark.parametrize("arguments", NOT_FORWARDED.values(), ids=NOT_FORWARDED)
def test_forwards_no_other_arguments(device, arguments):
    assert device.tpd(*arguments) == "\n"
    assert device.events("lookup", who="tpd") == []


@pytest.mark.parametrize("arguments", [[], ["help"]], ids=["no argument", "help"])
def test_lists_commands_of_daemon_and_tool(device, arguments):
    daemon, local = device.tpd(*arguments).split("\n\n//aaa special gTpdCmds\n")
    assert "THP_SetFoldState" in daemon
    assert local.splitlines()[0] == "debugDifEnable"


LOCAL = {
    "stop": [("odm.thp.service_enable", "0")],
    "reboot": RESTART,
    "log_enable": [(LOG, "true"), *RESTART],
    "log_disable": [("persist.sys.zelmor.debug.on", "false")],
    "debugRawEnable": [("thp.debug.raw", "true")],
    "debugDifEnable": [("thp.debug.raw", "false")],
    "log_afe_enable": [("odm.thp.debug.afelog", "true"), *RESTART],
    "log_afe_disable": [("odm.thp.debug.afelog", "false"), *RESTART],
}


@pytest.mark.parametrize("command, written", LOCAL.items(), ids=LOCAL)
def test_runs_a_local_command(device, command, written):
    assert device.tpd(command) == "\n"
    assert device.written() == written
    assert device.events("lookup", who="tpd") == []


def test_switches_the_log_off(device):
    device.setprop(LOG, "true")
    device.tpd("log_disable")
    versions = [("persist.odm.thp.ver_dae", "true"), ("odm.thp.ver_dae", "true")]
    assert device.written()[1:] == [*versions, (LOG, "false"), *RESTART]


@pytest.mark.parametrize("command, value", [("showtouch", "1"), ("showtouch_close", "0")])
def test_switches_the_touch_display(device, command, value):
    assert device.tpd(command) == "\n"
    for setting in ("show_touches", "pointer_location"):
        assert device.output("settings", "get", "system", setting) == value + "\n"


def test_starts_a_stopped_daemon(device):
    device.tpd("stop")
    wait_until(lambda: not device.is_up())
    device.tpd("start")
    wait_until(device.is_up)
    assert device.tpd("captest") == PASS
    assert device.restarts() == 0


def test_restarts_the_daemon(device):
    before = device.daemon()
    device.tpd("reboot")
    wait_until(lambda: device.daemon() != before and device.is_up())
    assert device.tpd("captest") == PASS


def test_stores_the_screen_state(device):
    state = "version:3+main,1"
    assert device.tpd("captest", state) == f"captest {state}: PASS\n"
    assert device.written() == [("odm.thp.screen_status", state)]


def test_refuses_while_selinux_enforces(device):
    device.setprop(PERMISSIVE, "null")
    assert device.tpd("captest") == REFUSED
    assert device.events("lookup", who="tpd") == []


def test_remembers_that_selinux_was_permissive(device):
    device.setprop(PERMISSIVE, "null")
    device.output("setenforce", "0")
    assert device.tpd("captest") == PASS
    device.output("setenforce", "1")
    assert device.tpd("captest") == PASS
    assert device.written() == [(PERMISSIVE, "true")]


@pytest.mark.parametrize(
    "pair", ["enter_recovery=1", "enter_erecovery=1", "androidboot.swtype=factory"]
)
def test_forwards_as_the_kernel_command_line_says(device, pair):
    device.setprop(PERMISSIVE, "null")
    (device.root / "proc").mkdir(exist_ok=True)
    (device.root / "proc/cmdline").write_text(f"quiet {pair} ro\n")
    assert device.tpd("captest") == PASS


def test_reports_a_daemon_that_is_down(device):
    device.tpd("stop")
    wait_until(lambda: not device.is_up())
    assert device.tpd("captest") == (
        "0P_1P; check_time: 10.thp.dae_alive : 0. thp.binder: 0 reboot_times: 0\n"
    )


def test_reports_a_firmware_update(device):
    device.setprop("sim.updating_fw", "true")
    wait_until(lambda: device.getprop("odm.thp.is_updating_fw") == "true")
    assert device.tpd("captest") == (
        "0P_1P; bypass-when-fw-updatingcheck_time: 0.thp.dae_alive : 0. thp.binder: 0\n"
    )


def test_waits_for_a_daemon_that_is_starting(device):
    device.setprop("sim.boot_delay_ms", "700")
    device.tpd("reboot")
    wait_until(lambda: not device.is_up())
    assert device.tpd("captest") == PASS


def test_reports_a_missing_service(device):
    (device.root / SERVICE).unlink()
    assert device.tpd("captest") == NO_SERVICE
    assert device.written() == RESTART


@pytest.mark.parametrize("fault", ["die_before", "die_during"])
def test_tries_again_when_the_daemon_dies_in_the_call(device, fault):
    device.output("device", "fault", fault, "1")
    assert device.tpd("captest") == PASS
    assert device.restarts() == 1
    assert device.written() == []


@pytest.mark.parametrize("fault", ["die_before", "die_during"])
def test_restarts_a_daemon_that_dies_in_every_call(device, fault):
    device.output("device", "fault", fault)
    assert device.tpd("captest") == TIMEOUT
    assert device.written() == RESTART
    assert len(device.events("binder_died", who="tpd")) == 2
