"""One application's way through a request: asked, answered, recorded, asked again."""

import pytest

from harness.agent import ALLOW, REFUSE
from harness.application import Pending, options
from harness.expect import (
    ACCOUNTS_DOMAIN,
    GRANTED,
    INVALID_OPTIONS,
    LIMITS_EXCEEDED,
    NO_ACCESS,
    NO_ACCOUNT,
    REFUSED_WITHOUT_ERROR,
    UNSUPPORTED_TYPE,
    USER_REFUSED,
    bus_error,
)

PHOTO = "org.example.PhotoApp"
ALL_ACCESS = "com.zentor.accounts.all-access"
DEFAULT_ACCESS = "com.zentor.accounts.facebook.default-access"


def test_a_first_request_that_the_user_allows_is_granted_recorded_and_has_a_token(world):
    manager = world.manager()
    manager.add_account()
    agent = world.agent()
    application = world.application(name="Photo App")

    pending = application.start_request(["user_photos", "email"])
    alert = agent.next()
    assert "Photo App" in alert.message
    assert alert.description["client_id"] == PHOTO
    assert alert.description["top_most"] is True
    assert alert.description["dismiss_on_lock"] is True
    assert alert.description["dont_dismiss_on_unlock"] is True
    assert alert.description["header"] and not alert.description["header"].isupper()
    assert alert.description["default_button_title"] != alert.description["alternate_button_title"]
    assert not pending.answered
    assert application.access()[0] == "none"
    alert.allow()

    assert pending.answer() == GRANTED
    state, permissions, kept = application.access()
    assert (state, sorted(permissions), kept) == ("granted", ["email", "user_photos"], {"app_id": "4711"})
    assert application.token()
    record = manager.authorizations()[PHOTO]
    assert record["granted"] is True
    assert sorted(record["permissions"]) == ["email", "user_photos"]
    assert record["options"] == {"app_id": "4711"}
    assert record["name"] == "Photo App"
    (entry,) = manager.access_log()
    assert (entry["client_id"], entry["granted"], entry["requested"]) == (PHOTO, True, True)


def test_what_is_held_already_is_granted_at_once(world):
    manager = world.manager()
    manager.add_account()
    agent = world.agent(answer=ALLOW)
    application = world.application()
    application.request(["user_photos", "email"])
    token = application.token()

    assert application.request(["email"]) == GRANTED
    assert application.request(["email", "user_photos"]) == GRANTED
    assert agent.asked() == 1
    assert application.token() == token
    assert len(manager.access_log()) == 1


def test_a_refusal_stands_and_is_given_at_once_the_next_time(world):
    manager = world.manager()
    manager.add_account()
    agent = world.agent(answer=REFUSE)
    application = world.application()

    assert application.request(["email"]) == USER_REFUSED
    assert application.request(["email"]) == REFUSED_WITHOUT_ERROR
    assert application.request(["user_photos"]) == REFUSED_WITHOUT_ERROR
    assert agent.asked() == 1
    assert application.access() == ("refused", [], {"app_id": "4711"})
    record = manager.authorizations()[PHOTO]
    assert record["granted"] is False
    assert "permissions" not in record
    assert [(e["granted"], e["requested"]) for e in manager.access_log()] == [(False, True)]
    with bus_error(NO_ACCESS):
        application.credential()


def test_more_permissions_are_asked_for_alone(wired_world, wire):
    wired_world.manager().add_account()
    agent = wired_world.agent()
    application = wired_world.application()
    pending = application.start_request(["email"])
    agent.next().allow()
    pending.answer()

    pending = application.start_request(["email", "manage_pages"])
    alert = agent.next()
    alert.allow()
    assert pending.answer() == GRANTED
    first, second = wire.asked("/authorize")
    assert first.parameters["permissions"] == "email"
    assert second.parameters["permissions"] == "manage_pages"


def test_who_refuses_more_permissions_keeps_what_was_granted(world):
    manager = world.manager()
    manager.add_account()
    agent = world.agent(answer=ALLOW)
    application = world.application()
    application.request(["user_photos"])
    token = application.token()

    agent.answer = REFUSE
    assert application.request(["publish_stream"], audience="friends") == USER_REFUSED
    assert application.access() == ("granted", ["user_photos"], {"app_id": "4711"})
    assert application.token() == token
    assert application.request(["user_photos"]) == GRANTED
    assert agent.asked() == 2


def test_a_wider_audience_is_asked_for_again(world):
    world.manager().add_account()
    agent = world.agent(answer=ALLOW)
    application = world.application()
    assert application.request(["publish_stream", "email"], audience="friends") == GRANTED
    assert application.request(["publish_stream"], audience="friends") == GRANTED
    assert agent.asked() == 1

    assert application.request(["publish_stream"], audience="everyone") == GRANTED
    assert agent.asked() == 2
    assert application.access()[2] == {"app_id": "4711", "audience": "everyone"}


