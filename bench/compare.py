#!/usr/bin/env python3
"""Measures tpd beside its baseline, prints the results as tables and draws them.

compare.py BUILD PICTURE: on a device whose daemon runs without init, so that it outlives `stop`.
Reads BUILD/parts.json, from bench/parts; writes BUILD/results.json: table, row, program, measure.
"""
import json
import os
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
PROGRAMS = {"true": "/bin/true", "shared": f"{BUILD}/bench/baseline_shared",
            "baseline": f"{BUILD}/bench/baseline", "tpd": f"{BUILD}/tpd"}
PERMISSIVE = "odm.thp.debug.selinux.permissive"
FORWARDED = "THP_GetVersion"
# The argument, and the property that is set before each run.
COMMANDS = {"forwarded": (FORWARDED, (PERMISSIVE, "true")),
            "refused": (FORWARDED, (PERMISSIVE, "null")),
            "stop": ("stop", ("odm.thp.service_enable", "1"))}
LARGEST_REPLY = (1 << 20) - 2 * 4096 - 4  # bytes; four more are terminator and padding
BATCH = 128  # processes that all clients together start
TIMED = "wall_us", "cpu_us"


def run(*command):
    done = subprocess.run([str(each) for each in command], text=True, capture_output=True)
    if done.returncode != 0:
        sys.exit(f"{command}: status {done.returncode}\n{done.stderr}")
    return done.stdout


def alternate(commands, rounds, runs, *options):
    """Times the commands in short rounds. A ratio is of two medians of one round."""
    samples = []
    for _ in range(rounds):
        run("hyperfine", "-N", "--style=none", "--warmup=2", f"--runs={runs}", *options,
            f"--output={OUTPUT}", f"--export-json={TIMES}", *map(shlex.join, commands.values()))
        samples.append({name: {"wall_us": 1e6 * each["median"],
                               "cpu_us": 1e6 * (each["user"] + each["system"])}
                        for name, each in zip(commands, json.loads(TIMES.read_text())["results"])})
    row = {name: {kind: round(median(sample[name][kind] for sample in samples)) for kind in TIMED}
           for name in commands}
    row["ratio"] = {kind: [round(each, 2) for each in quantiles(
        (sample["tpd"][kind] / sample["baseline"][kind] for sample in samples),
        method="inclusive")] for kind in TIMED}
    return row


def strace(*arguments):
    run("strace", f"--output={CALLS}", *arguments)
    return CALLS.read_text()


def own_calls(command):
    """Calls and results from the first look at the device on, memory and process ids aside."""
    text = strace("-e", "trace=!%memory,getpid,gettid,clone3,vfork,wait4", *command)
    return re.findall(r"^(\w+)\(.*\) += (-?\d+)", text[text.index('"/dev/null"'):], re.M)


def system_calls(command):
    """With those of the programs that it starts."""
    return int(strace("-c", "-f", "-U", "calls", *command).split()[-2])


def instructions(command):
    """Those of the program itself, in user mode."""
    log = run("valgrind", "--log-fd=1", "--tool=callgrind", "--callgrind-out-file=/dev/null",
              *command)
    return int(re.search(r"Collected : (\d+)", log)[1])


def page_faults(command):
    quiet = [(os.POSIX_SPAWN_OPEN, 1, OUTPUT, os.O_WRONLY, 0)]
    process = os.posix_spawn(command[0], command, os.environ, file_actions=quiet)
    return os.wait4(process, 0)[2].ru_minflt


def measure_command(argument, prepare):
    commands = {name: [program, argument] for name, program in PROGRAMS.items()}

    def each(measure):
        values = {}
        for name in "baseline", "tpd":
            run("setprop", *prepare)
            values[name] = measure(commands[name])
        return values

    for same in (lambda command: run(*command)), own_calls:
        values = each(same)
        if values["tpd"] != values["baseline"]:
            sys.exit(f"the baseline does something else than tpd: {values}")
    row = alternate(commands, 20, 25, "--prepare", shlex.join(["setprop", *prepare]))
    for measure in instructions, system_calls, page_faults:
        values = each(measure)
        for name, value in values.items():
            row[name][measure.__name__] = value
        row["ratio"][measure.__name__] = round(values["tpd"] / values["baseline"], 2)
    return row


def parts():
    rows = {}
    for result in json.loads((BUILD / "parts.json").read_text())["benchmarks"]:
        if result["aggregate_name"] == "median":
            part, program, *size = result["run_name"].removesuffix("/process_time").split("/")
            row = rows.setdefault(" ".join([part, *size]), {"baseline": {}, "tpd": {}, "ratio": {}})
            row[program]["cpu_ns"] = round(result["cpu_time"], 1)
    for row in rows.values():
        if row["baseline"]:
            row["ratio"]["cpu_ns"] = round(row["tpd"]["cpu_ns"] / row["baseline"]["cpu_ns"], 2)
    return dict(sorted(rows.items()))


def grow(sizes, change, wrapper=lambda size: [], runs=20):
    rows = {}
    for size in sizes:
        change(size)
        rows[size] = alternate({name: [*wrapper(size), PROGRAMS[name], FORWARDED]
                                for name in ("baseline", "tpd")}, 10, runs)
    return rows


def with_clients(count):
    (ROOT / "batch").write_text("run\n" * BATCH)
    return ["xargs", "-a", f"{ROOT}/batch", "-P", str(count), "-I{}"]


def fill_properties(count):
    for number in range(count):
        (ROOT / f"properties/bench.{number}").touch()


def measure():
    tables = {"commands": {name: measure_command(*each) for name, each in COMMANDS.items()}}
    tables["parts"] = parts()
    run("setprop", PERMISSIVE, "true")
    run("setprop", "sim.fault", "huge")
    tables["reply_bytes"] = grow([16, 256, 4096, 65536, LARGEST_REPLY],
                                 lambda size: run("setprop", "sim.fault_arg", size))
    run("setprop", "sim.fault", "")
    tables["clients"] = grow([1, 2, 4, 8, 16, 32, 64], lambda count: None, with_clients, 3)
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
    """Hands gnuplot each table's times as a block with its name."""
    lines = [f"title = '{title}'"]
    for table, rows in tables.items():
        lines.append(f"${table} << EOD")
        for name, row in rows.items():
            times = [row[program].get(kind) for program in row for kind in TIMED]
            lines.append(" ".join(map(json.dumps, [name, *times])))
        lines.append("EOD")
    (BUILD / "results.gp").write_text("\n".join(lines) + "\n")
    run("gnuplot", "-e", f"set output '{PICTURE}'", BUILD / "results.gp",
        Path(__file__).with_name("picture.gp"))


def main():
    kind = "virtual machine" if " hypervisor" in Path("/proc/cpuinfo").read_text() else "machine"
    title = f"{time.strftime('%Y-%m-%d')}, {kind} with {os.cpu_count()} {os.uname().machine} cores"
    tables = measure()
    (BUILD / "results.json").write_text(json.dumps({"title": title, "tables": tables}, indent=1))
    print(title)
    print_tables(tables)
    draw(title, tables)


main()
