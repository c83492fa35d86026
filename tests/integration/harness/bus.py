"""A private message bus, and connections to it."""

import os
import re
import threading
import time
from concurrent.futures import Future

from gi.repository import Gio, GLib

from harness import DEADLINE
from harness.processes import Process

NAME = "com.zentor.rvd"
PATH = "/com/zentor/rvd"
ACCOUNTS = "com.zentor.rvd.Accounts1"
MANAGEMENT = "com.zentor.rvd.Management1"
AGENT_MANAGER = "com.zentor.rvd.AgentManager1"
DRIVER = ("org.freedesktop.DBus", "/org/freedesktop/DBus", "org.freedesktop.DBus")

NO_TIMEOUT = GLib.MAXINT

# Other users may connect, so that a test can show that rvd itself turns them away; the limits are those of
# an ordinary session bus, which never stand between a test and rvd.
CONFIGURATION = """<!DOCTYPE busconfig PUBLIC "-//freedesktop//DTD D-Bus Bus Configuration 1.0//EN"
  "http://www.freedesktop.org/standards/dbus/1.0/busconfig.dtd">
<busconfig>
  <type>session</type>
  <listen>unix:path={socket}</listen>
  <auth>EXTERNAL</auth>
  {servicedirs}
  <policy context="default">
    <allow user="*"/>
    <allow send_destination="*" eavesdrop="true"/>
    <allow eavesdrop="true"/>
    <allow own="*"/>
  </policy>
  {policies}
  <limit name="max_incoming_bytes">1000000000</limit>
  <limit name="max_incoming_unix_fds">250000000</limit>
  <limit name="max_outgoing_bytes">1000000000</limit>
  <limit name="max_outgoing_unix_fds">250000000</limit>
  <limit name="max_message_size">1000000000</limit>
  <limit name="service_start_timeout">120000</limit>
  <limit name="auth_timeout">240000</limit>
  <limit name="pending_fd_timeout">150000</limit>
  <limit name="max_completed_connections">100000</limit>
  <limit name="max_incomplete_connections">10000</limit>
  <limit name="max_connections_per_user">100000</limit>
  <limit name="max_pending_service_starts">10000</limit>
  <limit name="max_names_per_connection">50000</limit>
  <limit name="max_match_rules_per_connection">50000</limit>
  <limit name="max_replies_per_connection">50000</limit>
</busconfig>
"""


class BusError(Exception):
    """An error that came back over the bus."""

    def __init__(self, name, message):
        super().__init__(f"{name}: {message}")
        self.name = name
        self.message = message


class Bus:
    """A message bus of the test's own. service_dirs: where it looks for services to start. policies: files of
    further policies."""

    def __init__(self, folder, environment, service_dirs=(), policies=()):
        socket = os.path.join(folder, "bus")
        configuration = os.path.join(folder, "bus.conf")
        with open(configuration, "w", encoding="utf-8") as file:
            file.write(
                CONFIGURATION.format(
                    socket=socket,
                    servicedirs="".join(f"<servicedir>{path}</servicedir>" for path in service_dirs),
                    policies="".join(f"<include>{path}</include>" for path in policies),
                )
            )
        self.process = Process(
            ["dbus-daemon", f"--config-file={configuration}", "--nofork", "--nopidfile", "--print-address=1"],
            environment,
        )
        self.address = self.process.stdout.wait_for(r"^(unix:\S+)$").group(1)
        self._connections = []

    def connect(self):
        connection = Connection(self.address)
        self._connections.append(connection)
        return connection

    def dispose(self):
        for connection in self._connections:
            connection.close()
        self.process.dispose()


