"""Fixtures: a virtual device, running or stopped

TPD_BUILD_DIR is the build to test. TPD_COMMAND overrides the command that runs the tool: for
example "qemu-aarch64-static build-arm64/tpd". TPD_SOAK adds the long tests. TPD_SEED repeats the
choices of a random test, which prints its seed when it fails.
"""
import fcntl
import os
import pathlib
import random
import shlex
import tempfile

import pytest

from virtual_device import PERMISSIVE, SOURCE, Device, wait_until


def pytest_collection_modifyitems(items):
    if not os.environ.get("TPD_SOAK"):
        items[:] = [item for item in items if not item.get_closest_marker("soak")]


@pytest.fixture(scope="session")
def build():
    return pathlib.Path(os.environ.get("TPD_BUILD_DIR", SOURCE / "build")).resolve()


@pytest.fixture
def chance():
    """Returns a random generator. A failing test prints its seed."""
    seed = int(os.environ.get("TPD_SEED", random.randrange(1 << 32)))
    print(f"TPD_SEED={seed}")
    return random.Random(seed)


@pytest.fixture
def stopped_device(build):
    """A device that has never been started. Its root does not exist yet."""
    tool = shlex.split(os.environ.get("TPD_COMMAND", f"{build}/tpd"))
    with tempfile.TemporaryDirectory(prefix="tpd-") as directory:
        device = Device(pathlib.Path(directory), build, tool)
        yield device
        device.output("device", "stop")
        wait_until(lambda: not device.processes())


@pytest.fixture
def device(stopped_device):
    """A running device that forwards commands, with tracing on."""
    stopped_device.output("device", "root")
    with open(stopped_device.root / "trace", "w") as trace:
        fcntl.flock(trace, fcntl.LOCK_EX)  # turns tracing on
        stopped_device.start()
        stopped_device.setprop(PERMISSIVE, "true")
        yield stopped_device
