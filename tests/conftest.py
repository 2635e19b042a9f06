"""Fixtures: a virtual device, running or stopped, and a scripted service in its daemon's place

TPD_BUILD_DIR names the build under test. --tpd, or TPD_COMMAND, names another tool to drive on its
device, for example "qemu-aarch64-static build-arm64/tpd". TPD_SOAK selects the long forms, too.
"""
import os
import pathlib
import shlex
import tempfile

import pytest

from virtual_device import PERMISSIVE, SOURCE, Device, Service, wait_until


def pytest_addoption(parser):
    parser.addoption("--tpd", default=os.environ.get("TPD_COMMAND"))


def pytest_collection_modifyitems(items):
    if not os.environ.get("TPD_SOAK"):
        items[:] = [item for item in items if not item.get_closest_marker("soak")]


@pytest.fixture(scope="session")
def build():
    return pathlib.Path(os.environ.get("TPD_BUILD_DIR") or SOURCE / "build").resolve()


@pytest.fixture
def stopped_device(build, request):
    """A device that was never started and has no root yet. Nothing of it is left behind."""
    tool = shlex.split(request.config.getoption("--tpd") or str(build / "tpd"))
    with tempfile.TemporaryDirectory(prefix="tpd-") as folder:
        device = Device(pathlib.Path(folder), build, tool)
        yield device
        device.output("device", "stop")
        wait_until(lambda: not device.processes())
        assert not list(device.root.glob("tmp/*"))


@pytest.fixture
def device(stopped_device):
    """A running device that is watched and lets commands through."""
    stopped_device.watch()
    stopped_device.output("device", "start")
    stopped_device.setprop(PERMISSIVE, "true")
    return stopped_device


@pytest.fixture
def service(stopped_device):
    """A service of a watched device that has neither init nor daemon."""
    stopped_device.watch()
    for key in (PERMISSIVE, "odm.thp.dae_alive", "odm.thp.binder", "odm.thp.service_enable"):
        stopped_device.setprop(key, "1")
    stopped_device.setprop("odm.thp.dae_reboot_times", "0")
    return Service(stopped_device)
