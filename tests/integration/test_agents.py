"""Agents: who is asked, and what counts as the user's answer."""

import signal

import pytest
from gi.repository import Gio, GLib

from harness.agent import ALLOW, CLOSED, REFUSE
from harness.bus import AGENT_MANAGER, NAME
from harness.expect import GRANTED, INVALID_ARGS, NO_ACCESS, USER_REFUSED, bus_error


@pytest.fixture
def asking(world):
    world.manager().add_account()
    return world


def test_an_alert_waits_for_an_agent(asking):
    application = asking.application()
    pending = application.start_request(["email"])
    assert application.access()[0] == "none"
    assert not pending.answered
    asking.agent(answer=ALLOW)
    assert pending.answer() == GRANTED


def test_a_closed_alert_is_a_refusal(asking):
    asking.agent(answer=CLOSED)
    application = asking.application()
    assert application.request(["email"]) == USER_REFUSED
    assert application.access()[0] == "refused"


def test_a_desktop_agent_goes_before_a_terminal_agent(asking):
    desktop = asking.agent("desktop", answer=ALLOW)
    terminal = asking.agent("terminal", answer=REFUSE)
    assert asking.application().request(["email"]) == GRANTED
    assert (desktop.asked(), terminal.asked()) == (1, 0)


def test_the_newest_agent_of_a_kind_is_asked(asking):
    older = asking.agent("desktop", answer=REFUSE)
    newer = asking.agent("desktop", answer=ALLOW)
    assert asking.application().request(["email"]) == GRANTED
    assert (older.asked(), newer.asked()) == (0, 1)


def test_without_a_desktop_agent_the_newest_terminal_agent_is_asked(asking):
    older = asking.agent("terminal", answer=REFUSE)
    newer = asking.agent("terminal", answer=ALLOW)
    assert asking.application().request(["email"]) == GRANTED
    assert (older.asked(), newer.asked()) == (0, 1)


def test_an_open_alert_stays_where_it_is_when_a_better_agent_comes(asking):
    terminal = asking.agent("terminal")
    pending = asking.application().start_request(["email"])
    alert = terminal.next()
    desktop = asking.agent("desktop", answer=REFUSE)
    assert desktop.asked() == 0
    alert.allow()
    assert pending.answer() == GRANTED
    assert desktop.asked() == 0


def leaves(agent, _alert):
    agent.leave()


def unregisters(agent, _alert):
    agent.unregister()


@pytest.mark.parametrize("goes", [leaves, unregisters])
def test_an_alert_whose_agent_goes_is_shown_by_the_next(asking, goes):
    terminal = asking.agent("terminal")
    desktop = asking.agent("desktop")
    pending = asking.application().start_request(["email"])
    first = desktop.next()
    goes(desktop, first)
    second = terminal.next()
    assert second.message == first.message
    assert not pending.answered
    second.allow()
    assert pending.answer() == GRANTED


def test_an_alert_whose_only_agent_goes_waits_for_another(asking):
    agent = asking.agent()
    application = asking.application()
    pending = application.start_request(["email"])
    agent.next()
    agent.leave()
    assert application.access()[0] == "none"
    later = asking.agent()
    assert not pending.answered
    later.next().allow()
    assert pending.answer() == GRANTED


def test_an_alert_is_taken_down_where_its_agent_unregisters(asking):
    agent = asking.agent()
    asking.application().start_request(["email"])
    alert = agent.next()
    agent.unregister()
    alert.wait_until_dismissed()


def test_a_late_answer_of_an_agent_that_unregistered_counts_for_nothing(asking):
    agent = asking.agent()
    application = asking.application()
    pending = application.start_request(["email"])
    alert = agent.next()
    agent.unregister()
    alert.allow()
    assert application.access()[0] == "none"
    assert not pending.answered
    other = asking.agent(answer=REFUSE)
    assert pending.answer() == USER_REFUSED
    assert other.asked() == 1


