#!/usr/bin/python3 -I
"""adbd.py ROOT: the device's adb daemon; ROOT is a file descriptor of the device root

Speaks the adb protocol on a TCP port of this machine, and lets in its own user and root. Registers
with the device's own adb server and with the shared ones at the ports in persist.sim.adb_ports.
When its own server lists the device, stores its port in service.adb.tcp.port.
"""
import asyncio
import contextlib
import itertools
import os
import re
import signal
import socket
import stat
import struct
import sys
import tempfile
import termios
from subprocess import PIPE, STDOUT, Popen, run

ROOT = int(sys.argv[1])
DIRECTORY = os.path.dirname(os.path.abspath(__file__))  # in a build, that of the link
PORTS = range(5555, 5587, 2)  # where adb servers look for emulators
SERVER_SOCKET = f"/proc/self/fd/{ROOT}/adb.sock"
SERVER_PAUSE_S = 0.2
ESTABLISHED = "01"  # in /proc/net/tcp

# A message: command, two arguments, length of its data, unused, inverted command.
MESSAGE = struct.Struct("<4s5I")
VERSION = 0x01000001
MAX_DATA = 1 << 20  # in a message to this daemon
MIN_PEER_DATA, MAX_PEER_DATA = 1 << 12, 1 << 16  # in a message to the peer
MAX_STREAMS = 128  # of a connection
MAX_UNREAD = 2  # messages of a stream; adb does not wait to send the last

# A packet of the shell protocol: kind, length of its data.
PACKET = struct.Struct("<BI")
TO_STDIN, FROM_STDOUT, FROM_STDERR, EXIT, CLOSE_STDIN, WINDOW_SIZE = range(6)
MAX_WINDOW_SIZE = 64  # bytes

# The start of a request or reply of the file service: identifier, usually the length of its data.
SYNC = struct.Struct("<4sI")
MAX_PATH = 1024
MAX_CHUNK = 1 << 16  # of a file

tasks = set()  # keeps running tasks from being garbage-collected


def spawn(coroutine):
    task = asyncio.create_task(coroutine)
    tasks.add(task)
    task.add_done_callback(tasks.discard)
    return task


async def until_readable(file):
    loop, ready = asyncio.get_running_loop(), asyncio.Event()
    loop.add_reader(file, ready.set)
    try:
        await ready.wait()
    finally:
        loop.remove_reader(file)


async def until_writable(file):
    loop, ready = asyncio.get_running_loop(), asyncio.Event()
    loop.add_writer(file, ready.set)
    try:
        await ready.wait()
    finally:
        loop.remove_writer(file)


async def reap(process):
    """Waits for a process and returns its exit status as a shell does."""
    exited = os.pidfd_open(process.pid)
    try:
        await until_readable(exited)
    finally:
        os.close(exited)
    status = process.wait()
    return status if status >= 0 else 128 - status


def environment():
    """Names the device root by its path, because init does not inherit the descriptor."""
    return os.environ | {"TPD_DEVICE_ROOT": os.readlink(f"/proc/self/fd/{ROOT}")}


def output(*command):
    """Returns what a command of the device prints, without the final newline."""
    program = f"{DIRECTORY}/bin/{command[0]}"
    done = run([program, *command[1:]], env=environment(), stdout=PIPE, check=True)
    return done.stdout.removesuffix(b"\n")


class Stream:
    """A service in use. Data is sent after the receiver has acknowledged the previous data."""

    def __init__(self, connection, number, peer, service):
        self.connection, self.number, self.peer = connection, number, peer
        self.may_write = asyncio.BoundedSemaphore()
        self.received = asyncio.Queue()  # None at the end
        self.unread = b""
        self.task = spawn(self.serve(service))

    async def serve(self, service):
        try:
            with contextlib.suppress(OSError, EOFError):
                await self.connection.send(b"OKAY", self.number, self.peer)
                await service(self)
        finally:
            self.end()
            with contextlib.suppress(OSError):
                await self.connection.send(b"CLSE", self.number, self.peer)

    def end(self):
        """Forgets the stream. What it has received can still be read."""
        self.connection.streams.pop(self.number, None)
        self.received.put_nowait(None)

    def handle(self, command, data):
        if command == b"CLSE":
            self.close()
        elif command == b"OKAY":
            self.may_write.release()  # raises ValueError if nothing was sent
        elif self.received.qsize() < MAX_UNREAD:
            self.received.put_nowait(data)
        else:
            raise ValueError("too much data before an acknowledgement")

    def close(self):
        self.end()
        self.task.cancel()

    def room(self, header):
        """Returns how much a message can hold besides a header of the service."""
        return self.connection.max_data - header.size

    async def write(self, data):
        await self.may_write.acquire()
        await self.connection.send(b"WRTE", self.number, self.peer, data)

    async def read(self, size):
        """Returns at least one and at most `size` bytes. Raises EOFError at the end."""
        while not self.unread:
            data = await self.received.get()
            if data is None:
                self.received.put_nowait(None)
                raise EOFError
            self.unread = data
            with contextlib.suppress(OSError):
                await self.connection.send(b"OKAY", self.number, self.peer)
        data, self.unread = self.unread[:size], self.unread[size:]
        return data

    async def read_exactly(self, size):
        data = b""
        while len(data) < size:
            data += await self.read(size - len(data))
        return data


