"""Programs that try to be taken for others by what they do to their processes and connections."""

import ctypes
import json
import os
import signal
import socket
import subprocess

import pytest

from harness.application import FACEBOOK
from harness.bus import ACCOUNTS, MANAGEMENT
from harness.expect import ACCESS_DENIED, ALREADY_IDENTIFIED, UNKNOWN_APPLICATION
from harness.sandbox import CALLER, PYTHON, bwrap, marker_of, need_user_namespaces, program

PHOTO = "org.example.PhotoApp"
RAW = os.path.join(os.path.dirname(CALLER), "raw.py")
ATTEMPTS = 200


class RawProgram:
    """The connection of harness/raw.py, whatever that program becomes."""

    def __init__(self, world):
        self.process = world.start([PYTHON, "-B", RAW], stdin=subprocess.PIPE)
        self._position = 0
        self.pid = self._answer()["ready"]

    def _answer(self):
        line = self.process.stdout.wait_for(r"^(\{.*\})$\n", self._position)
        self._position = line.end()
        return json.loads(line.group(1))

    def _order(self, **order):
        self.process.popen.stdin.write((json.dumps(order) + "\n").encode())
        self.process.popen.stdin.flush()
        return self._answer()

    def become(self, command):
        """Executes the command in its place; returns the new process's number as that sees it."""
        return self._order(exec=[*command, PYTHON, "-B", RAW])["ready"]

    def hand_on(self, command):
        return self._order(spawn=[*command, PYTHON, "-B", RAW])["ready"]

    def hang(self, folder):
        return self._order(hang=folder)

    def call(self, interface, method, arguments=""):
        """The error's name, or None."""
        return self._order(call=[interface, method, arguments]).get("error")

    def standing(self):
        """What rvd takes it for; as harness.sandbox has it."""
        managed = self.call(MANAGEMENT, "ListAccounts")
        registered = self.call(ACCOUNTS, "Register", "('org.example.Nowhere',)")
        return {
            (ACCESS_DENIED, ALREADY_IDENTIFIED): "identified",
            (None, UNKNOWN_APPLICATION): "unconfined",
            (ACCESS_DENIED, ACCESS_DENIED): "unknown",
        }[managed, registered]


def forged_sandbox(world, app_id):
    """A command that goes to a root with a marker of the program's own, without another process."""
    need_user_namespaces()
    root = world.folder("forged")
    with open(os.path.join(root, ".flatpak-info"), "w", encoding="utf-8") as file:
        file.write(marker_of(app_id))
    for name in ("usr", "etc", "dev", "proc"):
        world.folder(f"forged/{name}")
    script = (
        'cd "$0" && for name in usr etc dev proc; do mount --rbind /$name $name; done &&'
        ' here=.$(dirname "$1") && mkdir -p $here && mount --rbind $(dirname "$1") $here && shift &&'
        " ln -sfn usr/lib lib && ln -sfn usr/lib64 lib64 && exec chroot . \"$@\""
    )
    return ["unshare", "-Urm", "sh", "-c", script, root, CALLER]


def test_a_program_that_becomes_a_sandbox_before_it_is_looked_at_is_taken_for_it(world):
    raw = RawProgram(world)
    raw.become(forged_sandbox(world, PHOTO))
    # What no look at a process can tell: it was another program when it connected.
    assert raw.standing() == "identified"


def test_a_program_that_becomes_a_sandbox_after_it_was_looked_at_stays_what_it_was(world):
    raw = RawProgram(world)
    assert raw.standing() == "unconfined"
    raw.become(forged_sandbox(world, PHOTO))
    assert raw.standing() == "unconfined"


def test_a_program_that_becomes_a_trusted_one_is_nothing_more_by_that(world):
    world.install(PHOTO)
    before = RawProgram(world)
    before.become(["env"])
    assert before.standing() == "unconfined"
    after = RawProgram(world)
    assert after.standing() == "unconfined"
    after.become(["env"])
    assert after.call(ACCOUNTS, "GetCredential", f"('{FACEBOOK}',)").endswith("NoAccess")


def test_a_connection_that_is_passed_on_keeps_its_identity(world):
    # Whoever holds the socket speaks as the program that has opened it.
    raw = RawProgram(world)
    raw.hand_on(bwrap(world, marker_of(PHOTO)))
    assert raw.standing() == "unconfined"
    late = RawProgram(world)
    assert late.standing() == "unconfined"
    late.hand_on(bwrap(world, marker_of(PHOTO)))
    assert late.standing() == "unconfined"


