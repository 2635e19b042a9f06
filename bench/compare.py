#!/usr/bin/env python3
"""Measures tpd beside its baseline, prints the tables of docs/performance.md, draws its picture.

compare.py BUILD PICTURE: on a device whose daemon runs without init, so that it outlives `stop`.
BUILD/parts.json has what bench/parts measured. BUILD/results.json gets everything, by table, row,
program and measure.
"""
import json
import os
import platform
import re
import shlex
import subprocess
import sys
import time
from pathlib import Path
from statistics import median, quantiles

BUILD, PICTURE = Path(sys.argv[1]), sys.argv[2]
ROOT = Path(os.environ["TPD_DEVICE_ROOT"])
OUTPUT, CALLS, TIMES = ROOT / "output", ROOT / "calls", ROOT / "times.json"
TPD, BASELINE, COMMAND = f"{BUILD}/tpd", f"{BUILD}/bench/baseline", "THP_GetVersion"
FORWARDED = {"baseline": [BASELINE, COMMAND], "tpd": [TPD, COMMAND]}
PERMISSIVE = "odm.thp.debug.selinux.permissive"
# What runs, and the property that is set before each run.
COMMANDS = {
    "forwarded": (FORWARDED, (PERMISSIVE, "true")),
    "refused": (FORWARDED, (PERMISSIVE, "null")),
    "stop": ({"baseline": [BASELINE], "tpd": [TPD, "stop"]}, ("odm.thp.service_enable", "1")),
}
LARGEST_REPLY = (1 << 20) - 2 * 4096 - 4  # bytes; four more are terminator and padding
BATCH = 128  # processes that all clients together start


def run(*command):
    return subprocess.run(command, check=True, text=True, capture_output=True).stdout


def setprop(key, value):
    run("setprop", key, str(value))


def alternate(commands, rounds, runs, *options):
    """Times the commands in short rounds. A ratio is of two medians of one round."""
    samples = {name: {"wall us": [], "CPU us": []} for name in commands}
    for _ in range(rounds):
        run("hyperfine", "-N", "--style=none", "--warmup=2", f"--runs={runs}", *options,
            f"--output={OUTPUT}", f"--export-json={TIMES}", *map(shlex.join, commands.values()))
        for sample, result in zip(samples.values(), json.loads(TIMES.read_text())["results"]):
            sample["wall us"].append(1e6 * result["median"])
            sample["CPU us"].append(1e6 * (result["user"] + result["system"]))
    row = {name: {measure: round(median(values)) for measure, values in sample.items()}
           for name, sample in samples.items()}
    row["ratio"] = {}
    for measure, values in samples["tpd"].items():
        ratios = [own / base for own, base in zip(values, samples["baseline"][measure])]
        row["ratio"][measure] = [round(ratio, 2) for ratio in quantiles(ratios, method="inclusive")]
    return row


def strace(command, *options):
    with open(OUTPUT, "w") as output:
        subprocess.run(["strace", f"--output={CALLS}", *options, *command], check=True,
                       stdout=output)
    return CALLS.read_text()


def own_calls(command):
    """Calls and results from the first look at the device on, memory and process ids aside."""
    text = strace(command, "-e", "trace=!%memory,getpid,gettid,clone3,vfork,wait4")
    return re.findall(r"^(\w+)\(.*\) += (-?\d+)", text[text.index('"/dev/null"'):], re.M)


def all_calls(command):
    return int(strace(command, "-c", "-f", "-U", "calls").split()[-2])


def instructions(command):
    """Those of the program itself, in user mode."""
    counted = subprocess.run(["valgrind", "--tool=callgrind", "--callgrind-out-file=/dev/null",
                              *command], check=True, text=True, capture_output=True)
    return int(re.search(r"Collected : (\d+)", counted.stderr)[1])


def page_faults(command):
    quiet = [(os.POSIX_SPAWN_OPEN, 1, OUTPUT, os.O_WRONLY, 0)]
    process = os.posix_spawn(command[0], command, os.environ, file_actions=quiet)
    return os.wait4(process, 0)[2].ru_minflt