class Connection:
    """A connection from an adb server. A malformed message raises ValueError."""

    def __init__(self, reader, writer):
        self.reader, self.writer = reader, writer
        self.max_data = 0  # until the peer has said how much it takes
        self.numbers = itertools.count(1)
        self.streams = {}

    async def serve(self):
        try:
            while True:
                await self.handle(*await self.receive())
                await self.writer.drain()  # do not read from a peer that does not read
        finally:
            for stream in list(self.streams.values()):
                stream.close()
            self.writer.transport.abort()

    async def receive(self):
        header = await self.reader.readexactly(MESSAGE.size)
        command, arg0, arg1, length, _, magic = MESSAGE.unpack(header)
        if int.from_bytes(command, "little") ^ magic != 0xFFFFFFFF or length > MAX_DATA:
            raise ValueError("invalid header")
        return command, arg0, arg1, await self.reader.readexactly(length)

    async def send(self, command, arg0, arg1, data=b""):
        magic = int.from_bytes(command, "little") ^ 0xFFFFFFFF
        self.writer.write(MESSAGE.pack(command, arg0, arg1, len(data), 0, magic) + data)
        await self.writer.drain()

    async def handle(self, command, arg0, arg1, data):
        if command == b"CNXN" and arg1 >= MIN_PEER_DATA:
            self.max_data = min(arg1, MAX_PEER_DATA)
            await self.send(b"CNXN", VERSION, MAX_DATA, banner())
        elif command == b"OPEN" and arg0 != 0 and b"\0" in data and self.max_data != 0:
            await self.open(arg0, data.partition(b"\0")[0])
        elif command not in (b"OKAY", b"WRTE", b"CLSE"):
            raise ValueError("invalid message")
        elif arg1 in self.streams:  # else the stream has just been closed
            self.streams[arg1].handle(command, data)

    async def open(self, peer, name):
        service = find_service(name)
        if service is None or len(self.streams) == MAX_STREAMS:
            await self.send(b"CLSE", 0, peer)
            return
        number = next(self.numbers)
        self.streams[number] = Stream(self, number, peer, service)


def banner():
    names = "ro.product.name", "ro.product.model", "ro.product.device"
    product = b"".join(b"%s=%s;" % (name.encode(), output("getprop", name)) for name in names)
    return b"device::" + product + b"features=shell_v2,cmd"


def find_service(name):
    """Returns the function that serves a stream, or None for an unknown service."""
    kind, _, text = name.partition(b":")
    kind, *options = kind.split(b",")
    if kind == b"shell":
        return Shell(options, text).serve
    if kind == b"exec":
        return Shell([b"raw"], text).serve
    if name == b"reboot:":
        return Shell([b"raw"], b"reboot >/dev/null 2>&1").serve
    if name == b"sync:":
        return Sync().serve
    if name == b"root:":
        return lambda stream: stream.write(b"adbd is already running as root\n")
    if name == b"remount:":
        return lambda stream: stream.write(b"remount succeeded\n")
    return None