def test_reading_keeps_its_credit_when_the_audience_changes(world):
    world.manager().add_account()
    agent = world.agent(answer=ALLOW)
    application = world.application()
    application.request(["publish_stream", "email"], audience="friends")

    assert application.request(["email"], audience="only_me") == GRANTED
    assert agent.asked() == 1


def test_the_audience_is_named_in_the_alert_and_to_the_server(wired_world, wire):
    wired_world.manager().add_account()
    agent = wired_world.agent()
    messages = {}
    for audience, word in (("everyone", "EVERYONE"), ("friends", "ALL_FRIENDS"), ("only_me", "SELF")):
        application = wired_world.application(f"org.example.{audience}", "Poster")
        pending = application.start_request(["publish_stream"], audience=audience)
        alert = agent.next()
        alert.allow()
        assert pending.answer() == GRANTED
        messages[audience] = alert.message
        assert wire.asked("/authorize")[-1].parameters["audience"] == word
    assert len(set(messages.values())) == 3


def test_another_app_id_gets_no_credit_for_the_grant(world):
    world.manager().add_account()
    agent = world.agent(answer=ALLOW)
    application = world.application()
    application.request(["email"], app_id="4711")

    assert application.request(["email"], app_id="4712") == GRANTED
    assert agent.asked() == 2
    assert application.access()[2] == {"app_id": "4712"}


def test_a_request_without_permissions_asks_every_time(world):
    world.manager().add_account()
    agent = world.agent(answer=ALLOW)
    application = world.application()
    assert application.request() == GRANTED
    assert application.access() == ("granted", [], {"app_id": "4711"})
    assert application.request([]) == GRANTED
    assert agent.asked() == 2


def test_the_user_is_asked_also_where_the_application_wants_no_interaction(world):
    world.manager().add_account()
    agent = world.agent(answer=ALLOW)
    assert world.application().start_request(["email"], interact=False).answer() == GRANTED
    assert agent.asked() == 1


def test_without_an_account_a_request_is_refused_at_once(world):
    agent = world.agent(answer=ALLOW)
    assert world.application().request(["email"]) == NO_ACCOUNT
    assert agent.asked() == 0
    assert world.manager().access_log() == []


@pytest.mark.parametrize(
    "values",
    [
        options(app_id=None, permissions=["email"]),
        options(app_id="", permissions=["email"]),
        options(permissions=["publish_stream"]),
    ],
    ids=["no app ID", "an empty app ID", "posting without an audience"],
)
def test_options_that_cannot_be_used_are_an_error_and_nobody_is_asked(world, values):
    world.manager().add_account()
    agent = world.agent(answer=ALLOW)
    application = world.application()
    assert application.start_request_with(values).answer() == INVALID_OPTIONS
    assert agent.asked() == 0
    assert application.access() == ("none", [], {})


def test_options_of_other_names_are_left_aside(world):
    from gi.repository import GLib

    world.manager().add_account()
    world.agent(answer=ALLOW)
    application = world.application()
    others = {"colour": GLib.Variant("s", "blue"), "nested": GLib.Variant("a{sv}", {})}
    assert application.request(["email"], **others) == GRANTED
    assert application.access()[2] == {"app_id": "4711"}


def test_an_account_type_that_no_plug_in_serves_is_an_error(world):
    with bus_error(UNSUPPORTED_TYPE):
        world.application().start_request(["email"], account_type="com.zentor.other").answer()


def test_a_client_with_default_access_is_granted_without_being_asked_about(bare_world, wire):
    bare_world.entitle(PHOTO, DEFAULT_ACCESS)
    bare_world.start_bus()
    bare_world.configure(wire.url)
    bare_world.start_daemon()
    manager = bare_world.manager()
    manager.add_account()
    agent = bare_world.agent(answer=REFUSE)
    application = bare_world.application()

    assert application.request(["email"]) == GRANTED
    assert agent.asked() == 0
    assert wire.asked("/authorize")[0].parameters["bundle_id"] == PHOTO
    assert application.access() == ("granted", ["email"], {"app_id": "4711"})
    assert application.token()
    assert manager.access_log() == []


def test_a_client_with_default_access_needs_neither_account_nor_server(bare_world, wire):
    bare_world.entitle(PHOTO, DEFAULT_ACCESS)
    bare_world.start_bus()
    bare_world.configure(wire.url)
    bare_world.start_daemon()
    application = bare_world.application()

    assert application.request(["email"]) == GRANTED
    assert wire.exchanges == []
    assert application.access() == ("granted", ["email"], {"app_id": "4711"})
    with bus_error(NO_ACCESS):
        application.credential()
    assert application.request([], app_id="") == INVALID_OPTIONS


def test_an_entitlement_counts_from_the_next_request_after_its_file_has_changed(wired_world):
    wired_world.manager().add_account()
    agent = wired_world.agent()
    application = wired_world.application()
    pending = application.start_request(["email"])
    alert = agent.next()
    wired_world.entitle(PHOTO, ALL_ACCESS)
    assert application.request(["user_photos"]) == GRANTED
    assert not pending.answered
    alert.refuse()
    assert pending.answer() == USER_REFUSED


