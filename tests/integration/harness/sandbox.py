"""Programs that are started as other programs are: in sandboxes, behind proxies, in namespaces of their own."""

import functools
import json
import os
import subprocess
import threading
from concurrent.futures import Future

import pytest

from harness import DEADLINE
from harness.application import Application
from harness.bus import NAME, PATH, BusError

CALLER = os.path.join(os.path.dirname(os.path.abspath(__file__)), "caller.py")
PYTHON = "/usr/bin/python3"

# Without what root can do beside being a user; for one who is not root it is nothing.
ORDINARY = ["setpriv", "--bounding-set=-all", "--inh-caps=-all", "--"] if os.geteuid() == 0 else []


@functools.cache
def user_namespaces():
    return subprocess.run(["unshare", "-Urm", "true"], stderr=subprocess.DEVNULL, check=False).returncode == 0


def need_user_namespaces():
    if not user_namespaces():
        pytest.skip("the system gives no user namespaces")


class CallingProgram:
    """The connection of a program of its own (harness/caller.py); as harness.bus.Connection where it is used."""

    def __init__(self, world, wrapper=(), options=(), user=None, address=None, pass_fds=()):
        environment = dict(world.environment)
        if address is not None:
            environment["DBUS_SESSION_BUS_ADDRESS"] = address
        self.process = world.start(
            [*wrapper, PYTHON, "-B", CALLER, *options],
            stdin=subprocess.PIPE,
            user=user,
            environment=environment,
            pass_fds=pass_fds,
        )
        self._pending = {0: Future()}
        self._count = 0
        self._lock = threading.Lock()
        threading.Thread(target=self._read, daemon=True).start()
        self.name = self._pending[0].result(DEADLINE)["name"]

    def _read(self):
        position = 0
        while True:
            try:
                line = self.process.stdout.wait_for(r"^(\{.*\})$\n", position)
            except AssertionError as error:
                if self.process.running:
                    continue
                with self._lock:
                    for future in self._pending.values():
                        if not future.done():
                            future.set_exception(error)
                return
            position = line.end()
            answer = json.loads(line.group(1))
            future = self._pending[answer["number"]]
            if "error" in answer:
                future.set_exception(BusError(answer["error"], answer["message"]))
            else:
                future.set_result(answer)

    def send(self, interface, method, parameters=None, destination=NAME, path=PATH):
        with self._lock:
            self._count += 1
            number = self._count
            self._pending[number] = Future()
            text = parameters.print_(True) if parameters is not None else None
            line = json.dumps([number, destination, path, interface, method, text]) + "\n"
            self.process.popen.stdin.write(line.encode())
            self.process.popen.stdin.flush()
        result = Future()
        self._pending[number].add_done_callback(
            lambda answered: result.set_exception(answered.exception())
            if answered.exception()
            else result.set_result(tuple(answered.result()["values"]))
        )
        return result

    def call(self, interface, method, parameters=None, **where):
        values = self.send(interface, method, parameters, **where).result(DEADLINE)
        return values[0] if len(values) == 1 else values or None

    def signals(self, interface, member):
        """Begins to listen: a function that waits for the first ones and returns what has come by then."""
        self.call(interface, member, path="listen")
        return lambda: self.call(interface, member, path="heard")

    def close(self):
        self.process.dispose()


def bwrap(world, marker=None):
    """The command that starts a program in a sandbox which sees little more than the system's programs.
    marker: the text of its /.flatpak-info."""
    need_user_namespaces()
    command = [
        "bwrap", "--die-with-parent", "--unshare-user", "--unshare-pid",
        "--ro-bind", "/usr", "/usr", "--ro-bind", "/etc", "/etc",
        "--symlink", "usr/bin", "/bin", "--symlink", "usr/lib", "/lib", "--symlink", "usr/lib64", "/lib64",
        "--proc", "/proc", "--dev", "/dev",
        "--ro-bind", os.path.dirname(CALLER), os.path.dirname(CALLER),
        "--bind", world.root, world.root,
    ]  # fmt: skip
    if marker is not None:
        path = os.path.join(world.folder("markers"), str(len(os.listdir(world.folder("markers")))))
        with open(path, "w", encoding="utf-8") as file:
            file.write(marker)
        command += ["--ro-bind", path, "/.flatpak-info"]
    return command


def marker_of(app_id):
    return f"[Application]\nname={app_id}\nruntime=runtime/org.example.Platform/x86_64/1\n"


def start_proxy(world, wrapper=()):
    """Starts a proxy of the bus; returns its address."""
    folder = world.folder("proxies")
    socket = os.path.join(folder, str(len(os.listdir(folder))))
    reading, writing = os.pipe()
    try:
        world.start(
            [*wrapper, "xdg-dbus-proxy", f"--fd={writing}", world.bus.address, socket],
            pass_fds=(writing,),
        )
    finally:
        os.close(writing)
    world.keep(Descriptor(reading))
    assert os.read(reading, 1) == b"x", "the proxy did not start"
    return f"unix:path={socket}"


class Descriptor:
    """Closed when the test ends; the proxy at its other end ends with it."""

    def __init__(self, descriptor):
        self.descriptor = descriptor

    def dispose(self):
        os.close(self.descriptor)


def sandboxed(world, app_id):
    """An application in its sandbox, as Flatpak arranges it: it reaches the bus through a proxy that runs in a
    sandbox with the same marker."""
    sandbox = bwrap(world, marker_of(app_id))
    address = start_proxy(world, sandbox)
    return Application(CallingProgram(world, sandbox, address=address), app_id)


def behind_bare_proxy(world):
    return Application(CallingProgram(world, address=start_proxy(world)))


def program(world, wrapper=(), **others):
    """A program of the user's own, started by the command."""
    return Application(CallingProgram(world, wrapper, **others))


class Unit:
    """A unit of the user's service manager, as far as a control group's name makes one. Only root can make it, where
    no service manager keeps these groups for itself."""

    def __init__(self, world, name):
        if os.geteuid() != 0:
            pytest.skip("only root can make control groups")
        self._world = world
        self._mount = world.folder("cgroup")
        command = ["mount", "-t", "cgroup", "-o", "none,name=systemd", "cgroup", self._mount]
        if subprocess.run(command, stderr=subprocess.DEVNULL, check=False).returncode != 0:
            pytest.skip("the system does not let its control groups be mounted")
        user = os.geteuid()
        self._path = f"user.slice/user-{user}.slice/user@{user}.service/app.slice/{name}"
        os.makedirs(os.path.join(self._mount, self._path))
        self._programs = []
        world.keep(self)

    def program(self, below=""):
        """A program in the unit, or in a group below it."""
        group = os.path.join(self._mount, self._path, below)
        os.makedirs(group, exist_ok=True)
        enter = ["sh", "-c", 'echo $$ > "$0" && exec "$@"', os.path.join(group, "cgroup.procs")]
        started = program(self._world, enter)
        self._programs.append((started, group))
        return started

    def dispose(self):
        for started, group in self._programs:
            started.connection.close()
            if group != os.path.join(self._mount, self._path, ""):
                os.rmdir(group)
        path = self._path
        while path:
            try:
                os.rmdir(os.path.join(self._mount, path))
            except OSError:
                break  # what was there before
            path = os.path.dirname(path)
        subprocess.run(["umount", self._mount], check=True)