class Shell:
    """A command of the device's shell or, without a command, an interactive shell"""

    def __init__(self, options, command):
        self.arguments = [f"{DIRECTORY}/device", "shell", *([command] if command else [])]
        self.has_packets = b"v2" in options
        self.has_terminal = b"pty" in options or not (command or b"raw" in options)
        terms = [option[5:] for option in options if option.startswith(b"TERM=")]
        self.env = environment() | {"TERM": os.fsdecode(terms[0]) if terms else "dumb"}

    async def serve(self, stream):
        self.stream = stream
        process = self.start_on_terminal() if self.has_terminal else self.start_on_pipes()
        os.set_blocking(self.input.fileno(), False)
        exited = spawn(reap(process))
        feeder = spawn(self.feed())  # delivers what has been received even after the stream's end
        try:
            async with asyncio.TaskGroup() as group:
                for kind, file in self.outputs:
                    group.create_task(self.forward(kind, file))
            status = await asyncio.shield(exited)
            if self.has_packets:
                await stream.write(PACKET.pack(EXIT, 1) + bytes([status]))
        finally:
            if self.has_terminal:
                feeder.cancel()  # closes the terminal; its processes get SIGHUP

    def start_on_pipes(self):
        stderr = PIPE if self.has_packets else STDOUT
        options = {"stdin": PIPE, "stdout": PIPE, "stderr": stderr, "bufsize": 0, "env": self.env}
        process = Popen(self.arguments, start_new_session=True, **options)
        files = (FROM_STDOUT, process.stdout), (FROM_STDERR, process.stderr)
        self.input, self.outputs = process.stdin, [output for output in files if output[1]]
        return process

    def start_on_terminal(self):
        master, slave = os.openpty()
        self.input = open(master, "wb", 0)
        self.outputs = [(FROM_STDOUT, open(os.dup(master), "rb", 0))]
        arguments = ["/usr/bin/setsid", "--ctty", *self.arguments]
        with open(slave, "rb", 0) as file:
            return Popen(arguments, stdin=file, stdout=file, stderr=file, env=self.env)

    async def forward(self, kind, file):
        """Sends an output to the peer until end of file, which a terminal reports as an error."""
        with file, contextlib.suppress(OSError):
            while True:
                await until_readable(file)
                if not (data := os.read(file.fileno(), self.stream.room(PACKET))):
                    return
                header = PACKET.pack(kind, len(data)) if self.has_packets else b""
                await self.stream.write(header + data)

    async def feed(self):
        with self.input, contextlib.suppress(EOFError):
            while True:
                if self.has_packets:
                    await self.handle_packet()
                else:
                    await self.write(await self.stream.read(MAX_DATA))

    async def handle_packet(self):
        kind, length = PACKET.unpack(await self.stream.read_exactly(PACKET.size))
        if kind == TO_STDIN:
            while length > 0:
                data = await self.stream.read(length)
                length -= len(data)
                await self.write(data)
        elif kind == CLOSE_STDIN and length == 0:
            if not self.has_terminal:
                self.input.close()
        elif kind == WINDOW_SIZE and length <= MAX_WINDOW_SIZE:
            self.set_window_size(await self.stream.read_exactly(length))
        else:
            self.stream.close()
            raise EOFError

    def set_window_size(self, text):
        size = re.match(rb"(\d{1,4})x(\d{1,4}),", text)
        if size and self.has_terminal:
            termios.tcsetwinsize(self.input, (int(size[1]), int(size[2])))

    async def write(self, data):
        """Writes to the command's standard input, unless the command or the peer closed it."""
        with contextlib.suppress(OSError, ValueError):
            while data:
                await until_writable(self.input)
                data = data[os.write(self.input.fileno(), data) :]


class Sync:
    """The file service, for the files of this machine"""

    async def serve(self, stream):
        self.stream = stream
        handlers = {b"STAT": self.stat, b"LIST": self.list, b"SEND": self.send, b"RECV": self.recv}
        while True:
            name, length = SYNC.unpack(await stream.read_exactly(SYNC.size))
            if name not in handlers or length > MAX_PATH:
                return
            argument = os.fsdecode(await stream.read_exactly(length))
            try:
                await handlers[name](os.path.join("/", argument))
            except (OSError, ValueError) as error:
                reason = os.fsencode(getattr(error, "strerror", None) or str(error))
                await stream.write(SYNC.pack(b"FAIL", len(reason)) + reason)

    async def stat(self, path):
        await self.stream.write(b"STAT" + self.attributes(path))

    @staticmethod
    def attributes(path):
        """Returns mode, size and time; zeros for a missing file."""
        try:
            status = os.lstat(path)
        except (OSError, ValueError):
            return bytes(12)
        numbers = status.st_mode, status.st_size, int(status.st_mtime)
        return struct.pack("<3I", *(number % 2**32 for number in numbers))

    async def list(self, path):
        with contextlib.suppress(OSError):
            for name in map(os.fsencode, [".", "..", *os.listdir(path)]):
                attributes = self.attributes(os.path.join(os.fsencode(path), name))
                length = len(name).to_bytes(4, "little")
                await self.stream.write(b"DENT" + attributes + length + name)
        await self.stream.write(b"DONE" + bytes(16))

    async def recv(self, path):
        # Opening a FIFO must not block the daemon.
        with open(os.open(path, os.O_RDONLY | os.O_NONBLOCK | os.O_NOCTTY), "rb", 0) as file:
            while data := file.read(self.stream.room(SYNC)):
                await self.stream.write(SYNC.pack(b"DATA", len(data)) + data)
        await self.stream.write(SYNC.pack(b"DONE", 0))

    async def send(self, argument):
        path, _, mode = argument.rpartition(",")
        content = self.content()
        try:
            await self.store(path, int(mode), content)
        except (OSError, ValueError):
            async for _ in content:  # skip the rest, because the reply comes after it
                pass
            raise
        await self.stream.write(SYNC.pack(b"OKAY", 0))

    async def content(self):
        """Yields the content of a file, then sets its time."""
        while True:
            name, number = SYNC.unpack(await self.stream.read_exactly(SYNC.size))
            if name == b"DONE":
                self.time = number
                return
            if name != b"DATA" or number > MAX_CHUNK:
                raise EOFError
            yield await self.stream.read_exactly(number)

    async def store(self, path, mode, content):
        """Creates or replaces a file or a symbolic link when all of its content has arrived."""
        if os.path.exists(path) and not os.path.isfile(path):
            raise ValueError("not a regular file")
        os.makedirs(os.path.dirname(path), exist_ok=True)
        with tempfile.TemporaryDirectory(dir=os.path.dirname(path)) as directory:
            new = f"{directory}/new"
            if stat.S_ISLNK(mode):
                target = b""
                async for data in content:
                    target = (target + data)[:MAX_CHUNK]  # more than a link can hold
                os.symlink(target.rstrip(b"\0"), new)
            else:
                with open(new, "wb", 0) as file:
                    async for data in content:
                        file.write(data)
                os.chmod(new, mode & 0o777)
            os.utime(new, (self.time, self.time), follow_symlinks=False)
            os.replace(new, path)


