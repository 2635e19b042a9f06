"""The main paths of a command through the tool"""
from concurrent.futures import ThreadPoolExecutor

from virtual_device import NO_SERVICE, PASS, PERMISSIVE, RESTART, SERVICE, wait_until


def test_forwards_a_command(device):
    answer = device.tpd("TSA_ExecuteCommand", "captest", "x")
    assert answer == "captest x: PASS\n"
    assert device.written() == []


def test_sets_a_property(device):
    assert device.tpd("debugRawEnable") == "\n"
    assert device.written() == [("thp.debug.raw", "true")]
    assert device.events("lookup") == []


def test_switches_the_touch_display(device):
    device.tpd("showtouch")
    listed = device.output("settings", "list", "system")
    assert listed == "pointer_location=1\nshow_touches=1\n"


def test_forwards_while_selinux_is_permissive(device):
    device.setprop(PERMISSIVE, "null")
    device.output("setenforce", "0")
    assert device.tpd("captest") == PASS
    assert device.written() == [(PERMISSIVE, "true")]


def test_forwards_in_upgrade_mode(device):
    device.setprop(PERMISSIVE, "null")
    (device.root / "proc").mkdir()
    (device.root / "proc/cmdline").write_text("quiet enter_recovery=1 ro\n")
    assert device.tpd("captest") == PASS


def test_restarts_a_daemon_without_a_service(device):
    (device.root / SERVICE).unlink()
    answer = device.tpd("captest", env=device.env | {"TPD_GET_SERVICE_MS": "300"})
    assert answer == NO_SERVICE
    assert device.written() == RESTART
    times = [lookup["us"] for lookup in device.events("lookup")]
    assert 200000 <= min(times) <= max(times) < 4000000


def test_finds_a_service_that_appears_during_the_lookup(device):
    service = device.root / SERVICE
    service.rename(device.root / "away")
    with ThreadPoolExecutor() as pool:
        answer = pool.submit(device.tpd, "captest")
        wait_until(lambda: device.events("log", who="tpd")[-1:])
        (device.root / "away").rename(service)
    assert answer.result() == PASS
    assert len(device.events("lookup")) == 1