class Connection:
    """One connection to the bus, as a program of its own would have it."""

    def __init__(self, address):
        self.gio = Gio.DBusConnection.new_for_address_sync(
            address,
            Gio.DBusConnectionFlags.AUTHENTICATION_CLIENT | Gio.DBusConnectionFlags.MESSAGE_BUS_CONNECTION,
            None,
            None,
        )
        self.gio.set_exit_on_close(False)

    @property
    def name(self):
        return self.gio.get_unique_name()

    def send(self, interface, method, parameters=None, fds=(), destination=NAME, path=PATH):
        """Calls a method without waiting: a Future of the reply's values, or of a BusError."""
        future = Future()

        def finish(connection, result):
            try:
                reply, _ = connection.call_with_unix_fd_list_finish(result)
                future.set_result(reply.unpack())
            except GLib.Error as error:
                name = Gio.DBusError.get_remote_error(error) or f"{error.domain}.{error.code}"
                text = re.sub(r"^GDBus\.Error:[^ ]*: ", "", error.message)
                future.set_exception(BusError(name, text))

        handles = Gio.UnixFDList.new() if fds else None
        for descriptor in fds:
            handles.append(descriptor)  # a copy: the caller keeps its own
        self.gio.call_with_unix_fd_list(
            destination, path, interface, method, parameters, None,
            Gio.DBusCallFlags.NONE, NO_TIMEOUT, handles, None, finish,
        )  # fmt: skip
        return future

    def call(self, interface, method, parameters=None, **where):
        """Calls a method: the reply's one value, a tuple where there are several, None where there is none."""
        values = self.send(interface, method, parameters, **where).result(DEADLINE)
        return values[0] if len(values) == 1 else values or None

    def driver(self, method, parameters):
        destination, path, interface = DRIVER
        return self.call(interface, method, parameters, destination=destination, path=path)

    def settle(self):
        """Returns when everything that rvd has sent to this connection so far has been received."""
        self.call("org.freedesktop.DBus.Peer", "Ping")

    def signals(self, interface, member):
        return Signals(self, interface, member)

    def property(self, interface, name):
        return self.call("org.freedesktop.DBus.Properties", "Get", GLib.Variant("(ss)", (interface, name)))

    def close(self):
        if not self.gio.is_closed():
            try:
                self.gio.close_sync(None)
            except GLib.Error:
                pass  # the bus itself has gone


class Signals:
    """The signals of one name that reach a connection."""

    def __init__(self, connection, interface, member):
        self._changed = threading.Condition()
        self._received = []
        self._connection = connection
        connection.gio.signal_subscribe(
            None, interface, member, None, None, Gio.DBusSignalFlags.NONE, self._receive
        )
        # The rule is in force at the bus once it has answered something that was sent after it.
        connection.driver("GetId", None)

    def _receive(self, _connection, _sender, _path, _interface, _member, parameters):
        with self._changed:
            self._received.append(parameters.unpack())
            self._changed.notify_all()

    def wait(self, count=1):
        """Waits until so many have come; returns all that came."""
        end = time.monotonic() + DEADLINE
        with self._changed:
            while len(self._received) < count:
                assert self._changed.wait(end - time.monotonic()), f"only {self._received} came"
            return list(self._received)

    def settled(self):
        """What came of all that was sent until now."""
        self._connection.settle()
        done = threading.Event()
        GLib.idle_add(done.set)  # runs behind what is being delivered
        assert done.wait(DEADLINE)
        with self._changed:
            return list(self._received)


class NameWatch:
    """Who owns a name on the bus."""

    def __init__(self, connection, name):
        self._changed = threading.Condition()
        self.owner = ""
        connection.gio.signal_subscribe(
            "org.freedesktop.DBus", DRIVER[2], "NameOwnerChanged", DRIVER[1], name,
            Gio.DBusSignalFlags.NONE, self._receive,
        )  # fmt: skip
        connection.driver("GetId", None)

    def _receive(self, _connection, _sender, _path, _interface, _member, parameters):
        with self._changed:
            self.owner = parameters.unpack()[2]
            self._changed.notify_all()

    def wake(self):
        with self._changed:
            self._changed.notify_all()

    def wait(self, owned, while_running=None):
        """Waits until the name is owned, or is not. Fails when the process that is to own it has ended."""
        end = time.monotonic() + DEADLINE
        with self._changed:
            while bool(self.owner) != owned:
                if while_running is not None and not while_running.running:
                    raise AssertionError(f"ended at its start:\n{while_running.stderr.text}")
                assert self._changed.wait(end - time.monotonic()), "the name's owner did not change"
