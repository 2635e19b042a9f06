"""Each path that a command can take through the tool, with the simulated daemon"""
import pytest

from virtual_device import NO_SERVICE, PASS, PERMISSIVE, REFUSED, RESTART, SERVICE, TIMEOUT
from virtual_device import wait_until

LOG = "persist.odm.thp.thplog_enabled"


def stop(device):
    device.tpd("stop")
    wait_until(lambda: not device.is_up())


@pytest.mark.parametrize(
    "arguments, answer",
    [
        ("captest", PASS),
        ("captest x", "captest x: PASS\n"),
        ("TSA_ExecuteCommand captest", PASS),
        ("TSA_ExecuteCommand captest x", "captest x: PASS\n"),
        ("stop now", "unknown command: stop\n"),
    ],
)
def test_forwards(device, arguments, answer):
    assert device.tpd(*arguments.split()) == answer
    assert device.written() == []


@pytest.mark.parametrize("arguments", ["TSA_ExecuteCommand  x", "captest x x", "x x x x"])
def test_forwards_no_other_arguments(device, arguments):
    assert device.tpd(*arguments.split(" ")) == "\n"
    assert device.events("lookup") == []


@pytest.mark.parametrize("arguments", [[], ["help"]], ids=["no argument", "help"])
def test_lists_commands_of_daemon_and_tool(device, arguments):
    daemon, local = device.tpd(*arguments).split("\n\n//aaa special gTpdCmds\n")
    assert "THP_SetFoldState" in daemon
    assert local.startswith("debugDifEnable\n")


LOCAL = {
    "reboot": RESTART,
    "log_enable": [(LOG, "true"), *RESTART],
    "log_disable": [("persist.sys.zelmor.debug.on", "false")],
    "debugRawEnable": [("thp.debug.raw", "true")],
    "log_afe_enable": [("odm.thp.debug.afelog", "true"), *RESTART],
}


@pytest.mark.parametrize("command, written", LOCAL.items(), ids=LOCAL)
def test_runs_a_local_command(device, command, written):
    assert device.tpd(command) == "\n"
    assert device.written() == written
    assert device.events("lookup") == []


def test_switches_the_log_off(device):
    device.setprop(LOG, "true")
    device.tpd("log_disable")
    versions = [("persist.odm.thp.ver_dae", "true"), ("odm.thp.ver_dae", "true")]
    assert device.written()[1:] == [*versions, (LOG, "false"), *RESTART]


def test_switches_the_touch_display(device):
    for command, value in (("showtouch", 1), ("showtouch_close", 0)):
        device.tpd(command)
        shown = device.output("settings", "list", "system")
        assert shown == f"pointer_location={value}\nshow_touches={value}\n"


def test_stops_and_starts_the_daemon(device):
    stop(device)
    device.tpd("start")
    wait_until(device.is_up)
    assert device.written() == RESTART
    assert device.restarts() == 0


def test_restarts_the_daemon(device):
    before = device.processes("corvane_daemon")
    device.tpd("reboot")
    wait_until(lambda: device.processes("corvane_daemon") != before and device.is_up())


def test_stores_the_screen_state(device):
    state = "version:3+main,1"
    assert device.tpd("captest", state) == f"captest {state}: PASS\n"
    assert device.written() == [("odm.thp.screen_status", state)]


def test_refuses_while_selinux_enforces(device):
    device.setprop(PERMISSIVE, "null")
    assert device.tpd("captest") == REFUSED
    assert device.events("lookup") == []


def test_remembers_that_selinux_was_permissive(device):
    device.setprop(PERMISSIVE, "null")
    device.output("setenforce", "0")
    assert device.tpd("captest") == PASS
    device.output("setenforce", "1")
    assert device.tpd("captest") == PASS
    assert device.written() == [(PERMISSIVE, "true")]


def test_forwards_in_upgrade_mode(device):
    device.setprop(PERMISSIVE, "null")
    (device.root / "proc").mkdir()
    (device.root / "proc/cmdline").write_text("quiet enter_recovery=1 ro\n")
    assert device.tpd("captest") == PASS


def test_reports_a_daemon_that_is_down(device):
    stop(device)
    text = "0P_1P; check_time: 10.thp.dae_alive : 0. thp.binder: 0 reboot_times: 0\n"
    assert device.tpd("captest") == text


def test_reports_a_firmware_update(device):
    device.setprop("sim.updating_fw", "true")
    wait_until(lambda: device.getprop("odm.thp.is_updating_fw") == "true")
    text = "0P_1P; bypass-when-fw-updatingcheck_time: 0.thp.dae_alive : 0. thp.binder: 0\n"
    assert device.tpd("captest") == text


def test_waits_for_a_daemon_that_is_starting(device):
    device.setprop("sim.boot_delay_ms", "700")
    device.tpd("reboot")
    wait_until(lambda: not device.is_up())
    assert device.tpd("captest") == PASS


def test_restarts_a_daemon_without_a_service(device):
    (device.root / SERVICE).unlink()
    assert device.tpd("captest") == NO_SERVICE
    assert device.written() == RESTART


def test_calls_again_when_the_daemon_dies(device):
    device.output("device", "fault", "die_during", "1")
    assert device.tpd("captest") == PASS
    assert device.restarts() == 1
    assert device.written() == []


def test_restarts_a_daemon_that_dies_in_every_call(device):
    device.output("device", "fault", "die_during")
    assert device.tpd("captest") == TIMEOUT
    assert device.written() == RESTART
    assert len(device.events("binder_died")) == 2
