"""Preferences: stored at once, seen by those who have read them once they are told."""

import pytest
from gi.repository import GLib

from harness.agent import ALLOW
from harness.expect import GRANTED, REFUSED_WITHOUT_ERROR

IGNORE = "TKFacebookIgnoreAccessRequests"


def test_the_ignore_preference_is_seen_once_it_has_been_announced(wired_world, wire):
    manager = wired_world.manager()
    manager.add_account()
    agent = wired_world.agent(answer=ALLOW)
    assert wired_world.application("org.example.First").request(["email"]) == GRANTED

    manager.set_preference(IGNORE, GLib.Variant("b", True))
    assert manager.preference(IGNORE) == [True]
    assert wired_world.application("org.example.Second").request(["email"]) == GRANTED

    manager.post_notification()
    third = wired_world.application("org.example.Third")
    assert third.request(["email"]) == REFUSED_WITHOUT_ERROR
    assert agent.asked() == 3, "the user is asked before the preference is looked at"
    assert third.access() == ("none", [], {})
    assert len(wire.asked("/authorize")) == 2
    wired_world.daemon.stderr.wait_for("Will not contact server about this access request due to user-set pref")

    manager.reset_preference(IGNORE)
    assert manager.preference(IGNORE) == []
    assert third.request(["email"]) == REFUSED_WITHOUT_ERROR
    manager.post_notification()
    assert third.request(["email"]) == GRANTED


def test_a_preference_that_was_set_before_the_first_request_needs_no_announcement(world):
    manager = world.manager()
    manager.add_account()
    manager.set_preference(IGNORE, GLib.Variant("b", True))
    world.agent(answer=ALLOW)
    assert world.application().request(["email"]) == REFUSED_WITHOUT_ERROR


def test_a_client_with_default_access_is_ignored_as_well(bare_world, wire):
    bare_world.entitle("org.example.PhotoApp", "com.zentor.accounts.facebook.default-access")
    bare_world.start_bus()
    bare_world.configure(wire.url)
    bare_world.start_daemon()
    bare_world.manager().set_preference(IGNORE, GLib.Variant("b", True))
    application = bare_world.application()
    assert application.request(["email"]) == REFUSED_WITHOUT_ERROR
    assert application.access() == ("none", [], {})


@pytest.mark.parametrize(
    "value, ignored",
    [
        (GLib.Variant("b", True), True),
        (GLib.Variant("b", False), False),
        (GLib.Variant("i", 1), True),
        (GLib.Variant("t", 0), False),
        (GLib.Variant("d", 0.5), True),
        (GLib.Variant("d", 0.0), False),
        (GLib.Variant("s", "YES"), True),
        (GLib.Variant("s", "true"), True),
        (GLib.Variant("s", "on"), True),
        (GLib.Variant("s", "1"), True),
        (GLib.Variant("s", "no"), False),
        (GLib.Variant("s", ""), False),
        (GLib.Variant("as", ["true"]), False),
        (GLib.Variant("a{sv}", {"true": GLib.Variant("b", True)}), False),
    ],
    ids=str,
)
def test_the_ignore_preference_is_read_as_a_boolean(world, value, ignored):
    manager = world.manager()
    manager.add_account()
    manager.set_preference(IGNORE, value)
    world.agent(answer=ALLOW)
    assert world.application().request(["email"]) == (REFUSED_WITHOUT_ERROR if ignored else GRANTED)


@pytest.mark.parametrize(
    "value",
    [
        GLib.Variant("s", ""),
        GLib.Variant("s", "größe\n\u202e\U0001f642"),
        GLib.Variant("x", -(2**63)),
        GLib.Variant("x", 2**63 - 1),
        GLib.Variant("d", 0.1),
        GLib.Variant("b", False),
        GLib.Variant("av", []),
        GLib.Variant("a{sv}", {"a": GLib.Variant("av", [GLib.Variant("x", 1), GLib.Variant("s", "two")])}),
    ],
    ids=str,
)
def test_every_kind_of_value_is_kept_over_a_restart(world, value):
    manager = world.manager()
    manager.set_preference("AKey", value)
    assert manager.preference("AKey") == [value.unpack()]
    world.restart_daemon()
    assert manager.preference("AKey") == [value.unpack()]
    assert manager.preference("AKey", "com.example.other") == []
