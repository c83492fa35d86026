"""Permissions that have no words of their own: the server describes them, or nobody is asked."""

import pytest

from harness.expect import GRANTED, REFUSED_WITHOUT_ERROR, USER_REFUSED
from harness.server import answer


@pytest.fixture
def asking(wired_world, wire):
    wired_world.manager().add_account("master-token")
    return wired_world


def test_the_servers_description_stands_behind_the_sentence(asking, wire):
    wire.on("/describe", answer('"see your shoe size"'))
    agent = asking.agent()
    pending = asking.application(name="Photo App").start_request(["email", "shoe_size", "hat_size"])
    alert = agent.next()
    sentence, description = alert.message.split(". ", 1)
    assert "Photo App" in sentence
    assert "see your shoe size" in description
    alert.allow()
    assert pending.answer() == GRANTED

    (described,) = wire.asked("/describe")
    assert described.parameters == {"permissions": "hat_size,shoe_size"}
    assert described.bearer == "master-token"
    (authorized,) = wire.asked("/authorize")
    assert authorized.parameters["permissions"] == "email,hat_size,shoe_size"


def test_a_request_of_unknown_permissions_alone_is_worded_by_the_server(asking, wire):
    wire.on("/describe", answer('"see your shoe size"'))
    agent = asking.agent()
    pending = asking.application(name="Photo App").start_request(["shoe_size"], audience="friends")
    alert = agent.next()
    assert alert.message.index("Photo App") < alert.message.index("see your shoe size")
    alert.refuse()
    assert pending.answer() == USER_REFUSED
    assert wire.asked("/describe")[0].parameters["audience"] == "ALL_FRIENDS"


@pytest.mark.parametrize(
    "described",
    [
        answer('"API_EC_PARAM"'),
        answer('""'),
        answer({"description": "something"}),
        answer(["something"]),
        answer("17"),
        answer("null"),
        answer("It will see your shoe size."),
        answer(b'"\xff\xfe\xc0\xaf"'),
        answer('"unfinished'),
        answer(""),
        lambda exchange: exchange.reset(),
        lambda exchange: None,
        answer("[" * 100_000),
    ],
    ids=[
        "API_EC_PARAM", "empty description", "object", "list", "number", "null", "no JSON", "invalid UTF-8",
        "unfinished JSON", "empty body", "reset connection", "closed connection", "deep nesting",
    ],  # fmt: skip
)  # fmt: skip
def test_without_a_description_nobody_is_asked_and_a_refusal_stands(asking, wire, described):
    wire.on("/describe", described)
    agent = asking.agent()
    application = asking.application()
    assert application.request(["email", "shoe_size"]) == USER_REFUSED
    assert agent.asked() == 0
    assert wire.asked("/authorize") == []
    # The person was not asked, yet the client counts as refused: the record says so, and so does the log.
    assert application.access()[0] == "refused"
    assert application.request(["email"]) == REFUSED_WITHOUT_ERROR
    asking.daemon.stderr.wait_for("ended up with an invalid message")


def test_a_grant_survives_a_request_that_could_not_be_described(asking, wire):
    from harness.agent import ALLOW

    asking.agent(answer=ALLOW)
    application = asking.application()
    application.request(["email"])
    wire.on("/describe", answer('"API_EC_PARAM"'))
    assert application.request(["shoe_size"]) == USER_REFUSED
    assert application.access() == ("granted", ["email"], {"app_id": "4711"})


def test_a_description_is_shown_as_plain_text(asking, wire):
    wire.on("/describe", answer('"<b>bold</b> \\u202e %@ %1$@ {0}"'))
    agent = asking.agent()
    pending = asking.application().start_request(["shoe_size"])
    alert = agent.next()
    assert "<b>bold</b> \u202e %@ %1$@ {0}" in alert.message
    alert.refuse()
    pending.answer()
