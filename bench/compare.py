#!/usr/bin/env python3
"""Measures tpd and its baseline, prints the tables of docs/performance.md and draws its picture.

The daemon must run without init, so that it survives `stop`.
Writes BUILD/results.json: nested objects by table, row, program and measure, each measure as
[lower quartile, median, upper quartile].
"""
import argparse
import json
import os
import re
import subprocess
import sys
import time
from pathlib import Path
from statistics import median, quantiles

PERMISSIVE = "odm.thp.debug.selinux.permissive"
FORWARDED = "THP_ResetBaseline"
# The argument of each command, and the property that is set before each run.
COMMANDS = {
    "forwarded": (FORWARDED, (PERMISSIVE, "true")),
    "refused": (FORWARDED, (PERMISSIVE, "null")),
    "stop": ("stop", ("odm.thp.service_enable", "1")),
}
KIB, MIB, GIB = 1 << 10, 1 << 20, 1 << 30
LARGEST_REPLY = MIB - 2 * 4096 - 4  # without the terminator and padding
REPLY_BYTES = [256, 4 * KIB, 64 * KIB, LARGEST_REPLY]
CLIENTS = [1, 2, 4, 8, 16, 32, 64]
LOG_BYTES = [MIB, 32 * MIB, GIB]
PROPERTIES = [1000, 10000, 100000]
STEPS = 1 + sum(map(len, [COMMANDS, REPLY_BYTES, CLIENTS, LOG_BYTES, PROPERTIES]))
BATCH = 128  # commands run by all clients together
COUNTS = 5  # runs that count instructions and system calls
TIMES = ["processor_us", "elapsed_us"]


def parse_options():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("build", type=Path, help="build directory")
    parser.add_argument("--picture", type=Path, required=True, help="SVG file to write")
    parser.add_argument("--rounds", type=int, default=30, help="rounds, at least 2 (default 30)")
    parser.add_argument("--runs", type=int, default=25, help="runs in a round (default 25)")
    options = parser.parse_args()
    if options.rounds < 2 or options.runs < 1:
        parser.error("--rounds must be at least 2 and --runs at least 1")
    return options


# Running programs


def run(command, **options):
    """Runs the command and returns its output. Exits if the command fails."""
    done = subprocess.run(command, text=True, capture_output=True, **options)
    if done.returncode != 0:
        sys.exit(f"{command}: status {done.returncode}\n{done.stderr}")
    return done.stdout


def set_property(name, value):
    run(["setprop", name, str(value)])


def time_run(command, output):
    """Returns the times and page faults of one run, including child processes."""
    flags = os.O_WRONLY | os.O_CREAT | os.O_TRUNC
    to_file = [(os.POSIX_SPAWN_OPEN, 1, output, flags, 0o600)]
    start = time.perf_counter()
    process = os.posix_spawn(command[0], command, os.environ, file_actions=to_file)
    _, status, usage = os.wait4(process, 0)
    elapsed = time.perf_counter() - start
    if status != 0:
        sys.exit(f"{command}: wait status {status}")
    return {
        "processor_us": 1e6 * (usage.ru_utime + usage.ru_stime),
        "elapsed_us": 1e6 * elapsed,
        "page_faults": usage.ru_minflt,
    }


def count_instructions(command):
    """Returns the user-mode instructions of the program, without child processes."""
    tool = ["valgrind", "--log-fd=1", "--tool=callgrind", "--callgrind-out-file=/dev/null"]
    return int(re.search(r"Collected : (\d+)", run([*tool, *command]))[1])


def count_system_calls(command, output):
    """Returns the number of system calls, including child processes."""
    run(["strace", f"--output={output}", "-c", "-f", "-U", "calls", *command])
    return int(output.read_text().split()[-2])


