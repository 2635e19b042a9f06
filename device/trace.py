#!/usr/bin/python3 -BEs
"""Runs the tool on the device and shows what the tool, the daemon and init did."""
import argparse
import contextlib
import fcntl
import json
import os
import re
import signal
import stat
import subprocess
import sys
import time

from events import LETTERS, EventReader

# The command that runs this script passes a file descriptor of the device root, and its own name.
ROOT, PROGRAM = int(sys.argv[1]), sys.argv[2]
TRACE = "trace"
ESCAPES = {ord("#"): "#35;", ord(";"): "#59;"}  # in Mermaid text
QUIET_S = 0.15  # The device is idle if no event has occurred for this time.
IDLE_TIMEOUT_S = 5
NAMES = {"tpd": "tool", "corvane_daemon": "daemon"}


# describe() computes `end`, `found`, `priority`, `size` and `way`; the other fields are recorded.
DESCRIPTIONS = {
    "property_read": 'reads {name}: "{value}"',
    "property_write": 'writes {name}: "{old}" -> "{new}", status {status}',
    "log": "logs {priority} {tag}: {text}",
    "pause": "pauses {us} us",
    "shell": "runs {command}: {end}",
    "lookup": "looks up {service}: {found} ({us} us)",
    "link_to_death": "links its death recipient: status {status}",
    "unlink_to_death": "unlinks its death recipient: status {status}",
    "binder_died": "is notified that the binder died",
    "call": "calls code {code}, {way}, flags {flags}, {size} bytes",
    "reply": "receives the reply: status {status}, {bytes} bytes ({us} us)",
    "publish": "publishes {service}",
    "command": 'receives {command}, parameters "{params}"',
    "fault": "applies the fault {name}",
    "recorded_answer": "uses the recorded answer to {command}",
    "answer": "answers: status {status}, {bytes} bytes",
    "service_start": "starts {service}, process {process}",
    "service_stop": "stops {service}, process {process}",
    "service_exit": "reaps {service}, process {process}: {end}",
    "restart_pause": "waits {ms} ms before it starts {service}",
}
ARROWS = {
    "call": "tool->>daemon",
    "reply": "daemon-->>tool",
    "service_start": "init->>daemon",
    "service_stop": "init-xdaemon",
    "service_exit": "daemon--xinit",
}


def shown(text):
    """Decodes and escapes a recorded text, in which each code point stands for a byte"""
    return escaped(text.rstrip("\n").encode("latin-1").decode("utf-8", "backslashreplace"))


def escaped(text):
    """Escapes unprintable characters"""
    return "".join(c if c.isprintable() else repr(c)[1:-1] for c in text)


def actor(event):
    return NAMES.get(event["who"], shown(event["who"]))


def describe(event):
    fields = {name: shown(str(value)) for name, value in event.items()}
    signaled, status = event.get("signal"), event.get("status", 0)
    if event["what"] == "shell":  # a wait status
        signaled, status = status & 0x7F, status >> 8
    fields["priority"] = LETTERS.get(event.get("priority"), "?")
    fields["end"] = f"signal {signaled}" if signaled else f"status {status}"
    fields["found"] = "found" if event.get("found") else "not found"
    fields["size"] = len(event.get("request", ""))
    fields["way"] = "one-way" if event.get("flags", 0) & 1 else "two-way"
    return DESCRIPTIONS.get(event["what"], event["what"]).format_map(fields).rstrip()


def hexdump(request):
    for at in range(0, len(request), 16):
        line = request[at : at + 16]
        text = "".join(c if " " <= c <= "~" else "." for c in line)
        print(f"{'':19}{at:08x}: {line.encode('latin-1').hex(' ', -2):39}  {text}")


