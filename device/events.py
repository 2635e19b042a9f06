"""Reads the log and the trace; platform/events.h describes their format"""
import json
import os

BEGIN = '{"time":'  # occurs only at the start of an event
LETTERS = dict(enumerate("VDIWEFS", 2))  # of the log's priorities


class EventReader:
    def __init__(self, file):
        self.file, self.first, self.position = file, b"", 0

    def read_new(self):
        """Yields the events appended since the last call; all if the file was cleared"""
        first = os.pread(self.file, len(BEGIN) + len("1700000000.123456"), 0)
        if first != self.first:
            self.first, self.position = first, 0
        end = os.fstat(self.file).st_size
        os.lseek(self.file, self.position, os.SEEK_SET)
        for line in open(self.file, encoding="latin-1", newline="\n", closefd=False):
            if self.position >= end or not line.endswith("\n"):
                return
            self.position += len(line)
            # An incomplete event, which a full disk truncated, may precede the last one.
            _, begin, event = line.rpartition(BEGIN)
            try:
                yield json.loads(begin + event)
            except json.JSONDecodeError:
                pass