def list_system_calls(command, output):
    """Returns the calls and results after startup, except calls for memory and process IDs."""
    filtered = "trace=!%memory,getpid,gettid,clone3,vfork,wait4"
    run(["strace", f"--output={output}", "-e", filtered, *command])
    text = output.read_text()
    start = text.index('"/dev/null"')
    return re.findall(r"^(\w+)\(.*\) += (-?\d+)", text[start:], re.M)


# Statistics


def quartiles(values):
    """Returns the lower quartile, the median and the upper quartile."""
    return quantiles(values, method="inclusive")


def ratios(values, measure):
    """Returns the quartiles of the ratio of tpd to the baseline in each round."""
    pairs = zip(values["tpd"][measure], values["baseline"][measure])
    return quartiles([tpd / baseline for tpd, baseline in pairs])


def summarize(values, ratio_measures):
    """Turns {program: {measure: [value]}} into quartiles and adds the program "ratio"."""
    row = {
        program: {measure: quartiles(series) for measure, series in measures.items()}
        for program, measures in values.items()
    }
    if "baseline" in row:  # a filtered log call has no baseline
        row["ratio"] = {measure: ratios(values, measure) for measure in ratio_measures}
    return row


class Bench:
    """Measures all tables as {table: {row: {program: {measure: quartiles}}}}."""

    def __init__(self, options):
        self.build = options.build.resolve()
        self.rounds = options.rounds
        self.runs = options.runs
        self.root = Path(os.environ["TPD_DEVICE_ROOT"])
        self.output = self.root / "output"
        self.programs = {
            "true": "/bin/true",
            "shared": f"{self.build}/bench/baseline_shared",
            "baseline": f"{self.build}/bench/baseline",
            "tpd": f"{self.build}/tpd",
        }
        self.step = 0

    def show_progress(self, what):
        self.step += 1
        if sys.stderr.isatty():
            print(f"[{self.step}/{STEPS}] {what}", file=sys.stderr, flush=True)

    def write_property(self, name, value):
        """Like set_property, without a process that would disturb the caches before a timed run."""
        (self.root / "properties" / name).write_text(value)

    def measure_all(self):
        tables = {"parts": self.measure_parts()}
        tables["commands"] = self.measure_commands()
        set_property(PERMISSIVE, "true")
        tables["reply"] = self.measure_replies()
        tables["clients"] = self.measure_clients()
        tables["log"] = self.measure_logs()
        tables["properties"] = self.measure_properties()
        return tables

    # Timing: the programs take turns in each round.

    def time_rounds(self, commands, runs, prepare):
        """Returns {program: {measure: [median of each round]}}."""
        values = {program: {} for program in commands}
        for _ in range(self.rounds):
            for program, samples in self.time_round(commands, runs, prepare).items():
                for measure in samples[0]:
                    typical = median(sample[measure] for sample in samples)
                    values[program].setdefault(measure, []).append(typical)
        return values

    def time_round(self, commands, runs, prepare):
        samples = {program: [] for program in commands}
        for _ in range(runs):
            for program, command in commands.items():
                prepare()
                samples[program].append(time_run(command, self.output))
        return samples

    def time_forwarded(self, wrapper=(), runs=None):
        """Times the forwarded command of the baseline and of tpd."""
        commands = {
            program: [*wrapper, self.programs[program], FORWARDED]
            for program in ("baseline", "tpd")
        }
        return self.time_rounds(commands, runs or self.runs, lambda: None)

    # One function for each table

    def measure_parts(self):
        self.show_progress("parts")
        results = self.build / "parts.json"
        run(
            [
                *["taskset", "-c", "0", f"{self.build}/bench/parts"],
                "--benchmark_enable_random_interleaving=true",
                f"--benchmark_repetitions={self.rounds}",
                "--benchmark_min_time=0.02",
                f"--benchmark_out={results}",
            ],
            env={**os.environ, "TPD_DEVICE_ROOT": f"{self.root}-parts"},
        )
        values = {}
        for result in json.loads(results.read_text())["benchmarks"]:
            if result["run_type"] == "iteration":
                part, program, *size = result["run_name"].removesuffix("/process_time").split("/")
                row = values.setdefault(" ".join([part, *size]), {})
                row.setdefault(program, {"processor_ns": []})
                row[program]["processor_ns"].append(result["cpu_time"])
        return {part: summarize(row, ["processor_ns"]) for part, row in sorted(values.items())}

    def measure_commands(self):
        rows = {}
        for name, (argument, prepare) in COMMANDS.items():
            self.show_progress(f"commands: {name}")
            rows[name] = self.measure_command(argument, lambda: self.write_property(*prepare))
        return rows

    def measure_command(self, argument, prepare):
        commands = {program: [path, argument] for program, path in self.programs.items()}
        self.require_same_behaviour(commands, prepare)
        values = self.time_rounds(commands, self.runs, prepare)
        for program in "baseline", "tpd":
            values[program]["instructions"] = []
            values[program]["system_calls"] = []
            for _ in range(COUNTS):
                prepare()
                instructions = count_instructions(commands[program])
                prepare()
                system_calls = count_system_calls(commands[program], self.output)
                values[program]["instructions"].append(instructions)
                values[program]["system_calls"].append(system_calls)
        return summarize(values, TIMES)

    def require_same_behaviour(self, commands, prepare):
        """Exits if the output or the system calls of tpd and the baseline differ."""
        behaviour = {}
        for program in "baseline", "tpd":
            prepare()
            output = run(commands[program])
            prepare()
            calls = list_system_calls(commands[program], self.output)
            behaviour[program] = (output, calls)
        if behaviour["tpd"] != behaviour["baseline"]:
            sys.exit(f"the baseline behaves differently from tpd: {behaviour}")

    def measure_replies(self):
        rows = {}
        for size in REPLY_BYTES:
            self.show_progress(f"reply: {size} bytes")
            set_property("sim.fault", f"huge {size}")
            rows[size] = summarize(self.time_forwarded(), TIMES)
        set_property("sim.fault", "")
        return rows

    def measure_clients(self):
        """Divides the times of a batch by the number of its commands."""
        rows = {}
        batch = self.root / "batch"
        batch.write_text("run\n" * BATCH)
        for count in CLIENTS:
            self.show_progress(f"clients: {count}")
            xargs = ["/usr/bin/xargs", "-a", str(batch), "-P", str(count), "-I{}"]
            values = self.time_forwarded(xargs, runs=1)
            for measures in values.values():
                for measure, series in measures.items():
                    measures[measure] = [value / BATCH for value in series]
            rows[count] = summarize(values, TIMES)
        return rows

    def measure_logs(self):
        rows = {}
        for size in LOG_BYTES:
            self.show_progress(f"log: {size} bytes")
            os.truncate(self.root / "log", size)
            rows[size] = summarize(self.time_forwarded(), TIMES)
        os.truncate(self.root / "log", 0)
        return rows

    def measure_properties(self):
        rows = {}
        for count in PROPERTIES:
            self.show_progress(f"properties: {count}")
            for number in range(count):
                (self.root / f"properties/bench.{number}").touch()
            rows[count] = summarize(self.time_forwarded(), TIMES)
        return rows


