"""A daemon that answers what the test tells it to, for the tools that call one."""

import os
import queue

from gi.repository import Gio, GLib

from harness import DEADLINE
from harness.bus import AGENT_MANAGER, NAME, PATH, BusError

INTERFACES = os.path.join(os.path.dirname(__file__), "..", "..", "..", "interfaces")
AGENT = "com.zentor.rvd.Agent1"


def interfaces():
    """The interfaces of the daemon's object, by name."""
    found = {}
    for kind in ("Accounts1", "Management1", "Agent1"):
        with open(os.path.join(INTERFACES, f"com.zentor.rvd.{kind}.xml"), encoding="utf-8") as file:
            for interface in Gio.DBusNodeInfo.new_for_xml(file.read()).interfaces:
                found[interface.name] = interface
    del found[AGENT]
    return found


# As an answer: the call is left waiting, until the test calls what FakeRvd.held returns with the answer.
HELD = object()


class Call:
    """A call that came: its method, its values, who called, and the content of a descriptor that came along."""

    def __init__(self, method, values, sender, passed):
        self.method = method
        self.values = values
        self.sender = sender
        self.passed = passed

    def __repr__(self):
        return f"{self.method}{self.values}"


class ShownAlert:
    """An alert that an agent is showing."""

    def __init__(self, alert_id, future):
        self.id = alert_id
        self._future = future

    @property
    def answered(self):
        return self._future.done()

    def answer(self):
        """Waits for the response flags."""
        return self._future.result(DEADLINE)[0]

    def failure(self):
        """Waits for the error that the agent answers with."""
        try:
            raise AssertionError(f"answered with {self.answer()}")
        except BusError as error:
            return error


class FakeRvd:
    """answers: by method, a GLib.Variant of the reply's values, a BusError, or a function that is given the
    call and returns one of these. A method without an answer returns nothing."""

    def __init__(self, connection, answers=None):
        self.connection = connection
        self.answers = dict(answers or {})
        self.calls = []
        self._agents = queue.Queue()
        self._left = queue.Queue()
        self._held = queue.Queue()
        self._next_id = 0
        self._objects = [
            connection.gio.register_object(PATH, interface, self._call, None, None)
            for interface in interfaces().values()
        ]
        connection.driver("RequestName", GLib.Variant("(su)", (NAME, 0)))

    def methods(self):
        return [call.method for call in self.calls]

    def _call(self, _connection, sender, _path, interface, method, parameters, invocation):
        call = Call(method, parameters.unpack(), sender, self._passed(invocation))
        self.calls.append(call)
        answer = self.answers.get(method)
        if callable(answer):
            answer = answer(call)
        if answer is HELD:
            self._held.put(invocation)
            return
        if isinstance(answer, BusError):
            invocation.return_dbus_error(answer.name, answer.message)
            return
        invocation.return_value(answer)
        if interface == AGENT_MANAGER:
            queue_of = self._agents if method == "RegisterAgent" else self._left
            queue_of.put((sender, *call.values))

    @staticmethod
    def _passed(invocation):
        """The content of the one descriptor that came with a message, read to its end."""
        passed = invocation.get_message().get_unix_fd_list()
        if passed is None:
            return None
        with os.fdopen(passed.get(0), "rb") as file:
            return file.read()

    def held(self):
        """Waits for a call that is left waiting; returns what answers it."""
        return self._held.get(timeout=DEADLINE).return_value

    def agent(self):
        """The next agent that registers: its bus name, path and kind."""
        return self._agents.get(timeout=DEADLINE)

    def agent_that_left(self):
        """The next agent that unregisters: its bus name and path."""
        return self._left.get(timeout=DEADLINE)

    def show(self, agent, description, by=None):
        """Has an agent show an alert; by: the connection that calls it, where it is not the daemon's."""
        self._next_id += 1
        alert_id = f"alert-{self._next_id}"
        values = GLib.Variant("(sa{sv})", (alert_id, description))
        future = (by or self.connection).send(
            AGENT, "ShowAlert", values, destination=agent[0], path=agent[1]
        )
        return ShownAlert(alert_id, future)

    def dismiss(self, agent, alert_id, by=None):
        (by or self.connection).call(
            AGENT, "DismissAlert", GLib.Variant("(s)", (alert_id,)), destination=agent[0], path=agent[1]
        )

    def leave(self):
        """Gives the daemon's name up, as a daemon that ends does."""
        self.connection.driver("ReleaseName", GLib.Variant("(s)", (NAME,)))

    def come_back(self):
        self.connection.driver("RequestName", GLib.Variant("(su)", (NAME, 0)))