NO_ANSWERS = {
    "an error": lambda alert: alert.fail(),
    "unknown method": lambda alert: alert.fail("org.freedesktop.DBus.Error.UnknownMethod", "no such method"),
    "no reply": lambda alert: alert.fail("org.freedesktop.DBus.Error.NoReply", "no reply"),
    "7": lambda alert: alert.answer(7),
    "the largest number": lambda alert: alert.answer(2**64 - 1),
    "2 to the 32nd": lambda alert: alert.answer(2**32),
    "text": lambda alert: alert.answer_with(GLib.Variant("(s)", ("0",))),
    "a smaller number": lambda alert: alert.answer_with(GLib.Variant("(u)", (0,))),
    "a boolean": lambda alert: alert.answer_with(GLib.Variant("(b)", (False,))),
    "nothing": lambda alert: alert.answer_with(GLib.Variant("()", ())),
    "two numbers": lambda alert: alert.answer_with(GLib.Variant("(tt)", (0, 0))),
    "a variant": lambda alert: alert.answer_with(GLib.Variant("(v)", (GLib.Variant("t", 0),))),
}


@pytest.mark.parametrize("respond", NO_ANSWERS.values(), ids=NO_ANSWERS.keys())
def test_what_is_no_answer_is_not_taken_for_one_and_the_next_agent_is_asked(asking, respond):
    terminal = asking.agent("terminal")
    desktop = asking.agent("desktop")
    application = asking.application()
    pending = application.start_request(["email"])
    respond(desktop.next())
    alert = terminal.next()
    assert not pending.answered
    assert application.access()[0] == "none"
    alert.allow()
    assert pending.answer() == GRANTED
    assert asking.daemon.running


def test_the_same_agent_is_asked_again_where_there_is_no_other(asking):
    agent = asking.agent()
    pending = asking.application().start_request(["email"])
    agent.next().fail()
    agent.next().answer(7)
    agent.next().allow()
    assert pending.answer() == GRANTED


def test_an_agent_that_offers_no_object_is_no_hindrance(asking):
    asking.bus.connect().call(AGENT_MANAGER, "RegisterAgent", GLib.Variant("(os)", ("/nowhere", "desktop")))
    terminal = asking.agent("terminal", answer=ALLOW)
    assert asking.application().request(["email"]) == GRANTED
    assert terminal.asked() == 1


@pytest.mark.parametrize("kind", ["", "Desktop", "window", "terminal ", "x" * 100_000])
def test_an_agent_of_no_known_kind_is_refused(asking, kind):
    with bus_error(INVALID_ARGS):
        asking.bus.connect().call(AGENT_MANAGER, "RegisterAgent", GLib.Variant("(os)", ("/a", kind)))


def test_the_alert_goes_when_its_caller_leaves_and_nothing_is_recorded(asking):
    manager = asking.manager()
    agent = asking.agent()
    application = asking.application()
    application.start_request(["email"])
    alert = agent.next()
    application.leave()
    alert.wait_until_dismissed()

    again = asking.application()
    assert again.access() == ("none", [], {})
    assert manager.authorizations() == {}
    assert manager.access_log() == []
    pending = again.start_request(["email"])
    agent.next().allow()
    assert pending.answer() == GRANTED


def test_an_answer_that_crosses_with_its_caller_leaving_counts_wholly_or_not_at_all(asking):
    manager = asking.manager()
    agent = asking.agent()
    for number in range(10):
        client = f"org.example.App{number}"
        application = asking.application(client)
        application.start_request(["email"])
        alert = agent.next()
        application.leave()
        alert.allow()
        again = asking.application(client)
        # Whichever came first: a grant and a token, or neither.
        granted = again.access()[0] == "granted"
        assert (client in manager.authorizations()) == granted
        if granted:
            assert again.token()
        else:
            with bus_error(NO_ACCESS):
                again.credential()


def test_the_alert_stays_while_one_of_several_callers_is_left(asking):
    agent = asking.agent()
    first, second = asking.application(), asking.application()
    first.start_request(["email"])
    alert = agent.next()
    pending = second.start_request(["email"])
    second.connection.settle()
    first.leave()
    second.connection.settle()
    assert not alert.dismissed.is_set()
    alert.allow()
    assert pending.answer() == GRANTED
    assert agent.asked() == 1