# The tables of docs/performance.md, in the order of the page


def number(value):
    if value < 10:
        return f"{value:.2f}"
    return f"{value:,.0f}"


def spread(summary):
    """Formats the median, and the quartiles unless all three look the same."""
    low, middle, high = map(number, summary)
    return middle if low == high else f"{middle} ({low} to {high})"


def size(count):
    for unit, name in (GIB, "GiB"), (MIB, "MiB"), (KIB, "KiB"):
        if count >= unit:
            return f"{count // unit} {name}"
    return f"{count} bytes"


def print_table(heading, rows):
    print(f"\n| {' | '.join(heading)} |\n|{'---|' * len(heading)}")
    for cells in rows:
        print(f"| {' | '.join(cells)} |")


def time_cells(row):
    return [
        spread(row[program][measure])
        for measure in TIMES
        for program in ("baseline", "tpd", "ratio")
    ]


def print_tables(tables):
    commands = tables["commands"]
    print_times("command, µs", commands)
    print_programs(commands["forwarded"])
    print_counts(commands)
    print_times("forwarded, µs", {"as in the first table": commands["forwarded"], **cases(tables)})
    print_times("clients, µs a command", tables["clients"])
    print_parts(tables["parts"])


def print_times(what, rows):
    times = ["baseline, processor", "`tpd`", "ratio", "baseline, elapsed", "`tpd`", "ratio"]
    print_table([what, *times], [[str(name), *time_cells(row)] for name, row in rows.items()])


