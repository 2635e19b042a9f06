"""Helpers for tests that use a virtual device"""
import contextlib
import json
import os
import pathlib
import signal
import socket
import subprocess
import time

SOURCE = pathlib.Path(__file__).resolve().parent.parent
LIMIT_S = 60  # for every wait; sanitizers on a busy machine are slow
SERVICE = "dev/vndbinder/service.corvaneinterfaceservice"
PERMISSIVE = "odm.thp.debug.selinux.permissive"

PASS = "captest idle_test: PASS\n"
NO_SERVICE = "0F_1F; failed to get binder service\n"
TIMEOUT = (
    "corvane_daemon binder server execute command return ERROR, "
    "may caused by processing timeout.\n"
)
RESTART = [("odm.thp.service_enable", "0"), ("odm.thp.service_enable", "1")]


def wait_until(condition):
    deadline = time.monotonic() + LIMIT_S
    while not condition():
        assert time.monotonic() < deadline, "timed out"
        time.sleep(0.02)


def free_port():
    with socket.create_server(("127.0.0.1", 0)) as server:
        return server.getsockname()[1]


class Device:
    """A virtual device in `directory`, and the programs of a build."""

    def __init__(self, directory, build, tool):
        self.root = directory / "device"
        self.tool = tool
        programs = f"{build}/device/bin", f"{build}/device"
        self.env = os.environ | {
            "HOME": str(directory),  # where adb writes its keys
            "PATH": ":".join([*programs, os.environ["PATH"]]),
            "TPD_BUILD_DIR": str(build),
            "TPD_DEVICE_ROOT": str(self.root),
        }

    def run(self, *command, **options):
        """Runs a program on the device until it exits. Decodes its output as Latin-1."""
        options = {"env": self.env, "encoding": "latin-1", "capture_output": True} | options
        return subprocess.run(command, check=False, timeout=LIMIT_S, **options)

    def output(self, *command, **options):
        done = self.run(*command, **options)
        assert done.returncode == 0, f"{command}: {done.returncode}, {done.stderr}"
        return done.stdout

    def start(self, **options):
        self.output("device", "start", **options)

    def tpd(self, *arguments, **options):
        return self.output(*self.tool, *arguments, **options)

    def shell(self, command, **options):
        return self.output("device", "shell", command, **options)

    def fault(self, text):
        self.output("device", "fault", *text.split())

    def answer(self, *arguments, **options):
        return self.output("device", "answer", *arguments, **options)

    def getprop(self, key):
        return self.output("getprop", key).removesuffix("\n")

    def setprop(self, key, value):
        self.output("setprop", key, value)

    def is_up(self):
        flags = self.getprop("odm.thp.dae_alive"), self.getprop("odm.thp.binder")
        return flags == ("true", "1")

    def restarts(self):
        return int(self.getprop("odm.thp.dae_reboot_times"))

    def events(self, what, who=""):
        """Returns the recorded events of one kind, from one program or from all."""
        lines = (self.root / "trace").read_text().splitlines()
        events = [json.loads(line) for line in lines]
        return [event for event in events if event["what"] == what and who in event["who"]]

    def written(self):
        """Returns the properties that the tool wrote, in order."""
        writes = self.events("property_write", who="tpd")
        return [(write["name"], write["new"]) for write in writes]

    def processes(self, program=""):
        """Returns the IDs of the device's processes that run the program."""
        if not self.root.exists():
            return []
        root = self.root.stat()
        known = f"TPD_DEVICE_PROCESS={root.st_dev}:{root.st_ino}".encode()
        found = []
        for process in pathlib.Path("/proc").glob("[0-9]*"):
            with contextlib.suppress(OSError):
                environment = (process / "environ").read_bytes().split(b"\0")
                if known in environment and os.readlink(process / "exe").endswith(program):
                    found.append(int(process.name))
        return found

    def kill(self, program, number=signal.SIGKILL):
        for process in self.processes(program):
            with contextlib.suppress(ProcessLookupError):
                os.kill(process, number)
