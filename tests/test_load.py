"""Many concurrent clients, with and without faults"""
import concurrent.futures
import os
import time

import pytest

from virtual_device import NO_SERVICE, PASS, TIMEOUT, wait_until

COMMANDS = [300, pytest.param(9000, marks=pytest.mark.soak)]


def run_clients(commands, check):
    """Calls `check` with that many different parameters, from 16 threads."""
    states = [f"version:3+main,{number},{number}" for number in range(commands)]
    with concurrent.futures.ThreadPoolExecutor(16) as pool:
        list(pool.map(check, states))


def descriptors(device):
    """Returns the number of open descriptors of each process."""
    return {process: len(os.listdir(f"/proc/{process}/fd")) for process in device.processes()}


@pytest.mark.parametrize("commands", COMMANDS)
def test_answers_all_clients_and_closes_their_descriptors(device, commands):
    """Every state repeats its number; a torn write of the property would mix two states."""

    def check(state):
        assert device.tpd("captest", state) == f"captest {state}: PASS\n"
        _, number, same = device.getprop("odm.thp.screen_status").split(",")
        assert number == same

    before = descriptors(device)
    run_clients(commands, check)
    assert len(device.events("command")) == commands
    wait_until(lambda: descriptors(device) == before)


FAULTS = [
    lambda device: device.run("timeout", "-s", "KILL", "0.005", *device.tool, "captest"),
    lambda device: device.kill("corvane_daemon"),
    lambda device: device.tpd("reboot"),
    lambda device: device.fault("die_after 9"),
]


@pytest.mark.parametrize("commands", COMMANDS)
def test_fails_only_with_known_results(device, chance, commands):
    def check(state):
        text = device.tpd("captest", state)
        known = f"captest {state}: PASS\n", TIMEOUT, NO_SERVICE
        assert text in known or text.startswith("0P_1P; check_time: ")

    with concurrent.futures.ThreadPoolExecutor() as pool:
        clients = pool.submit(run_clients, commands, check)
        while not clients.done():
            chance.choice(FAULTS)(device)
            time.sleep(0.2)
    clients.result()
    device.fault("none")
    device.tpd("reboot")
    wait_until(lambda: device.tpd("captest") == PASS)