def user_of(peer, own):
    """Returns the ID of the user at the other end of a TCP connection, or None if it is closed."""
    ends = [(*struct.unpack("=I", socket.inet_aton(host)), port) for host, port in (peer, own)]
    with open("/proc/net/tcp") as table:
        for row in map(str.split, table):
            if row[1:4] == ["%08X:%04X" % ends[0], "%08X:%04X" % ends[1], ESTABLISHED]:
                return int(row[7])
    return None


def is_allowed(writer):
    """Looks twice, because a connection that is closed during the first look seems to be root's."""
    ends = writer.get_extra_info("peername"), writer.get_extra_info("sockname")
    return all(user_of(*ends) in (0, os.getuid()) for _ in range(2))


async def serve(reader, writer):
    if not is_allowed(writer):
        writer.transport.abort()
        return
    with contextlib.suppress(OSError, EOFError, ValueError):
        await Connection(reader, writer).serve()


async def ask(server, request):
    """Returns the reply of the adb server at a port or, if it is None, of the device's own"""
    if server is None:
        connection = asyncio.open_unix_connection(SERVER_SOCKET)
    else:
        connection = asyncio.open_connection("127.0.0.1", server)
    reader, writer = await connection
    with contextlib.closing(writer):
        writer.write(f"{len(request):04x}{request}".encode())
        return await reader.read()


async def is_listed(server, port):
    """Returns whether the server lists the device. If not, asks it to connect to the device."""
    if b"emulator-%d\tdevice" % (port - 1) in await ask(server, "host:devices"):
        return True
    await ask(server, f"host:emulator:{port}")
    return False


async def keep_listed(port):
    """Keeps the device in the lists of the adb servers. SIGHUP announces another shared server."""
    reload = asyncio.Event()
    reload.set()
    asyncio.get_running_loop().add_signal_handler(signal.SIGHUP, reload.set)
    is_ready = False
    while True:
        if reload.is_set():
            reload.clear()
            servers = [None, *map(int, output("getprop", "persist.sim.adb_ports").split())]
        for server in servers:
            with contextlib.suppress(OSError):
                if await is_listed(server, port) and server is None and not is_ready:
                    output("setprop", "service.adb.tcp.port", str(port))
                    is_ready = True
        await asyncio.sleep(SERVER_PAUSE_S)


def listen():
    for port in PORTS:
        with contextlib.suppress(OSError):
            return socket.create_server(("127.0.0.1", port))
    sys.exit("adbd: all ports are in use")


async def main():
    os.chdir("/")
    listener = listen()
    listener.setsockopt(socket.IPPROTO_TCP, socket.TCP_NODELAY, 1)
    port = listener.getsockname()[1]
    server = await asyncio.start_server(serve, sock=listener, limit=MAX_DATA)
    spawn(keep_listed(port))
    await server.serve_forever()


if __name__ == "__main__":
    asyncio.run(main())
