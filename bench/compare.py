#!/usr/bin/env python3
"""compare.py BUILD ROUNDS [PICTURE]: measures tpd and its baseline on a running virtual device

Prints the tables of docs/performance.md and draws its picture. Fails if the output or the system
calls of tpd and the baseline differ.
"""
import os
import re
import subprocess
import sys
import time
from itertools import zip_longest
from pathlib import Path
from statistics import median, quantiles

FORWARDED = "THP_ResetBaseline"
PERMISSIVE = "odm.thp.debug.selinux.permissive"
REPLIES = {
    "a reply of 64 KiB": 1 << 16,
    "a reply of 256 KiB": 1 << 18,
    "the largest reply": (1 << 20) - 2 * 4096 - 4,  # without the terminator and padding
}
RUNS = 25  # of each program in a round
PROCESSOR = 0  # index of the processor times


def run(*command, **options):
    """Runs the command and returns its output. Exits if the command fails."""
    done = subprocess.run(command, text=True, capture_output=True, check=False, **options)
    if done.returncode != 0:
        sys.exit(f"{command}: status {done.returncode}\n{done.stderr}")
    return done.stdout


def time_run(command, output):
    """Returns the processor and elapsed times in microseconds, including child processes."""
    flags = os.O_WRONLY | os.O_CREAT | os.O_TRUNC
    to_file = [(os.POSIX_SPAWN_OPEN, 1, output, flags, 0o600)]
    start = time.perf_counter()
    process = os.posix_spawn(command[0], command, os.environ, file_actions=to_file)
    _, status, usage = os.wait4(process, 0)
    elapsed = time.perf_counter() - start
    if status != 0:
        sys.exit(f"{command}: wait status {status}")
    return 1e6 * (usage.ru_utime + usage.ru_stime), 1e6 * elapsed


def trace_run(command, output):
    """Returns a list of the output and of the system calls after startup, with their results.

    Omits the calls for memory and process IDs.
    """
    filtered = "trace=!%memory,getpid,gettid,clone3,vfork,wait4"
    printed = run("strace", f"--output={output}", "-e", filtered, *command)
    calls = output.read_text()
    calls = calls[calls.index('"/dev/null"') :]
    return [printed] + re.findall(r"^(\w+)\(.*\) += (-?\d+)", calls, re.M)


class Bench:
    def __init__(self, build, rounds):
        self.build = build
        self.rounds = rounds
        self.output = Path(os.environ["TPD_DEVICE_ROOT"], "output")

    def measure(self, case, argument, name, value):
        """Prints a row of the first table.

        Sets the property `name` before each run. Returns {program: (processor times, elapsed
        times)}, with the median of each round.
        """
        commands = {
            "`/bin/true`": ["/bin/true"],
            "baseline": [f"{self.build}/bench/baseline", argument],
            "`tpd`": [f"{self.build}/tpd", argument],
        }

        def run_once(program, observe):
            run("setprop", name, value)
            return observe(commands[program], self.output)

        traces = [run_once(program, trace_run) for program in ("baseline", "`tpd`")]
        for baseline, tpd in zip_longest(*traces):
            if baseline != tpd:
                sys.exit(f"{case}: different calls: baseline {baseline!r:.999}, tpd {tpd!r:.999}")

        times = {program: ([], []) for program in commands}
        for _ in range(self.rounds):
            samples = [[run_once(program, time_run) for program in commands] for _ in range(RUNS)]
            for program, sample in zip(commands, zip(*samples)):
                for kind, values in zip(times[program], zip(*sample)):
                    kind.append(median(values))
        baseline, tpd = times["baseline"][PROCESSOR], times["`tpd`"][PROCESSOR]
        ratios = [ours / theirs for ours, theirs in zip(tpd, baseline)]
        print_row(case, *map(spread, [baseline, tpd, ratios]))
        return times


def spread(values):
    """Formats the median and the quartiles."""
    digits = ",.0f" if max(values) > 10 else ".2f"
    low, middle, high = [format(value, digits) for value in quartiles(values)]
    return f"{middle} ({low} to {high})"


def quartiles(values):
    return quantiles(values, method="inclusive")


def print_row(*cells):
    print(f"| {' | '.join(cells)} |", flush=True)


def print_heading(*cells):
    print()
    print_row(*cells)
    print("|---" * len(cells) + "|")


def draw(picture, title, replies):
    """Draws the processor times: a row of data has the size, then the quartiles of each program."""
    lines = [f"set output '{picture}'", f"set title '{title}'", "$replies << EOD"]
    for size, times in replies.items():
        figures = [q for name in ("baseline", "`tpd`") for q in quartiles(times[name][PROCESSOR])]
        lines.append(" ".join(map(str, [size, *figures])))
    lines += ["EOD", Path(__file__).with_name("picture.gp").read_text()]
    run("gnuplot", input="\n".join(lines))


def main():
    build, rounds, *picture = sys.argv[1:]
    title = f"{time.strftime('%Y-%m-%d')}, {os.cpu_count()} {os.uname().machine} processors, "
    title += f"{rounds} rounds of {RUNS} runs"
    print(title)
    bench = Bench(build, int(rounds))
    print_heading("processor time, µs", "baseline", "`tpd`", "ratio")
    forwarded = bench.measure("forwarded", FORWARDED, PERMISSIVE, "true")
    bench.measure("refused", FORWARDED, PERMISSIVE, "null")
    bench.measure("local (`debugRawEnable`)", "debugRawEnable", "thp.debug.raw", "false")
    replies = {len(FORWARDED + ": done"): forwarded}
    for case, size in REPLIES.items():
        run("device", "answer", FORWARDED, "-", input="#" * size)
        replies[size] = bench.measure(case, FORWARDED, PERMISSIVE, "true")
    print_heading("forwarded, µs", "processor time", "elapsed time")
    for program, times in forwarded.items():
        print_row(program, *map(spread, times))
    if picture:
        draw(*picture, title, replies)


if __name__ == "__main__":
    main()
