#!/usr/bin/python3 -BEs
"""logcat.py ROOT [OPTION...]: the device's logcat; ROOT is a file descriptor of the device root"""
import argparse
import collections
import datetime
import os
import re
import select
import signal
import stat
import struct
import sys
import time

from events import LETTERS, EventReader

LEVELS = {letter: priority for priority, letter in LETTERS.items()} | {"S": 99}
# With -B: the size of what follows, the header's size, process, thread, time, buffer and user.
BINARY_HEADER = struct.Struct("<HHiIIIII")
FORMATS = {
    "brief": "{letter}/{tag:8}({pid:5}): ",
    "epoch": "{seconds:19}.{ms:03} {pid:5} {tid:5} {letter} {tag:8}: ",
    "long": "[ {when}.{ms:03} {pid:5}:{tid:5} {letter}/{tag:8} ]",
    "raw": "",
    "tag": "{letter}/{tag:8}: ",
    "threadtime": "{when}.{ms:03} {pid:5} {tid:5} {letter} {tag:8}: ",
    "time": "{when}.{ms:03} {letter}/{tag:8}({pid:5}): ",
}
FOLLOW_PAUSE_MS = 50


def start(text):
    """Returns the number of entries or None, and the time of the first one in seconds or 0"""
    if text.isdecimal():
        return min(int(text), sys.maxsize), 0
    if re.fullmatch(r"\d+\.\d+", text):
        return None, float(text)
    date = text if text.count("-") == 2 else f"{time.localtime().tm_year}-{text}"
    return None, datetime.datetime.strptime(date, "%Y-%m-%d %H:%M:%S.%f").timestamp()


def pattern(text):
    try:
        return re.compile(text)
    except re.error as error:
        raise ValueError from error


def tag_filter(text):
    """Returns the tag of a filter TAG[:PRIORITY] and the lowest priority to show"""
    tag, _, letter = text.rpartition(":") if ":" in text else (text, ":", "V")
    if not tag or letter.upper() not in LEVELS:
        raise ValueError
    return tag, LEVELS[letter.upper()]


def parse(arguments):
    description = "Prints the log. TIME is [YYYY-]MM-DD hh:mm:ss.mmm or sssss.mmm (in seconds)."
    parser = argparse.ArgumentParser(prog="logcat", description=description)
    parser.add_argument("-B", dest="binary", action="store_true", help="print binary entries")
    parser.add_argument("-b", metavar="BUFFER,...", help="ignored: there is one log")
    parser.add_argument("-c", dest="clear", action="store_true", help="clear the log")
    parser.add_argument("-d", dest="dump", action="store_true", help="print the log and exit")
    parser.add_argument("-e", "--regex", type=pattern, help="show only matching texts")
    parser.add_argument("-f", dest="file", help="append the output to a file")
    parser.add_argument("--pid", type=int, help="show only entries of this process")
    parser.add_argument("-s", dest="silent", action="store_true", help="same as the filter *:S")
    parser.add_argument("-T", type=start, metavar="COUNT|TIME", help="same as -t, then follow")
    parser.add_argument("-t", type=start, metavar="COUNT|TIME", help="show only the last entries")
    parser.add_argument("-v", dest="format", choices=FORMATS, default="threadtime")
    parser.add_argument(
        "filters",
        type=tag_filter,
        nargs="*",
        metavar="TAG[:PRIORITY]",
        help="lowest priority to show: V, D, I, W, E, F or S (none); * stands for all other tags",
    )
    options = parser.parse_intermixed_args(arguments)
    options.dump |= options.t is not None
    options.count, options.since = options.t or options.T or (None, 0)
    options.levels = {"*": LEVELS["S" if options.silent else "V"]} | dict(options.filters)
    return options


def open_log(root, flags):
    log = os.open("log", flags | os.O_NOFOLLOW | os.O_NONBLOCK, dir_fd=root)
    if not stat.S_ISREG(os.fstat(log).st_mode):
        sys.exit("logcat: the log is not a regular file")
    return log


def is_shown(entry, options):
    return (
        entry["priority"] >= options.levels.get(entry["tag"], options.levels["*"])
        and entry["time"] >= options.since
        and options.pid in (None, entry["pid"])
        and (options.regex is None or options.regex.search(entry["text"]))
    )


def formatted(entry, options):
    """Returns what to print, in which each character stands for a byte"""
    priority, tag, text = entry["priority"], entry["tag"], entry["text"]
    seconds, us = divmod(round(entry["time"] * 1000000), 1000000)
    if options.binary:
        payload = f"{chr(priority)}{tag}\0{text}\0"
        sizes = len(payload), BINARY_HEADER.size
        owner = entry["pid"], entry["tid"], seconds, us * 1000, 0, os.getuid()
        return str(BINARY_HEADER.pack(*sizes, *owner), "latin-1") + payload
    when = time.strftime("%m-%d %H:%M:%S", time.localtime(seconds))
    fields = {"letter": LETTERS.get(priority, "?"), "ms": us // 1000, "seconds": seconds}
    header = FORMATS[options.format].format_map(entry | fields | {"when": when})
    text = text.removesuffix("\n")
    if options.format == "long":
        return f"{header}\n{text}\n\n"
    return "".join(f"{header}{line}\n" for line in text.split("\n"))


def main():
    for number in signal.SIGINT, signal.SIGPIPE:
        signal.signal(number, signal.SIG_DFL)
    # The log contains bytes, which Latin-1 maps to characters.
    options = parse([os.fsencode(argument).decode("latin-1") for argument in sys.argv[2:]])
    log = open_log(int(sys.argv[1]), os.O_RDWR if options.clear else os.O_RDONLY)
    if options.clear:
        os.truncate(log, 0)
        return
    if options.file:
        sys.stdout = open(options.file.encode("latin-1"), "a")
    sys.stdout.reconfigure(encoding="latin-1")
    closed = select.poll()  # ready when the reader closes the pipe
    closed.register(sys.stdout, 0)
    reader, count = EventReader(log), options.count
    while True:
        entries = (entry for entry in reader.read_new() if is_shown(entry, options))
        if count is not None:
            entries, count = collections.deque(entries, maxlen=count), None
        for entry in entries:
            sys.stdout.write(formatted(entry, options))
        sys.stdout.flush()
        is_deleted = os.fstat(log).st_nlink == 0
        if options.dump or is_deleted or closed.poll(FOLLOW_PAUSE_MS):
            return


if __name__ == "__main__":
    try:
        main()
    except OSError as error:
        print(f"logcat: {error}", file=sys.stderr)
        os._exit(1)  # does not flush again