def measure_command(commands, prepare):
    def each(measure):
        values = {}
        for name, command in commands.items():
            setprop(*prepare)
            values[name] = measure(command)
        return values

    for same in (lambda command: run(*command)), own_calls:
        values = each(same)
        if values["tpd"] != values["baseline"]:
            sys.exit(f"the baseline does something else than tpd: {values}")
    shared = [f"{BASELINE}_shared", *commands["baseline"][1:]]
    row = alternate({"true": ["/bin/true"], "shared": shared, **commands}, 20, 25,
                    "--prepare", shlex.join(["setprop", *prepare]))
    for title, measure in (("instructions", instructions), ("system calls", all_calls),
                           ("page faults", page_faults)):
        values = each(measure)
        for name, value in values.items():
            row[name][title] = value
        row["ratio"][title] = round(values["tpd"] / values["baseline"], 2)
    return row


def parts():
    rows = {}
    for result in json.loads((BUILD / "parts.json").read_text())["benchmarks"]:
        if result["aggregate_name"] == "median":
            part, program, *size = result["run_name"].split("/")
            row = rows.setdefault(" ".join([part, *size]), {"baseline": {}, "tpd": {}})
            row[program]["wall us"] = round(result["real_time"] / 1000, 4)
    for row in rows.values():
        row["ratio"] = {"wall us": round(row["tpd"]["wall us"] / row["baseline"]["wall us"], 2)}
    return rows


def grow(sizes, change, commands=lambda size: FORWARDED, runs=40):
    rows = {}
    for size in sizes:
        change(size)
        rows[str(size)] = alternate(commands(size), 5, runs)
    return rows


def with_clients(count):
    (ROOT / "batch").write_text("run\n" * BATCH)
    xargs = ["xargs", "-a", f"{ROOT}/batch", "-P", str(count), "-I{}"]
    return {name: [*xargs, *command] for name, command in FORWARDED.items()}


def fill_properties(count):
    for number in range(count):
        (ROOT / f"properties/bench.{number}").touch()


def measure():
    tables = {"commands": {name: measure_command(*each) for name, each in COMMANDS.items()}}
    tables["parts"] = parts()
    setprop(PERMISSIVE, "true")
    setprop("sim.fault", "huge")
    tables["reply_bytes"] = grow([16, 256, 4096, 65536, LARGEST_REPLY],
                                 lambda size: setprop("sim.fault_arg", size))
    setprop("sim.fault", "")
    tables["clients"] = grow([1, 2, 4, 8, 16, 32, 64], lambda count: None, with_clients, 5)
    tables["log_bytes"] = grow([1, 1 << 20, 1 << 25, 1 << 30],
                               lambda size: os.truncate(ROOT / "log", size))
    tables["properties"] = grow([10, 1000, 10000, 100000], fill_properties)
    return tables


def print_tables(tables):
    for title, rows in tables.items():
        columns = [title, "measure", *next(iter(rows.values()))]
        print(f"\n| {' | '.join(columns)} |\n|{'---|' * len(columns)}")
        for name, row in rows.items():
            for measure in row["tpd"]:
                cells = [str(column.get(measure, "")) for column in row.values()]
                print(f"| {name} | {measure} | {' | '.join(cells)} |")


def draw(title, tables):
    """Hands gnuplot each table's wall times as a block with its name."""
    lines = [f"title = '{title}'", f"batch = {BATCH}"]
    for table, rows in tables.items():
        lines.append(f"${table} << EOD")
        for name, row in rows.items():
            times = [row[each]["wall us"] for each in ("baseline", "tpd", "true") if each in row]
            lines.append(" ".join([f'"{name}"', *map(str, times)]))
        lines.append("EOD")
    (BUILD / "results.gp").write_text("\n".join(lines) + "\n")
    run("gnuplot", "-e", f"set output '{PICTURE}'", BUILD / "results.gp",
        Path(__file__).with_name("picture.gp"))


def main():
    kind = "virtual machine" if " hypervisor" in Path("/proc/cpuinfo").read_text() else "machine"
    title = f"{time.strftime('%Y-%m-%d')}, {kind} with {os.cpu_count()} {platform.machine()} cores"
    tables = measure()
    (BUILD / "results.json").write_text(json.dumps({"title": title, "tables": tables}, indent=1))
    print(title)
    print_tables(tables)
    draw(title, tables)


main()