def test_a_marker_that_never_answers_makes_its_program_unknown_and_holds_nobody_up(bare_world, standin):
    if os.geteuid() != 0 or not os.path.exists("/dev/fuse"):
        pytest.skip("only root, with /dev/fuse, can make a file system that hangs")
    world = bare_world
    if "ASAN_OPTIONS" in world.environment:
        # The search for leaks stops all threads first, which one that hangs in the kernel cannot be.
        world.environment["ASAN_OPTIONS"] += ":detect_leaks=0"
    world.start_bus()
    world.configure(standin.url)
    world.start_daemon()
    raw = RawProgram(world)
    raw.hang(world.folder("hanging"))
    raw.process.popen.stdin.write((json.dumps({"call": [MANAGEMENT, "ListAccounts", ""]}) + "\n").encode())
    raw.process.popen.stdin.flush()
    for _ in range(20):
        assert program(world).connection.call(MANAGEMENT, "ListAccounts") == []
    assert raw._answer() == {"error": ACCESS_DENIED}
    world.daemon.stderr.wait_for("took too long")
    world.stop_daemon()  # with a thread that still waits for the file


class SandboxsView:
    """The files as a process in a sandbox sees them, for others to take on."""

    def __init__(self, world, app_id):
        outer = program(world, bwrap(world, marker_of(app_id))).connection.process.pid
        with open(f"/proc/{outer}/task/{outer}/children", encoding="ascii") as file:
            (inner,) = file.read().split()
        self._mounts = os.open(f"/proc/{inner}/ns/mnt", os.O_RDONLY | os.O_CLOEXEC)

    def take_on(self):
        return ctypes.CDLL(None).setns(self._mounts, 0x00020000) == 0

    def dispose(self):
        os.close(self._mounts)


def test_the_number_of_a_program_that_left_makes_nobody_another(world):
    if os.geteuid() != 0:
        pytest.skip("only root chooses the numbers of processes")
    view = world.keep(SandboxsView(world, PHOTO))
    observer = world.stranger().connection
    address = world.bus.address.removeprefix("unix:path=").split(",")[0]
    messages = request_for_access()
    reused = 0
    for _ in range(ATTEMPTS):
        world.daemon.send_signal(signal.SIGSTOP)
        leaver = child(lambda: ask(address, messages))
        os.waitpid(leaver, 0)
        with open("/proc/sys/kernel/ns_last_pid", "w", encoding="ascii") as file:
            file.write(str(leaver - 1))
        ready, done = os.pipe(), os.pipe()
        trusted = child(lambda: wait_in(view, ready, done))
        reused += trusted == leaver
        assert os.read(ready[0], 1) == b"x"
        world.daemon.send_signal(signal.SIGCONT)
        # The second time it has heard what the bus says about the one that left.
        observer.call("org.freedesktop.DBus.Peer", "Ping")
        observer.call("org.freedesktop.DBus.Peer", "Ping")
        for descriptor in (*ready, *done):
            os.close(descriptor)
        os.waitpid(trusted, 0)
    observer.call(MANAGEMENT, "ListAccounts")
    print(f"numbers used again: {reused} of {ATTEMPTS}")
    assert reused > ATTEMPTS / 2
    assert PHOTO not in world.logs()

    # Asked for by the one in the sandbox itself, it would have been seen.
    ready, done = os.pipe(), os.pipe()
    trusted = child(lambda: wait_in(view, ready, done, lambda: ask(address, messages)))
    world.daemon.stderr.wait_for(PHOTO)
    for descriptor in (*ready, *done):
        os.close(descriptor)
    os.waitpid(trusted, 0)


def child(work):
    """Has a new process do the work; returns its number."""
    pid = os.fork()
    if pid == 0:
        try:
            work()
        finally:
            os._exit(0)
    return pid


def wait_in(view, ready, done, work=lambda: None):
    os.close(done[1])
    is_there = view.take_on()
    kept = work()
    os.write(ready[1], b"x" if is_there else b"-")
    os.read(done[0], 1)
    del kept


def ask(address, messages):
    """Connects and asks for access; returns the connection without waiting for the answer."""
    bus = socket.socket(socket.AF_UNIX)
    bus.connect(address)
    bus.sendall(b"\0AUTH EXTERNAL 30\r\n")
    bus.recv(1000)
    bus.sendall(b"BEGIN\r\n" + messages[0])
    bus.recv(1000)
    bus.sendall(messages[1])
    return bus


def request_for_access():
    """The bytes of a Hello and of a RequestAccess."""
    from gi.repository import Gio, GLib

    from harness.application import options
    from harness.bus import NAME, PATH

    hello = Gio.DBusMessage.new_method_call(
        "org.freedesktop.DBus", "/org/freedesktop/DBus", "org.freedesktop.DBus", "Hello"
    )
    hello.set_serial(1)
    request = Gio.DBusMessage.new_method_call(NAME, PATH, ACCOUNTS, "RequestAccess")
    request.set_body(GLib.Variant("(sa{sv}b)", (FACEBOOK, options(permissions=["email"]), False)))
    request.set_serial(2)
    return [message.to_blob(Gio.DBusCapabilityFlags.NONE) for message in (hello, request)]


