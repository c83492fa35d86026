"""Fixtures of the integration tests. They run in a sandbox of their own and refuse to run without one: every
program that a test starts sees a HOME, a runtime folder and a message bus that were made for this test."""

import os
import sys
import threading

import pytest

sys.path.insert(0, os.path.dirname(__file__))

from gi.repository import GLib  # noqa: E402

from harness.server import WireServer  # noqa: E402
from harness.standin import Standin  # noqa: E402
from harness.world import World  # noqa: E402


def pytest_addoption(parser):
    parser.addoption("--build-dir", default=os.environ.get("RVD_BUILD_DIR"), help="where rvd was built")


class Programs:
    """The programs under test, from one build."""

    def __init__(self, build_dir):
        self.build_dir = os.path.abspath(build_dir)
        self.rvd = self._built("daemon/rvd")
        self.rvctl = self._built("cli/rvctl")
        self.standin = self._built("standin-server/rvd-standin")
        self.plugin_dir = self._built("plugins")

    def _built(self, name):
        path = os.path.join(self.build_dir, name)
        if not os.path.exists(path):
            pytest.exit(f"{path} has not been built", 2)
        return path


def pytest_configure(config):
    # Nothing in this process may reach the user's own session by accident.
    for name in ("DBUS_SESSION_BUS_ADDRESS", "DBUS_STARTER_ADDRESS", "DISPLAY", "WAYLAND_DISPLAY"):
        os.environ.pop(name, None)
    if not config.getoption("--build-dir"):
        pytest.exit("give the build to test with --build-dir or RVD_BUILD_DIR", 2)


@pytest.fixture(scope="session")
def programs(request):
    return Programs(request.config.getoption("--build-dir"))


@pytest.fixture(scope="session", autouse=True)
def main_loop():
    """Delivers signals and calls to agents, on a thread of its own."""
    loop = GLib.MainLoop()
    thread = threading.Thread(target=loop.run, daemon=True)
    thread.start()
    yield
    loop.quit()
    thread.join()


@pytest.fixture
def bare_world(programs):
    """A world in which nothing runs yet."""
    world = World(programs)
    try:
        yield world
    finally:
        world.dispose()


@pytest.fixture
def standin(bare_world):
    """The stand-in server, well-behaved."""
    return bare_world.keep(Standin(bare_world))


@pytest.fixture
def world(bare_world, standin):
    """A private bus, the stand-in server and an rvd that uses it, with no account yet."""
    bare_world.start_bus()
    bare_world.configure(standin.url)
    bare_world.start_daemon()
    return bare_world


@pytest.fixture
def wire(bare_world):
    """A server that does and remembers what the test tells it."""
    return bare_world.keep(WireServer())


@pytest.fixture
def wired_world(bare_world, wire):
    """As world, with the server that the test commands."""
    bare_world.start_bus()
    bare_world.configure(wire.url)
    bare_world.start_daemon()
    return bare_world


@pytest.hookimpl(hookwrapper=True)
def pytest_runtest_makereport(item, call):
    report = (yield).get_result()
    world = getattr(item, "funcargs", {}).get("bare_world")
    if world is not None and report.failed:
        report.sections.append(("what rvd printed", world.logs()))
