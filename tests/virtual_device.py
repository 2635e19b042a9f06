"""What the tests do with a virtual device, and with a service in its daemon's place"""
import contextlib
import itertools
import json
import os
import pathlib
import socket
import struct
import subprocess
import threading
import time

SOURCE = pathlib.Path(__file__).resolve().parent.parent
LIMIT_S = 60  # for whatever must end: a busy machine with sanitizers is slow
SERVICE = "dev/vndbinder/service.corvaneinterfaceservice"
PERMISSIVE = "odm.thp.debug.selinux.permissive"

PASS = "captest idle_test: PASS\n"
REFUSED = "please exe 'adb shell setenforce 0' in g_tpdCmd to disable selinux\n\n"
NO_SERVICE = "0F_1F; failed to get binder service\n"
TIMEOUT = (
    "corvane_daemon binder server execute command return ERROR, "
    "may caused by processing timeout.\n"
)
RESTART = [("odm.thp.service_enable", "0"), ("odm.thp.service_enable", "1")]


def wait_until(condition):
    deadline = time.monotonic() + LIMIT_S
    while not condition():
        assert time.monotonic() < deadline, "waited in vain"
        time.sleep(0.02)


class Device:
    """A device root of its own in `folder`, and the programs of a build that work on it."""

    def __init__(self, folder, build, tool):
        self.root = folder / "device"
        self.tool = tool
        self.programs = folder / "bin"  # found before those of the device
        self.programs.mkdir()
        path = f"{self.programs}:{build}/device/bin:{build}/device:{os.environ['PATH']}"
        self.env = os.environ | {
            "PATH": path,
            "TPD_BUILD_DIR": str(build),
            "TPD_DEVICE_ROOT": str(self.root),
            "TPD_GET_SERVICE_MS": "300",
        }

    def run(self, *command, **options):
        """Runs a program on the device to its end. Each byte is read as one character."""
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

    def getprop(self, key):
        return self.output("getprop", key).removesuffix("\n")

    def setprop(self, key, value):
        self.output("setprop", key, value)

    def is_up(self):
        return (self.getprop("odm.thp.dae_alive"), self.getprop("odm.thp.binder")) == ("true", "1")

    def restarts(self):
        return int(self.getprop("odm.thp.dae_reboot_times"))

    def watch(self):
        """Has all processes of the device record from now on what they do."""
        self.root.mkdir(mode=0o700)
        (self.root / "trace").write_text("")

    def events(self, what, who=None):
        lines = (self.root / "trace").read_text().splitlines()
        events = [json.loads(line) for line in lines]
        return [each for each in events if each["what"] == what and who in (None, each["who"])]

    def written(self):
        """The properties that the tool wrote, in order."""
        return [(each["name"], each["new"]) for each in self.events("property_write", who="tpd")]

    def processes(self, program=""):
        """The processes that know this device and run the program."""
        known = f"TPD_DEVICE_ROOT={self.root}".encode()
        found = []
        for process in pathlib.Path("/proc").glob("[0-9]*"):
            with contextlib.suppress(OSError):
                if known in (process / "environ").read_bytes().split(b"\0"):
                    if os.readlink(process / "exe").endswith(program):
                        found.append(int(process.name))
        return found

    def kill(self, program):
        for process in self.processes(program):
            with contextlib.suppress(ProcessLookupError):
                os.kill(process, 9)


def reply(body=b"done\0\0\0\0", status=0, size=None):
    """A reply as it travels through a socket of the host's binder driver."""
    return struct.pack("<iI", status, len(body) if size is None else size) + body


class Service:
    """Answers each call with the next of some replies, then always with the last.

    A reply is bytes, or HANG: none comes, UNREAD: the request is not read, GONE: the service ends.
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
                    size = struct.unpack("<8xI", client.recv(12, socket.MSG_WAITALL))[0]
                    client.recv(size, socket.MSG_WAITALL)
                    client.recv(1) if each == self.HANG else client.sendall(each)
