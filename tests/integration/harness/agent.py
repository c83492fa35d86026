"""An agent that answers by program, and remembers what it was asked."""

import queue
import threading

from gi.repository import Gio, GLib

from harness import DEADLINE
from harness.bus import AGENT_MANAGER

ALLOW = 0
REFUSE = 1
CLOSED = 2

INTERFACE = Gio.DBusNodeInfo.new_for_xml(
    """<node><interface name="com.zentor.rvd.Agent1">
      <method name="ShowAlert">
        <arg name="alert_id" type="s" direction="in"/>
        <arg name="description" type="a{sv}" direction="in"/>
        <arg name="response_flags" type="t" direction="out"/>
      </method>
      <method name="DismissAlert"><arg name="alert_id" type="s" direction="in"/></method>
    </interface></node>"""
).interfaces[0]


class Alert:
    """One alert that an agent was asked to show."""

    def __init__(self, agent, invocation, alert_id, description):
        self._agent = agent
        self._invocation = invocation
        self.id = alert_id
        self.description = description
        self.dismissed = threading.Event()
        self._answered = threading.Lock()

    @property
    def message(self):
        return self.description["message"]

    @property
    def serial(self):
        return self._invocation.get_message().get_serial()

    def answer(self, flags):
        """Answers, unless that has been done."""
        if self._answered.acquire(blocking=False):
            self._invocation.return_value(GLib.Variant("(t)", (flags,)))

    def allow(self):
        self.answer(ALLOW)

    def refuse(self):
        self.answer(REFUSE)

    def fail(self, name="org.example.Error.NoScreen", text="there is no screen"):
        if self._answered.acquire(blocking=False):
            self._invocation.return_dbus_error(name, text)

    def answer_with(self, body):
        """Answers with values of whatever types."""
        self._answered.acquire(blocking=False)
        reply = self._invocation.get_message().new_method_reply()
        reply.set_body(body)
        self._agent.connection.gio.send_message(reply, Gio.DBusSendMessageFlags.NONE)

    def wait_until_dismissed(self):
        assert self.dismissed.wait(DEADLINE), "the alert was not taken down"


class Agent:
    """Shows rvd's alerts. answer: the flags that it answers every alert with; where it is None, the test
    takes each alert with next() and answers it itself."""

    def __init__(self, connection, kind="desktop", path="/org/example/agent", answer=None, register=True):
        self.connection = connection
        self.path = path
        self.answer = answer
        self.shown = []  # every alert so far
        self._waiting = queue.Queue()
        self._open = {}
        self._lock = threading.Lock()
        connection.gio.register_object(path, INTERFACE, self._call, None, None)
        if register:
            self.register(kind)

    def register(self, kind):
        self.connection.call(AGENT_MANAGER, "RegisterAgent", GLib.Variant("(os)", (self.path, kind)))

    def unregister(self):
        self.connection.call(AGENT_MANAGER, "UnregisterAgent", GLib.Variant("(o)", (self.path,)))

    def _call(self, _connection, _sender, _path, _interface, method, parameters, invocation):
        if method == "DismissAlert":
            (alert_id,) = parameters.unpack()
            invocation.return_value(None)
            with self._lock:
                alert = self._open.pop(alert_id, None)
            if alert:
                alert.dismissed.set()
                alert.answer(CLOSED)
            return
        alert = Alert(self, invocation, *parameters.unpack())
        with self._lock:
            self.shown.append(alert)
            self._open[alert.id] = alert
        if self.answer is not None:
            alert.answer(self.answer)
        else:
            self._waiting.put(alert)

    def next(self):
        """The next alert, when it is there."""
        try:
            return self._waiting.get(timeout=DEADLINE)
        except queue.Empty:
            raise AssertionError("no alert came") from None

    def asked(self):
        """How many alerts it was asked to show so far."""
        self.connection.settle()
        done = threading.Event()
        GLib.idle_add(done.set)
        assert done.wait(DEADLINE)
        return len(self.shown)

    def leave(self):
        self.connection.close()
