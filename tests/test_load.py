"""Many clients at once, on a steady and on a faulty device"""
import concurrent.futures
import os
import pathlib
import random
import re
import subprocess
import threading
import time

import pytest

from virtual_device import NO_SERVICE, PASS, TIMEOUT, wait_until

CLIENTS = 16
COMMANDS = [20, pytest.param(600, marks=pytest.mark.soak)]  # of each client
GROWTH_KIB = 8192


def run_clients(commands, check):
    """Has each client check one command after the other, each with other parameters."""

    def client(number):
        for turn in range(commands):
            token = f"{number}.{turn}"
            check(f"version:3+main,{token},{token[::-1]}")

    with concurrent.futures.ThreadPoolExecutor(CLIENTS) as pool:
        list(pool.map(client, range(CLIENTS)))


def resources(process):
    """How many descriptors a process has, and KiB of memory."""
    folder = pathlib.Path(f"/proc/{process}")
    memory = re.search(r"VmRSS:\s*(\d+)", (folder / "status").read_text())
    return len(os.listdir(folder / "fd")), int(memory[1])


@pytest.mark.parametrize("commands", COMMANDS)
def test_answers_all_clients(device, commands):
    def check(state):
        assert device.tpd("captest", state) == f"captest {state}: PASS\n"
        _, token, mirrored = device.getprop("odm.thp.screen_status").split(",")
        assert token == mirrored[::-1]

    before = {each: resources(each) for each in device.processes()}
    run_clients(commands, check)
    assert len(device.events("command")) == commands * CLIENTS
    for process, (descriptors, memory) in before.items():
        wait_until(lambda: resources(process)[0] == descriptors)
        assert resources(process)[1] < memory + GROWTH_KIB


def kill_client(device):
    client = subprocess.Popen([*device.tool, "captest"], env=device.env)
    time.sleep(random.uniform(0, 0.01))
    client.kill()
    client.wait()


TROUBLES = [
    kill_client,
    lambda device: device.kill("corvane_daemon"),
    lambda device: device.tpd("reboot"),
    lambda device: device.setprop("odm.thp.dae_alive", "0"),
    lambda device: device.output("device", "fault", "die_after", "9"),
]


@pytest.mark.parametrize("commands", COMMANDS)
def test_fails_only_in_known_ways(device, commands):
    def check(state):
        text = device.tpd("captest", state)
        known = (f"captest {state}: PASS\n", TIMEOUT, NO_SERVICE)
        assert text in known or text.startswith("0P_1P; check_time: ")

    def make_trouble():
        while not over.wait(0.2):
            random.choice(TROUBLES)(device)

    over = threading.Event()
    with concurrent.futures.ThreadPoolExecutor() as pool:
        trouble = pool.submit(make_trouble)
        try:
            run_clients(commands, check)
        finally:
            over.set()
    trouble.result()
    device.output("device", "fault", "none")
    device.tpd("reboot")
    wait_until(lambda: device.tpd("captest") == PASS)
