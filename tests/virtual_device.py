"""What the tests do with a virtual device and with a service of their own in its daemon's place"""
import contextlib
import fcntl
import itertools
import json
import os
import pathlib
import shutil
import signal
import socket
import struct
import subprocess
import threading
import time

SOURCE = pathlib.Path(__file__).resolve().parent.parent
LIMIT_S = 60  # for anything that must end; a busy machine with sanitizers is slow
SERVICE = "dev/vndbinder/service.corvaneinterfaceservice"

PASS = "captest idle_test: PASS\n"
REFUSED = "please exe 'adb shell setenforce 0' in g_tpdCmd to disable selinux\n\n"
NO_SERVICE = "0F_1F; failed to get binder service\n"
TIMEOUT = (
    "corvane_daemon binder server execute command return ERROR, "
    "may caused by processing timeout.\n"
)
RESTART = [("odm.thp.service_enable", "0"), ("odm.thp.service_enable", "1")]
PERMISSIVE = "odm.thp.debug.selinux.permissive"


def wait_until(condition):
    deadline = time.monotonic() + LIMIT_S
    while not condition():
        assert time.monotonic() < deadline, "waited in vain"
        time.sleep(0.02)


class Device:
    """A device root of its own in `folder`, and the programs of a build that work on it."""

    def __init__(self, folder, build, tool):
        self.root = folder / "device"
        self.programs = folder / "bin"  # found before those of the device
        self.programs.mkdir()
        self.tool = tool
        path = f"{self.programs}:{build}/device/bin:{SOURCE}/scripts:{os.environ['PATH']}"
        self.env = os.environ | {
            "PATH": path,
            "TPD_BUILD_DIR": str(build),
            "TPD_DEVICE_ROOT": str(self.root),
            "TPD_GET_SERVICE_MS": "300",
        }

    def run(self, *command, **options):
        """Runs a program on the device to its end; bytes are characters of the same number."""
        options = {"env": self.env, "timeout": LIMIT_S, "encoding": "latin-1"} | options
        if "stdout" not in options:
            options["capture_output"] = True
        return subprocess.run(command, check=False, **options)

    def output(self, *command, **options):
        done = self.run(*command, **options)
        assert done.returncode == 0, f"{command}: {done.returncode}, {done.stderr}"
        return done.stdout

    def tpd(self, *arguments, **options):
        return self.output(*self.tool, *arguments, **options)

    def start(self):
        return self.output("device", "start")

    def stop(self):
        return self.output("device", "stop")

    def shell(self, command):
        return self.output("device", "shell", command)

    def getprop(self, key):
        return self.output("getprop", key).removesuffix("\n")

    def setprop(self, key, value):
        self.output("setprop", key, value)

    def is_up(self):
        keys = ("odm.thp.dae_alive", "odm.thp.binder")
        return [self.getprop(key) for key in keys] == ["true", "1"]

    def watch(self):
        """Has all processes of the device trace what they do from now on."""
        self.root.mkdir(mode=0o700, exist_ok=True)
        (self.root / "trace").write_text("")

    def events(self, what, who=None):
        lines = (self.root / "trace").read_text().splitlines()
        events = [json.loads(line) for line in lines]
        return [
            event
            for event in events
            if event["what"] == what and who in (None, event["who"])
        ]

    def written(self):
        """The properties that the tool wrote, in order."""
        events = self.events("property_write", who="tpd")
        return [(event["name"], event["new"]) for event in events]

    def daemon(self):
        return self.events("daemon_start")[-1]["daemon"]

    def restarts(self):
        return int(self.getprop("odm.thp.dae_reboot_times"))

    def init(self):
        """The process that holds the device; 0 for none."""
        query = struct.pack("hhqqi4x", fcntl.F_WRLCK, os.SEEK_SET, 0, 0, 0)
        with open(self.root / "init.lock", "r+b") as lock:
            answer = fcntl.fcntl(lock, fcntl.F_GETLK, query)
        kind, _, _, _, holder = struct.unpack("hhqqi4x", answer)
        return 0 if kind == fcntl.F_UNLCK else holder

    def processes(self):
        """All processes that know this device."""
        mark = f"TPD_DEVICE_ROOT={self.root}\0".encode()
        found = []
        for environment in pathlib.Path("/proc").glob("[0-9]*/environ"):
            with contextlib.suppress(OSError):
                if mark in environment.read_bytes() + b"\0":
                    found.append(int(environment.parent.name))
        return found


def reply(body=b"done\0\0\0\0", status=0, size=None):
    """A reply as it stands on a socket of the host's binder driver."""
    return struct.pack("<iI", status, len(body) if size is None else size) + body


class Service:
    """Takes the daemon's place: answers each call with the next of `replies`, then with the last.

    A reply is bytes; HANG keeps the client waiting, UNREAD hangs up before reading,
    GONE withdraws the service.
    """

    HANG, UNREAD, GONE = "hang", "unread", "gone"

    def __init__(self, device):
        self.path = device.root / SERVICE
        self.path.parent.mkdir(parents=True)
        self.listener = socket.socket(socket.AF_UNIX)

    def answer(self, *replies):
        self.listener.bind(str(self.path))
        self.listener.listen()
        threading.Thread(target=self._serve, args=[replies], daemon=True).start()

    def _serve(self, replies):
        for each in itertools.chain(replies, itertools.repeat(replies[-1])):
            with contextlib.suppress(OSError), self.listener.accept()[0] as client:
                if each == self.GONE:
                    self.path.unlink()
                    self.listener.close()
                    return
                if each != self.UNREAD:
                    self._receive(client)
                    client.recv(1) if each == self.HANG else client.sendall(each)

    @staticmethod
    def _receive(client):
        size = struct.unpack("<8xI", client.recv(12, socket.MSG_WAITALL))[0]
        client.recv(size, socket.MSG_WAITALL)
