"""What the shipped policy has the session bus see to."""

import os
import threading

import pytest
from gi.repository import Gio, GLib

from harness.agent import ALLOW
from harness.bus import DRIVER, NAME
from harness.expect import ACCESS_DENIED, GRANTED, bus_error


POLICY = os.path.join(os.path.dirname(os.path.abspath(__file__)), "../../packaging/dbus", NAME + ".conf")


@pytest.fixture
def policed_world(bare_world, standin):
    """As world, on a bus with the shipped policy."""
    bare_world.start_bus(policies=[POLICY])
    bare_world.configure(standin.url)
    bare_world.start_daemon()
    return bare_world


def own(connection, name):
    return connection.driver("RequestName", GLib.Variant("(su)", (name, 0)))


class Heard:
    """The messages that reach a connection and that it has not asked for."""

    def __init__(self, connection):
        self._lock = threading.Lock()
        self._messages = []
        self._connection = connection
        connection.gio.add_filter(self._take)

    def _take(self, _connection, message, incoming):
        if incoming and message.get_sender() != DRIVER[0]:
            with self._lock:
                self._messages.append((message.get_message_type(), message.get_reply_serial()))
            return None  # or it would be answered
        return message

    def all(self):
        """Those that were sent before."""
        self._connection.driver("GetId", None)
        with self._lock:
            return list(self._messages)


def forged_reply(destination, kind):
    message = Gio.DBusMessage.new()
    message.set_message_type(kind)
    message.set_destination(destination)
    message.set_reply_serial(4711)
    if kind == Gio.DBusMessageType.ERROR:
        message.set_error_name("org.example.Error")
    return message


def test_rvd_does_its_work_under_the_policy(policed_world):
    policed_world.manager().add_account()
    policed_world.agent(answer=ALLOW)
    application = policed_world.application()
    assert application.request(["email"]) == GRANTED
    assert application.token()


def test_nobody_owns_a_name_below_rvds(policed_world):
    with bus_error(ACCESS_DENIED):
        own(policed_world.stranger().connection, NAME + ".Agent")
    assert own(policed_world.stranger().connection, NAME + "x") == 1


@pytest.mark.parametrize("is_policed", [True, False], ids=["with the policy", "without it"])
def test_nobody_answers_what_they_were_not_asked(bare_world, is_policed):
    bare_world.start_bus(policies=[POLICY] if is_policed else [])
    rvd, forger = bare_world.bus.connect(), bare_world.bus.connect()
    own(rvd, NAME)
    heard = Heard(rvd)
    for kind in (Gio.DBusMessageType.METHOD_RETURN, Gio.DBusMessageType.ERROR):
        forger.gio.send_message(forged_reply(NAME, kind), Gio.DBusSendMessageFlags.NONE)
        forger.gio.send_message(forged_reply(rvd.name, kind), Gio.DBusSendMessageFlags.NONE)
    forger.driver("GetId", None)
    assert len(heard.all()) == (0 if is_policed else 4)


@pytest.mark.parametrize("is_policed", [True, False], ids=["with the policy", "without it"])
def test_nobody_listens_to_what_is_said_to_others(bare_world, standin, is_policed):
    bare_world.start_bus(policies=[POLICY] if is_policed else [])
    bare_world.configure(standin.url)
    bare_world.start_daemon()
    listener = bare_world.bus.connect()
    rvd = listener.driver("GetNameOwner", GLib.Variant("(s)", (NAME,)))
    for rule in (f"eavesdrop=true,sender='{rvd}'", f"eavesdrop=true,destination='{rvd}'"):
        listener.driver("AddMatch", GLib.Variant("(s)", (rule,)))
    heard = Heard(listener)
    bare_world.stranger().access()
    assert (heard.all() == []) == is_policed