def test_a_client_with_access_to_all_accounts_is_granted_before_anything_is_looked_at(bare_world):
    bare_world.entitle(PHOTO, ALL_ACCESS, DEFAULT_ACCESS)
    bare_world.start_bus()
    bare_world.configure(None)
    bare_world.start_daemon()
    application = bare_world.application()

    assert application.start_request_with({}).answer() == GRANTED
    assert application.access() == ("none", [], {})
    assert bare_world.manager().access_log() == []


def test_a_client_without_an_id_may_ask_but_nothing_of_it_is_kept(world):
    manager = world.manager()
    manager.add_account()
    agent = world.agent()
    stranger = world.stranger()

    pending = stranger.start_request(["email"])
    alert = agent.next()
    assert "unknown application" in alert.message
    assert "client_id" not in alert.description
    alert.allow()
    granted, error = pending.answer()
    assert (granted, error["domain"], error["code"]) == (False, ACCOUNTS_DOMAIN, 16)
    assert "has no bundle ID" in error["description"]

    pending = stranger.start_request(["email"])
    agent.next().refuse()
    assert pending.answer() == USER_REFUSED
    assert manager.authorizations() == {}
    log = manager.access_log()
    assert [(e["granted"], "client_id" in e) for e in log] == [(False, False), (True, False)]
    assert stranger.access() == ("none", [], {})
    with bus_error(NO_ACCESS):
        stranger.credential()


def test_equal_requests_of_one_client_are_one_request(wired_world, wire):
    manager = wired_world.manager()
    manager.add_account()
    agent = wired_world.agent()
    first = wired_world.application()
    second = wired_world.application()
    pending = [
        first.start_request(["email", "user_photos"]),
        first.start_request(["user_photos", "email", "email"]),
        second.start_request(["email", "user_photos"]),
    ]
    alert = agent.next()
    first.connection.settle()
    second.connection.settle()
    alert.allow()
    assert [request.answer() for request in pending] == [GRANTED] * 3
    assert agent.asked() == 1
    assert len(wire.asked("/authorize")) == 1
    assert len(manager.access_log()) == 1


def test_alerts_of_several_clients_are_shown_one_after_the_other(world):
    world.manager().add_account()
    agent = world.agent()
    waiting = {}
    for number in range(5):
        application = world.application(f"org.example.App{number}", f"App {number}")
        waiting[f"App {number}"] = (application, application.start_request(["email"]))
    for _ in range(5):
        alert = agent.next()
        assert agent.asked() == len(agent.shown)
        name = next(name for name in waiting if name in alert.message)
        application, pending = waiting.pop(name)
        assert not any(other.answered for _, other in waiting.values())
        alert.allow()
        assert pending.answer() == GRANTED
        assert application.access()[0] == "granted"


def test_beyond_the_limit_of_waiting_requests_a_client_is_turned_away_and_others_are_not(bare_world, standin):
    bare_world.start_bus()
    bare_world.configure(standin.url, limits={"WaitingRequestsPerClient": 2, "WaitingRequests": 3})
    bare_world.start_daemon()
    manager = bare_world.manager()
    manager.add_account()
    agent = bare_world.agent()
    greedy = bare_world.application("org.example.Greedy", "Greedy")
    names = ["email", "user_photos", "user_likes"]
    waiting = [greedy.start_request([name]) for name in names]
    alert = agent.next()
    waiting.remove(turned_away(waiting))

    clients = [bare_world.application("org.example." + name, name) for name in ("Other", "Last")]
    asked = {client.start_request(["email"]): client for client in clients}
    last = asked.pop(turned_away(asked))
    (third, other), = asked.items()

    alert.allow()
    for _ in range(2):
        agent.next().allow()
    assert [request.answer() for request in [*waiting, third]] == [GRANTED] * 3
    assert set(manager.authorizations()) == {"org.example.Greedy", other.app_id}
    assert last.access() == ("none", [], {})
    pending = last.start_request(["email"])
    agent.next().allow()
    assert pending.answer() == GRANTED


def turned_away(requests):
    """The one for which there is no room: it alone is answered while nobody answers an alert."""
    request = Pending.first_of(requests)
    with bus_error(LIMITS_EXCEEDED):
        request.answer()
    return request


def test_a_request_that_needs_nobody_is_answered_while_others_wait(bare_world, standin):
    bare_world.start_bus()
    bare_world.configure(standin.url, limits={"WaitingRequests": 1})
    bare_world.start_daemon()
    bare_world.manager().add_account()
    agent = bare_world.agent(answer=ALLOW)
    application = bare_world.application()
    application.request(["email"])
    agent.answer = None
    other = bare_world.application("org.example.Other", "Other")
    pending = other.start_request(["email"])
    alert = agent.next()

    assert application.request(["email"]) == GRANTED
    alert.refuse()
    assert pending.answer() == USER_REFUSED
