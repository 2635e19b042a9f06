"""The device's adb daemon, driven by the program adb and by malformed messages"""
import concurrent.futures
import contextlib
import functools
import os
import pty
import signal
import socket
import struct
import subprocess
import sys
import termios

import pytest

from virtual_device import LIMIT_S, Device, free_port, wait_until

DATA = os.urandom(3000000)


class Adb:
    """The program adb with the environment that `device adb` asks for"""

    def __init__(self, device):
        self.device = device
        variables = device.output("bash", "-c", 'eval "$(device adb)"; env -0').split("\0")
        self.env = dict(variable.split("=", 1) for variable in variables if variable)

    def start(self, *arguments, **options):
        command = ["adb", *arguments]
        return subprocess.Popen(command, env=self.env, stdout=subprocess.PIPE, **options)

    def run(self, *arguments, **options):
        return self.device.run("adb", *arguments, env=self.env, **options)

    def shell(self, command):
        return self.run("shell", command).stdout

    def port(self):
        return int(self.device.getprop("service.adb.tcp.port"))

    def descriptors(self):
        (adbd,) = self.device.processes("python3.11")
        return len(os.listdir(f"/proc/{adbd}/fd"))


@pytest.fixture
def adb(device):
    return Adb(device)


def test_shell_keeps_streams_and_status_apart(adb):
    done = adb.run("shell", "cat; echo error >&2; exit 3", input="input")
    assert (done.returncode, done.stdout, done.stderr) == (3, "input", "error\n")
    done = adb.run("exec-out", "echo error >&2")
    assert (done.stdout, done.stderr) == ("error\n", "")


def test_terminal_has_the_size_of_the_client(adb):
    master, slave = pty.openpty()
    termios.tcsetwinsize(slave, (33, 77))
    wait = 'until [[ $(stty size) = "33 77" ]]; do sleep 0.1; done'
    done = adb.run("shell", "-t", f"{wait}; test -t 0 && test -t 1 && exit 5", stdin=slave)
    assert done.returncode == 5
    os.close(master)
    os.close(slave)


@pytest.mark.parametrize("command", ["shell", "exec-in"])
def test_passes_on_large_data(adb, tmp_path, command):
    adb.run(command, f"cat >{tmp_path}/data", input=DATA, encoding=None)
    wait_until(lambda: (tmp_path / "data").read_bytes() == DATA)
    assert adb.run("exec-out", f"cat {tmp_path}/data", encoding=None).stdout == DATA


def test_pushes_and_pulls_a_directory(adb, tmp_path):
    (tmp_path / "from/inner").mkdir(parents=True)
    sent = tmp_path / "from/inner/file"
    sent.write_bytes(DATA)
    sent.chmod(0o640)
    os.utime(sent, (1, 1))
    assert adb.run("push", tmp_path / "from", tmp_path / "pushed").returncode == 0
    status = (tmp_path / "pushed/inner/file").stat()
    assert (status.st_mode, status.st_mtime) == (0o100640, 1)
    assert adb.run("pull", tmp_path / "pushed", tmp_path / "pulled").returncode == 0
    assert (tmp_path / "pulled/inner/file").read_bytes() == DATA


def test_refuses_to_replace_a_special_file(adb, tmp_path):
    os.mkfifo(tmp_path / "fifo")
    done = adb.run("push", __file__, tmp_path / "fifo")
    assert done.returncode == 1
    assert "not a regular file" in done.stdout


def test_serves_twenty_clients_at_once(adb):
    commands = [f"sleep 0.2; echo {number}" for number in range(20)]
    with concurrent.futures.ThreadPoolExecutor(len(commands)) as pool:
        assert list(pool.map(adb.shell, commands)) == [f"{number}\n" for number in range(20)]


@pytest.mark.parametrize("number", [signal.SIGTERM, signal.SIGKILL, signal.SIGINT])
def test_terminal_hangs_up_when_its_client_is_killed(adb, number):
    is_sleeping = functools.partial(adb.device.processes, "toybox")
    client = adb.start("shell", "-tt", "sleep 600", stdin=subprocess.PIPE)
    wait_until(is_sleeping)
    client.send_signal(number)
    client.communicate(timeout=LIMIT_S)  # nobody else holds the pipe
    wait_until(lambda: not is_sleeping())


def message(command, arg0=1, arg1=1, data=b"", length=None, magic=0xFFFFFFFF):
    size = len(data) if length is None else length
    inverted = int.from_bytes(command, "little") ^ magic
    return struct.pack("<4s5I", command, arg0, arg1, size, 0, inverted) + data


CONNECT = message(b"CNXN", 0x01000001, 1 << 20, b"host::\0")
CAT = message(b"OPEN", data=b"exec:cat\0")
MALFORMED = [
    message(b"OPEN", data=b"exec:cat\0", magic=0),
    message(b"OPEN", data=b"exec:cat"),
    message(b"OPEN", arg0=0, data=b"exec:cat\0"),
    message(b"JUNK"),
    message(b"WRTE", length=(1 << 20) + 1),
    message(b"CNXN", 0x01000001, 0),
    message(b"OKAY"),
    9 * message(b"WRTE", data=DATA[: 1 << 20]),
]


def test_malformed_message_ends_only_its_connection(adb):
    before = adb.descriptors()
    for malformed in MALFORMED:
        with socket.create_connection(("127.0.0.1", adb.port()), LIMIT_S) as peer:
            peer.sendall(CONNECT + CAT)
            received = b""
            while b"OKAY" not in received:
                received += peer.recv(4096)
            with contextlib.suppress(ConnectionError):
                peer.sendall(malformed)
                while peer.recv(65536):
                    pass
    assert adb.shell("echo still here") == "still here\n"
    wait_until(lambda: adb.descriptors() <= before)


KNOCK = """
import socket, sys
peer = socket.create_connection(("127.0.0.1", int(sys.argv[1])))
try:
    peer.sendall(bytes.fromhex(sys.argv[2]))
    sys.exit(peer.recv(4) == b"CNXN")
except ConnectionError:
    pass
"""


@pytest.mark.skipif(os.getuid() != 0, reason="only root can act as another user")
@pytest.mark.parametrize("user, is_allowed", [(0, True), (65534, False)])
def test_refuses_other_users(adb, user, is_allowed):
    command = [sys.executable, "-c", KNOCK, str(adb.port()), CONNECT.hex()]
    assert adb.device.run(*command, user=user).returncode == is_allowed


def test_device_is_listed_until_it_is_stopped(adb):
    adb.run("reboot")
    adb.run("wait-for-device")
    wait_until(lambda: adb.shell("getprop sys.boot_completed") == "1\n")
    adb.device.output("device", "stop")
    with socket.socket(socket.AF_UNIX) as client:
        wait_until(lambda: client.connect_ex(f"{adb.device.root}/adb.sock") != 0)


def test_shared_server_lists_two_devices(device, build, tmp_path, request):
    second = Device(tmp_path, build, device.tool)
    second.start()
    request.addfinalizer(lambda: second.output("device", "stop"))
    settings = {"ANDROID_ADB_SERVER_PORT": str(free_port())}
    shared = [
        each.output("device", "adb", "--shared", env=each.env | settings)
        for each in (device, second)
    ]
    listed = device.output("adb", "devices", env=device.env | settings).splitlines()[1:-1]
    assert {f"{serial.strip()}\tdevice" for serial in shared} <= set(listed)
    device.output("adb", "kill-server", env=device.env | settings)
