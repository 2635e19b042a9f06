#!/usr/bin/env python3
"""Measures tpd beside its baseline: compare.py BUILD PICTURE

Writes BUILD/results.json and the picture, and prints the tables of docs/performance.md. Every ratio
is of two programs that took turns in the same minute.
"""
import contextlib
import json
import os
import platform
import re
import shlex
import subprocess
import sys
import tempfile
import time
from pathlib import Path
from statistics import median, quantiles

BUILD, PICTURE = Path(sys.argv[1]), sys.argv[2]
TPD, BASELINE, SHARED = f"{BUILD}/tpd", f"{BUILD}/bench/baseline", f"{BUILD}/bench/baseline_shared"
FORWARDED = "THP_GetVersion"
PERMISSIVE, ENABLE = "odm.thp.debug.selinux.permissive", "odm.thp.service_enable"
LARGEST_REPLY = (1 << 20) - 2 * 4096 - 4  # bytes, without terminator and padding
BATCH = 256  # processes that the clients share
# The arguments of tpd, those of the baseline, and the property that is set before each run.
SCENARIOS = {
    "forwarded": ([FORWARDED], [FORWARDED], (PERMISSIVE, "true")),
    "stop": (["stop"], [], (ENABLE, "1")),
    "refused": ([FORWARDED], [FORWARDED], (PERMISSIVE, "null")),
}


def run(*command):
    return subprocess.run(command, check=True, text=True, stdout=subprocess.PIPE).stdout


def setprop(key, value):
    run("setprop", key, str(value))


@contextlib.contextmanager
def device_root():
    """A device root of its own, in memory where the machine has such a folder."""
    memory = "/dev/shm" if os.access("/dev/shm", os.W_OK) else None
    with tempfile.TemporaryDirectory(prefix="tpd-bench-", dir=memory) as root:
        os.environ["TPD_DEVICE_ROOT"] = root
        yield Path(root)


@contextlib.contextmanager
def daemon():
    """The simulated daemon, without an init that would end it at each `stop`."""
    setprop("odm.thp.dae_reboot_times", "0")
    process = subprocess.Popen([BUILD / "device/corvane_daemon"])
    try:
        while process.poll() is None and run("getprop", "odm.thp.binder") != "1\n":
            time.sleep(0.01)
        yield
    finally:
        process.kill()
        process.wait()


def alternate(root, commands, rounds, runs, *options):
    """Times the commands in short rounds; ratios are to the baseline's in the same round."""
    times = root / "times.json"
    wall, cpu = {name: [] for name in commands}, {name: [] for name in commands}
    for _ in range(rounds):
        run("hyperfine", "-N", "--style=none", "--warmup=2", f"--runs={runs}", *options,
            f"--output={root}/output", f"--export-json={times}",
            *map(shlex.join, commands.values()))
        for name, result in zip(commands, json.loads(times.read_text())["results"]):
            wall[name].append(1e6 * result["median"])
            cpu[name].append(1e6 * (result["user"] + result["system"]))
    def ratios(values, name):
        return [own / base for own, base in zip(values[name], values["baseline"])]
    return {name: {"wall_us": median(wall[name]), "cpu_us": median(cpu[name]),
                   "wall_ratio": median(ratios(wall, name)),
                   "wall_ratio_quartiles": quantiles(ratios(wall, name))[::2],
                   "cpu_ratio": median(ratios(cpu, name))} for name in commands}


def traced(root, command, *options):
    """What strace writes of one run."""
    with open(root / "output", "w") as output:
        subprocess.run(["strace", f"--output={root}/calls", *options, *command], check=True,
                       stdout=output)
    return (root / "calls").read_text()


def call_count(root, command):
    return int(traced(root, command, "-c", "-f", "-U", "calls").split()[-1])


def own_calls(root, command):
    """System calls and results from the device root's on, memory and process numbers aside."""
    text = traced(root, command, "-e", "trace=!%memory,getpid,gettid,clone3,vfork,wait4")
    return re.findall(r"^(\w+)\(.*\) += (-?\d+)", text[text.index('"/dev/null"'):], re.M)


def instructions(command):
    """User instructions of the program itself."""
    result = subprocess.run(["valgrind", "--tool=callgrind", "--callgrind-out-file=/dev/null",
                             *command], check=True, text=True, capture_output=True)
    return int(re.search(r"Collected : (\d+)", result.stderr)[1])


def peak_kib(command):
    """Resident memory when it writes its result, where a full pipe holds it."""
    reader, writer = os.pipe()
    os.set_blocking(writer, False)
    with contextlib.suppress(BlockingIOError):
        while True:
            os.write(writer, bytes(4096))
    os.set_blocking(writer, True)
    with subprocess.Popen(command, stdout=writer) as process:
        time.sleep(0.3)
        status = Path(f"/proc/{process.pid}/status").read_text()
        process.kill()
    os.close(reader)
    os.close(writer)
    return int(re.search(r"VmHWM:\s+(\d+)", status)[1])


def measure_scenario(root, arguments, baseline_arguments, prepare):
    commands = {"tpd": [TPD, *arguments], "baseline": [BASELINE, *baseline_arguments],
                "shared": [SHARED, *baseline_arguments], "true": ["/bin/true"]}
    def each(measure, names):
        for name in names:
            setprop(*prepare)
            yield name, measure(commands[name])
    own = ("tpd", "baseline")
    for question in (lambda command: run(*command), lambda command: own_calls(root, command)):
        answers = dict(each(question, own))
        if answers["tpd"] != answers["baseline"]:
            sys.exit(f"{arguments}: the baseline differs from tpd: {answers}")
    results = alternate(root, commands, 20, 25, "--prepare", shlex.join(["setprop", *prepare]))
    for title, measure in (("instructions", instructions), ("peak_kib", peak_kib),
                           ("calls", lambda command: call_count(root, command))):
        for name, value in each(measure, own):
            results[name][title] = value
    return results