@contextlib.contextmanager
def recording(root):
    """Turns tracing on. Locks the trace file before linking it to its final name."""
    temporary = f"{os.getpid()}.{TRACE}"
    directory = os.open("tmp", os.O_DIRECTORY | os.O_NOFOLLOW, dir_fd=root)
    trace = os.open(temporary, os.O_RDWR | os.O_CREAT | os.O_EXCL, 0o600, dir_fd=directory)
    fcntl.flock(trace, fcntl.LOCK_EX)
    try:
        os.link(temporary, TRACE, src_dir_fd=directory, dst_dir_fd=root)
    except FileExistsError:
        sys.exit(f"{PROGRAM}: another trace is running")
    finally:
        os.unlink(temporary, dir_fd=directory)
    try:
        yield trace
    finally:
        with contextlib.suppress(FileNotFoundError):
            os.unlink(TRACE, dir_fd=root)


def read_trace(trace):
    return sorted(EventReader(trace).read_new(), key=lambda event: event["time"])


def is_idle(events):
    """Returns true if no event is recent and no daemon is starting"""
    is_starting = False
    for event in events:
        if event["what"] == "publish":
            is_starting = False
        elif event.get("service") == "corvane_daemon":
            is_starting = event["what"] in ("restart_pause", "service_start")
    is_quiet = not events or time.time() - events[-1]["time"] > QUIET_S
    return is_quiet and not is_starting


def run_tool(arguments):
    """Returns the output of the tool"""
    try:
        for number in signal.SIGINT, signal.SIGTERM, signal.SIGHUP:
            signal.signal(number, signal.default_int_handler)
        tool = subprocess.run(["tpd", *arguments], stdout=subprocess.PIPE, check=False)
    except KeyboardInterrupt:
        return "(interrupted)\n"
    output = tool.stdout.decode(errors="backslashreplace")
    return output if tool.returncode >= 0 else f"{output}(signal {-tool.returncode})\n"


def wait_until_idle(trace):
    limit = time.monotonic() + IDLE_TIMEOUT_S
    with contextlib.suppress(KeyboardInterrupt):
        while not is_idle(read_trace(trace)) and time.monotonic() < limit:
            time.sleep(0.02)


def print_timeline(events, start, with_bytes):
    for event in events:
        print(f"{(event['time'] - start) * 1000:10.3f} {actor(event):>7} {describe(event)}")
        if with_bytes and event["what"] == "call":
            hexdump(event["request"])


def print_diagram(events):
    print("sequenceDiagram\n    participant tool\n    participant daemon\n    participant init")
    for event in events:
        who = re.sub(r"\W", "_", actor(event))
        arrow = ARROWS.get(event["what"], f"Note over {who}")
        print(f"    {arrow}: {describe(event).translate(ESCAPES)}")


def main():
    parser = argparse.ArgumentParser(prog=f"{PROGRAM} trace", allow_abbrev=False)
    parser.add_argument("--bytes", action="store_true", help="show the bytes of each request")
    form = parser.add_mutually_exclusive_group()
    form.add_argument("--json", action="store_true", help="print the events as recorded")
    form.add_argument("--mermaid", action="store_true", help="print a sequence diagram")
    parser.add_argument("arguments", nargs=argparse.REMAINDER, metavar="ARGUMENT")
    options = parser.parse_args(sys.argv[3:])
    if options.arguments[:1] == ["--"]:
        del options.arguments[0]
    sys.stdout.reconfigure(errors="backslashreplace")
    with recording(ROOT) as trace:
        start = time.time()
        result = run_tool(options.arguments)
        wait_until_idle(trace)
    for number in signal.SIGINT, signal.SIGTERM, signal.SIGHUP, signal.SIGPIPE:
        signal.signal(number, signal.SIG_DFL)
    events = read_trace(trace)
    if not os.fstat(trace).st_mode & stat.S_IWUSR:
        print(f"{PROGRAM}: events were lost; is the file system full?", file=sys.stderr)
    if options.json:
        print(*map(json.dumps, events), sep="\n")
    elif options.mermaid:
        print_diagram(events)
    else:
        print_timeline(events, start, options.bytes)
        print("result:", "\n".join(map(escaped, result.split("\n"))), end="")
    sys.stdout.flush()


if __name__ == "__main__":
    try:
        main()
    except OSError as error:
        print(f"{PROGRAM}: {error}", file=sys.stderr)
        os._exit(1)  # does not flush again
