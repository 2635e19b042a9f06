#!/usr/bin/python3
"""logcat.py ROOT [OPTION...]: the device's logcat; ROOT is a file descriptor of the device root"""
import argparse
import os
import re
import select
import signal
import stat
import struct
import sys
import time

HEADER = struct.Struct("IiiII")  # LogEntryHeader in platform/log_file.h
BUFFERS = {"all", "crash", "default", "events", "kernel", "main", "radio", "system"}
PRIORITIES = dict(enumerate("VDIWEF", 2))
LEVELS = {letter: priority for priority, letter in PRIORITIES.items()} | {"S": 99}
FORMATS = {
    "brief": "{letter}/{tag:8}({pid:5}): ",
    "epoch": "{seconds:19}.{ms:03} {pid:5} {tid:5} {letter} {tag:8}: ",
    "raw": "",
    "tag": "{letter}/{tag:8}: ",
    "threadtime": "{when}.{ms:03} {pid:5} {tid:5} {letter} {tag:8}: ",
    "time": "{when}.{ms:03} {letter}/{tag:8}({pid:5}): ",
}
FOLLOW_PAUSE_MS = 50


def buffers(names):
    """Rejects an unknown buffer name; all buffers share one log, so the names have no effect"""
    if not BUFFERS.issuperset(names.split(",")):
        raise ValueError


def positive(text):
    if int(text) < 1:
        raise ValueError
    return int(text)


def pattern(text):
    try:
        return re.compile(os.fsencode(text).decode("latin-1"))
    except re.error as error:
        raise ValueError from error


def tag_filter(text):
    """Returns the tag of a filter TAG[:PRIORITY] and the lowest priority to show"""
    tag, _, letter = text.rpartition(":") if ":" in text else (text, ":", "V")
    if not tag or letter.upper() not in LEVELS:
        raise ValueError
    return tag, LEVELS[letter.upper()]


def parse(arguments):
    parser = argparse.ArgumentParser(prog="logcat", description="Prints the device's log.")
    parser.add_argument("-b", type=buffers, metavar="BUFFER,...", help="ignored: there is one log")
    parser.add_argument("-c", dest="clear", action="store_true", help="clear the log")
    parser.add_argument("-d", dest="dump", action="store_true", help="print the log and exit")
    parser.add_argument("-e", "--regex", type=pattern, help="show only matching texts")
    parser.add_argument("-f", dest="file", help="append the output to a file")
    parser.add_argument("--pid", type=positive, help="show only entries of this process")
    parser.add_argument("-s", dest="silent", action="store_true", help="same as the filter *:S")
    parser.add_argument("-t", dest="count", type=positive, help="show only the last entries")
    parser.add_argument("-v", dest="format", choices=FORMATS, default="threadtime")
    parser.add_argument(
        "filters",
        type=tag_filter,
        nargs="*",
        metavar="TAG[:PRIORITY]",
        help="lowest priority to show: V, D, I, W, E, F or S (none); * stands for all other tags",
    )
    return parser.parse_intermixed_args(arguments)


class Log:
    def __init__(self, root, flags):
        self.file = os.open("log", flags | os.O_NOFOLLOW | os.O_NONBLOCK, dir_fd=root)
        if not stat.S_ISREG(os.fstat(self.file).st_mode):
            sys.exit("logcat: the log is not a regular file")
        self.first, self.position = b"", 0

    def read_new(self):
        """Yields the complete entries written since the last call; all if the log was cleared"""
        first = os.pread(self.file, HEADER.size, 0)
        if first != self.first:
            self.first, self.position = first, 0
        unread = max(os.fstat(self.file).st_size - self.position, 0)
        left = memoryview(os.pread(self.file, unread, self.position))
        while len(left) >= HEADER.size:
            size, pid, tid, seconds, nanoseconds = HEADER.unpack_from(left)
            end = HEADER.size + size
            if size < 3 or end > len(left):
                break
            body = str(left[HEADER.size : end], "latin-1")
            tag, _, text = body[1:-1].partition("\0")
            yield {
                "letter": PRIORITIES.get(ord(body[0]), "?"),
                "ms": nanoseconds // 1000000,
                "pid": pid,
                "priority": ord(body[0]),
                "seconds": seconds,
                "tag": tag,
                "text": text,
                "tid": tid,
                "when": time.strftime("%m-%d %H:%M:%S", time.localtime(seconds)),
            }
            self.position += end
            left = left[end:]


def is_shown(entry, options):
    levels = {"*": LEVELS["S" if options.silent else "V"]} | dict(options.filters)
    return (
        entry["priority"] >= levels.get(entry["tag"], levels["*"])
        and options.pid in (None, entry["pid"])
        and (options.regex is None or options.regex.search(entry["text"]))
    )


def main():
    for number in signal.SIGINT, signal.SIGPIPE:
        signal.signal(number, signal.SIG_DFL)
    options = parse(sys.argv[2:])
    log = Log(int(sys.argv[1]), os.O_RDWR if options.clear else os.O_RDONLY)
    if options.clear:
        os.truncate(log.file, 0)
        return
    if options.file:
        sys.stdout = open(options.file, "a")
    sys.stdout.reconfigure(encoding="latin-1")
    closed = select.poll()  # ready when the reader closes the pipe
    closed.register(sys.stdout, 0)
    is_following = not options.dump and options.count is None
    while True:
        entries = [entry for entry in log.read_new() if is_shown(entry, options)]
        for entry in entries[-(options.count or 0) :]:
            header = FORMATS[options.format].format_map(entry)
            for line in entry["text"].removesuffix("\n").split("\n"):
                print(header + line)
        sys.stdout.flush()
        if not is_following or closed.poll(FOLLOW_PAUSE_MS):
            return


if __name__ == "__main__":
    try:
        main()
    except OSError as error:
        sys.exit(f"logcat: {error}")
