"""Many clients at once, on a steady and on a faulty device"""
import concurrent.futures
import contextlib
import os
import pathlib
import random
import re
import signal
import subprocess
import threading
import time

import pytest

from virtual_device import NO_SERVICE, PASS, TIMEOUT, wait_until

CLIENTS = 16
COMMANDS = [300, pytest.param(10000, marks=pytest.mark.soak)]
GROWTH_KIB = 8192
NOT_SENT = re.compile(
    r"0P_1P; (bypass-when-fw-updating)?check_time: \d+\.thp.dae_alive : [01]\. "
    r"thp.binder: [01]( reboot_times: [01])?\n"
)


def run_clients(commands, one_command):
    """Each client does its share of the commands, one after the other."""

    def client(number):
        for turn in range(commands // CLIENTS):
            word = f"{number}.{turn}"
            one_command(f"version:3+main,{word},{word[::-1]}")

    with concurrent.futures.ThreadPoolExecutor(CLIENTS) as pool:
        list(pool.map(client, range(CLIENTS)))


def resources(process):
    """How many descriptors a process has, and KiB of memory."""
    folder = pathlib.Path(f"/proc/{process}")
    memory = re.search(r"VmRSS:\s*(\d+)", (folder / "status").read_text())
    return len(os.listdir(folder / "fd")), int(memory[1])


@pytest.mark.parametrize("commands", COMMANDS)
def test_answers_all_clients(device, commands):
    def one_command(state):
        assert device.tpd("captest", state) == f"captest {state}: PASS\n"
        stored = (device.root / "properties/odm.thp.screen_status").read_text()
        _, word, mirrored = stored.split(",")
        assert word == mirrored[::-1]

    before = {each: resources(each) for each in (device.init(), device.daemon())}
    run_clients(commands, one_command)
    for process, (descriptors, memory) in before.items():
        wait_until(lambda: resources(process)[0] == descriptors)
        assert resources(process)[1] < memory + GROWTH_KIB
    calls = device.events("command", who="corvane_daemon")
    assert len(calls) == commands // CLIENTS * CLIENTS


def kill_client(device):
    client = subprocess.Popen([*device.tool, "captest"], env=device.env)
    time.sleep(random.random() / 100)
    client.kill()
    client.wait()


def kill_daemon(device):
    with contextlib.suppress(ProcessLookupError):
        os.kill(device.daemon(), signal.SIGKILL)


def update_firmware(device):
    device.setprop("sim.updating_fw", "true")
    time.sleep(0.5)
    device.setprop("sim.updating_fw", "false")


TROUBLES = [
    kill_client,
    update_firmware,
    kill_daemon,
    lambda device: device.tpd("reboot"),
    lambda device: device.setprop("odm.thp.dae_alive", "0"),
    lambda device: device.output("device", "fault", "die_after", "9"),
]


@pytest.mark.parametrize("commands", COMMANDS)
def test_fails_only_in_known_ways(device, commands):
    def one_command(state):
        text = device.tpd("captest", state)
        answers = (f"captest {state}: PASS\n", TIMEOUT, NO_SERVICE)
        assert text in answers or NOT_SENT.fullmatch(text)

    def make_trouble():
        while not over.wait(0.2):
            random.choice(TROUBLES)(device)

    over = threading.Event()
    trouble = threading.Thread(target=make_trouble)
    trouble.start()
    try:
        run_clients(commands, one_command)
    finally:
        over.set()
        trouble.join()
    device.output("device", "fault", "none")
    device.tpd("reboot")
    wait_until(lambda: device.tpd("captest") == PASS)
