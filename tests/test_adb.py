"""The device's adb daemon, driven by the program adb and by malformed messages"""
import concurrent.futures
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

from virtual_device import LIMIT_S, wait_until

DATA = os.urandom(3000000)


class Adbd:
    """The adb daemon of a running device, with its own adb server"""

    def __init__(self, device, build, home):
        self.device = device
        self.socket = f"{device.root}/adb.sock"
        device.setprop("persist.sys.adb.server", "1")
        self.env = device.env | {"ADB_SERVER_SOCKET": f"localfilesystem:{self.socket}"}
        self.env |= {"HOME": str(home), "PATH": os.environ["PATH"]}
        root = os.open(device.root, os.O_PATH)
        command = [f"{build}/device/adbd.py", str(root)]
        self.process = subprocess.Popen(command, env=self.env, pass_fds=[root])
        os.close(root)
        wait_until(self.has_server)
        self.run("wait-for-device")
        self.port = int(device.getprop("service.adb.tcp.port"))

    def has_server(self):
        with socket.socket(socket.AF_UNIX) as client:
            return client.connect_ex(self.socket) == 0

    def start(self, *arguments, **options):
        command = ["adb", *arguments]
        return subprocess.Popen(command, env=self.env, stdout=subprocess.PIPE, **options)

    def run(self, *arguments, **options):
        return self.device.run("adb", *arguments, env=self.env, **options)

    def shell(self, command):
        return self.run("shell", command).stdout

    def descriptors(self):
        return len(os.listdir(f"/proc/{self.process.pid}/fd"))


@pytest.fixture
def adbd(device, build, tmp_path):
    daemon = Adbd(device, build, tmp_path)
    yield daemon
    daemon.process.kill()
    daemon.process.wait()
    wait_until(lambda: not daemon.has_server())


def test_shell_keeps_streams_and_status_apart(adbd):
    done = adbd.run("shell", "cat; echo error >&2; exit 3", input="input")
    assert (done.returncode, done.stdout, done.stderr) == (3, "input", "error\n")
    done = adbd.run("exec-out", "echo error >&2")
    assert (done.stdout, done.stderr) == ("error\n", "")


def test_terminal_has_the_size_of_the_client(adbd):
    master, slave = pty.openpty()
    termios.tcsetwinsize(slave, (33, 77))
    wait = 'until [[ $(stty size) = "33 77" ]]; do sleep 0.1; done'
    done = adbd.run("shell", "-t", f"{wait}; test -t 0 && test -t 1 && exit 5", stdin=slave)
    assert done.returncode == 5
    os.close(master)
    os.close(slave)


@pytest.mark.parametrize("command", ["shell", "exec-in"])
def test_passes_on_large_data(adbd, tmp_path, command):
    adbd.run(command, f"cat >{tmp_path}/data", input=DATA, encoding=None)
    wait_until(lambda: (tmp_path / "data").read_bytes() == DATA)
    assert adbd.run("exec-out", f"cat {tmp_path}/data", encoding=None).stdout == DATA


def test_pushes_and_pulls_a_directory(adbd, tmp_path):
    (tmp_path / "from/inner").mkdir(parents=True)
    sent = tmp_path / "from/inner/file"
    sent.write_bytes(DATA)
    sent.chmod(0o640)
    os.utime(sent, (1, 1))
    assert adbd.run("push", tmp_path / "from", tmp_path / "pushed").returncode == 0
    status = (tmp_path / "pushed/inner/file").stat()
    assert (status.st_mode, status.st_mtime) == (0o100640, 1)
    assert adbd.run("pull", tmp_path / "pushed", tmp_path / "pulled").returncode == 0
    assert (tmp_path / "pulled/inner/file").read_bytes() == DATA


def test_refuses_to_replace_a_special_file(adbd, tmp_path):
    os.mkfifo(tmp_path / "fifo")
    done = adbd.run("push", __file__, tmp_path / "fifo")
    assert done.returncode == 1
    assert "not a regular file" in done.stdout


def test_serves_twenty_clients_at_once(adbd):
    commands = [f"sleep 0.2; echo {number}" for number in range(20)]
    with concurrent.futures.ThreadPoolExecutor(len(commands)) as pool:
        assert list(pool.map(adbd.shell, commands)) == [f"{number}\n" for number in range(20)]


@pytest.mark.parametrize("number", [signal.SIGTERM, signal.SIGKILL, signal.SIGINT])
def test_terminal_hangs_up_when_its_client_is_killed(adbd, number):
    is_sleeping = functools.partial(adbd.device.processes, "toybox")
    client = adbd.start("shell", "-tt", "sleep 600", stdin=subprocess.PIPE)
    wait_until(is_sleeping)
    client.send_signal(number)
    client.communicate(timeout=LIMIT_S)  # nobody else holds the pipe
    wait_until(lambda: not is_sleeping())


def message(command, arg0=1, arg1=1, data=b"", length=None, magic=0xFFFFFFFF):
    size = len(data) if length is None else length
    inverted = int.from_bytes(command, "little") ^ magic
    return struct.pack("<4s5I", command, arg0, arg1, size, 0, inverted) + data


CONNECT = message(b"CNXN", 0x01000001, 1 << 20, b"host::\0")
MALFORMED = [
    message(b"OPEN", data=b"shell:\0", magic=0),
    message(b"OPEN", data=b"shell:"),
    message(b"OPEN", arg0=0, data=b"shell:\0"),
    message(b"JUNK"),
    message(b"WRTE", length=(1 << 20) + 1),
    message(b"CNXN", 0x01000001, 0),
    message(b"OPEN", data=b"shell:cat\0") + message(b"OKAY"),
    message(b"OPEN", data=b"shell:sleep 600\0") + 9 * message(b"WRTE", data=DATA[: 1 << 20]),
]


def test_malformed_message_ends_only_its_connection(adbd):
    before = adbd.descriptors()
    for malformed in MALFORMED:
        with socket.create_connection(("127.0.0.1", adbd.port), LIMIT_S) as peer:
            peer.sendall(CONNECT)
            assert peer.recv(4) == b"CNXN"
            try:
                peer.sendall(malformed)
                while peer.recv(65536):
                    pass
            except ConnectionResetError:
                pass
    assert adbd.shell("echo still here") == "still here\n"
    adbd.device.kill("toybox")
    wait_until(lambda: adbd.descriptors() == before)


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
def test_refuses_other_users(adbd, user, is_allowed):
    command = [sys.executable, "-c", KNOCK, str(adbd.port), CONNECT.hex()]
    assert adbd.device.run(*command, user=user).returncode == is_allowed