def test_the_next_alert_is_shown_when_one_is_taken_down(asking):
    agent = asking.agent()
    first = asking.application("org.example.First", "First")
    first.start_request(["email"])
    alert = agent.next()
    pending = asking.application("org.example.Second", "Second").start_request(["email"])
    first.leave()
    alert.wait_until_dismissed()
    following = agent.next()
    assert "Second" in following.message
    following.allow()
    assert pending.answer() == GRANTED


def test_an_agent_that_ignores_the_dismissal_cannot_answer_any_more(asking):
    agent = asking.agent()
    application = asking.application()
    application.start_request(["email"])
    alert = agent.next()
    agent._open.clear()  # it does not see the alert being taken down
    application.leave()
    again = asking.application()
    assert again.access()[0] == "none"
    alert.allow()
    assert again.access()[0] == "none"
    assert asking.manager().authorizations() == {}


def test_a_stopped_agent_holds_up_nobody_who_needs_no_answer(asking):
    import subprocess
    import sys

    code = (
        "import os, sys; from gi.repository import Gio, GLib\n"
        "bus = Gio.bus_get_sync(Gio.BusType.SESSION)\n"
        "bus.call_sync('com.zentor.rvd', '/com/zentor/rvd', 'com.zentor.rvd.AgentManager1', 'RegisterAgent',\n"
        "  GLib.Variant('(os)', ('/a', 'desktop')), None, 0, -1, None)\n"
        "print('registered', flush=True)\n"
        "GLib.MainLoop().run()\n"
    )
    process = asking.start([sys.executable, "-c", code], stdin=subprocess.DEVNULL)
    process.stdout.wait_for("registered")
    process.send_signal(signal.SIGSTOP)
    application = asking.application()
    pending = application.start_request(["email"])
    assert application.access()[0] == "none"
    assert asking.manager().authorize("org.example.Other") == GRANTED
    assert not pending.answered
    terminal = asking.agent("terminal", answer=ALLOW)
    process.end(signal.SIGKILL)
    assert pending.answer() == GRANTED
    assert terminal.asked() == 1


def test_a_request_stands_unanswered_while_the_daemon_knows_of_no_agent_and_its_caller_may_leave(asking):
    application = asking.application()
    application.start_request(["email"])
    application.connection.settle()
    application.leave()
    agent = asking.agent()
    again = asking.application()
    assert again.access()[0] == "none"
    assert agent.asked() == 0


@pytest.mark.parametrize("unique", [True, False], ids=["by its unique name", "by its name"])
def test_nobody_can_answer_in_place_of_the_agent(asking, unique):
    agent = asking.agent()
    pending = asking.application().start_request(["email"])
    alert = agent.next()
    intruder = asking.bus.connect()
    # The bus delivers a reply of whomever; its number is easily guessed.
    forged = Gio.DBusMessage.new()
    forged.set_message_type(Gio.DBusMessageType.METHOD_RETURN)
    forged.set_reply_serial(alert.serial)
    owner = intruder.driver("GetNameOwner", GLib.Variant("(s)", (NAME,)))
    forged.set_destination(owner if unique else NAME)
    forged.set_body(GLib.Variant("(t)", (ALLOW,)))
    intruder.gio.send_message(forged, Gio.DBusSendMessageFlags.NONE)
    intruder.settle()
    if unique:  # it has spoiled the call, so that the user is asked anew
        alert.wait_until_dismissed()
        alert = agent.next()
    alert.refuse()
    assert pending.answer() == USER_REFUSED


def test_alerts_have_names_that_nobody_can_guess(asking):
    agent = asking.agent(answer=REFUSE)
    for number in range(4):
        asking.application(f"org.example.App{number}").request(["email"])
    names = [alert.id for alert in agent.shown]
    assert len(set(names)) == 4
    assert all(len(name) >= 32 for name in names), names