def print_programs(row):
    names = {
        "true": "`/bin/true`, shared C library",
        "shared": "baseline, shared C library",
        "baseline": "baseline",
        "tpd": "`tpd`",
    }
    rows = [
        [name, *(spread(row[program][measure]) for measure in TIMES)]
        for program, name in names.items()
    ]
    print_table(["program, µs", "processor time", "elapsed time"], rows)


def print_counts(commands):
    rows = []
    for name, row in commands.items():
        for measure in "instructions", "system_calls", "page_faults":
            cells = [spread(row[program][measure]) for program in ("baseline", "tpd")]
            rows.append([name, measure.replace("_", " "), *cells])
    print_table(["command", "count", "baseline", "`tpd`"], rows)


def print_parts(parts):
    rows = []
    for part, row in parts.items():
        cells = [f"`{part}`"]
        for program in "baseline", "tpd", "ratio":
            cells.append(spread(row[program]["processor_ns"]) if program in row else "")
        rows.append(cells)
    print_table(["part, ns", "baseline", "`tpd`", "ratio"], rows)


def cases(tables):
    """Returns the rows for forwarded commands, with the names that the page uses."""
    rows = {}
    for length, row in tables["reply"].items():
        largest = length == LARGEST_REPLY
        rows["the largest reply" if largest else f"a reply of {size(length)}"] = row
    for length, row in tables["log"].items():
        rows[f"a log of {size(length)}"] = row
    for count, row in tables["properties"].items():
        rows[f"{count:,} properties"] = row
    return rows


# The picture


def write_gnuplot_data(path, title, tables):
    """Writes each table as a data block: the row's name, then the quartiles of each program."""
    lines = [f"title = '{title}'"]
    for table, rows in tables.items():
        if table == "parts":
            continue
        lines.append(f"${table} << EOD")
        for name, row in rows.items():
            columns = [
                figure
                for program, measures in row.items()
                if program != "ratio"
                for figure in measures["processor_us"]
            ]
            lines.append(" ".join(map(json.dumps, [name, *columns])))
        lines.append("EOD")
    path.write_text("\n".join(lines) + "\n")


def draw(build, picture, title, tables):
    data = build / "results.gp"
    write_gnuplot_data(data, title, tables)
    script = Path(__file__).with_name("picture.gp")
    run(["gnuplot", "-e", f"set output '{picture}'", str(data), str(script)])


def describe_machine():
    hypervisor = " hypervisor" in Path("/proc/cpuinfo").read_text()
    kind = "virtual machine" if hypervisor else "machine"
    return f"{kind} with {os.cpu_count()} {os.uname().machine} cores"


def main():
    options = parse_options()
    rounds = f"{options.rounds} rounds of {options.runs} runs"
    title = f"{time.strftime('%Y-%m-%d')}, {describe_machine()}, {rounds}"
    tables = Bench(options).measure_all()
    results = {"title": title, "tables": tables}
    (options.build / "results.json").write_text(json.dumps(results, indent=1))
    print(title)
    print_tables(tables)
    draw(options.build, options.picture, title, tables)


if __name__ == "__main__":
    main()
