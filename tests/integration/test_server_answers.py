"""What the server may answer to an authorize exchange, and what becomes of the request."""

import os

import pytest

from harness.agent import ALLOW
from harness.expect import ACCOUNTS_DOMAIN, GRANTED, JSON_DOMAIN, NO_ACCESS, TRANSFER_DOMAIN, bus_error
from harness.server import answer, issue_token

PHOTO = "org.example.PhotoApp"


@pytest.fixture
def asking(wired_world):
    wired_world.manager().add_account("master-token")
    wired_world.agent(answer=ALLOW)
    return wired_world


def test_the_exchange_carries_what_was_asked_for_and_the_master_token(asking, wire):
    assert asking.application().request(["user_photos", "email"], app_id="4711", audience="friends") == GRANTED
    (exchange,) = wire.asked("/authorize")
    assert exchange.parameters == {
        "app_id": "4711",
        "bundle_id": PHOTO,
        "permissions": "email,user_photos",
        "audience": "ALL_FRIENDS",
    }
    assert exchange.bearer == "master-token"
    assert exchange.headers["content-type"] == "application/x-www-form-urlencoded"
    assert "master-token" not in exchange.body


def test_names_with_signs_in_them_arrive_as_they_are(asking, wire):
    wire.on("/describe", answer('"do odd things"'))
    assert asking.application().request(["a&b=c", "ü%20+"], app_id="47 11&x=1") == GRANTED
    (exchange,) = wire.asked("/authorize")
    assert exchange.parameters["app_id"] == "47 11&x=1"
    assert exchange.parameters["permissions"] == "a&b=c,ü%20+"
    assert "x" not in exchange.parameters


def test_an_audience_that_nobody_knows_is_left_out(asking, wire):
    assert asking.application().request(["email"], audience="martians") == GRANTED
    assert "audience" not in wire.asked("/authorize")[0].parameters


@pytest.mark.parametrize(
    "granted, recorded",
    [
        (["email"], ["email"]),
        (["email", "email"], ["email"]),
        ([], []),
        (["something_else"], ["something_else"]),
        (["email", 7, None, {"a": 1}], ["email"]),
    ],
    ids=["all", "one twice", "none", "another", "not only names"],
)
def test_the_record_holds_what_the_server_grants(asking, wire, granted, recorded):
    wire.on("/authorize", answer({"access_token": "t", "permissions": granted}))
    application = asking.application()
    assert application.request(["email"]) == GRANTED
    assert application.access() == ("granted", recorded, {"app_id": "4711"})
    assert application.token() == "t"


@pytest.mark.parametrize("granted", [{}, {"permissions": "email"}, {"permissions": {"email": 1}}, {"permissions": None}],
                         ids=["missing", "text", "object", "null"])  # fmt: skip
def test_a_token_without_a_list_of_permissions_is_a_grant_of_none(asking, wire, granted):
    wire.on("/authorize", answer({"access_token": "t", **granted}))
    application = asking.application()
    assert application.request(["email"]) == GRANTED
    assert application.access() == ("granted", [], {"app_id": "4711"})


def test_an_empty_token_is_a_token(asking, wire):
    wire.on("/authorize", answer({"access_token": "", "permissions": ["email"]}))
    application = asking.application()
    assert application.request(["email"]) == GRANTED
    assert application.credential() == {"oauth_token": "", "refresh_token": ""}


def test_the_status_plays_no_part_where_a_body_came(asking, wire):
    document = {"access_token": "t", "permissions": ["email"]}
    elsewhere = ["Location: http://127.0.0.1:1/"]
    for number, (status, headers) in enumerate(
        [("500 Internal Server Error", ()), ("404 Not Found", ()), ("302 Found", elsewhere), ("401 Unauthorized", ())]
    ):
        wire.on("/authorize", answer(document, status, headers))
        application = asking.application(f"org.example.App{number}")
        assert application.request(["email"]) == GRANTED
    assert len(wire.exchanges) == 4


NO_TOKEN = {
    "error_msg": ({"error_msg": "the app is disabled"}, "the app is disabled"),
    "error_msg that is no text": ({"error_msg": 17}, "17"),
    "no token and no reason": ({"permissions": ["email"]}, "(null)"),
    "a token that is no text": ({"access_token": 17, "permissions": ["email"]}, "(null)"),
    "null for a token": ({"access_token": None}, "(null)"),
    "a list": (["access_token", "t"], "(null)"),
    "a text": ("access_token", "(null)"),
    "a number": (17, "(null)"),
    "empty object": ({}, "(null)"),
}


@pytest.mark.parametrize("document, reason", NO_TOKEN.values(), ids=NO_TOKEN.keys())
@pytest.mark.parametrize("status", ["200 OK", "500 Internal Server Error"])
def test_an_answer_without_a_token_is_the_servers_refusal(asking, wire, document, reason, status):
    import json

    wire.on("/authorize", answer(json.dumps(document), status))
    application = asking.application()
    granted, error = application.request(["email"])
    text = "The Facebook server could not fulfill this access request: " + reason
    assert (granted, error) == (False, {"domain": ACCOUNTS_DOMAIN, "code": 7, "description": text})
    unchanged(asking, application)


NO_JSON = {
    "words": b"All is well.",
    "markup": b"<html><body>502</body></html>",
    "unfinished": b'{"access_token": "t"',
    "something behind": b'{"access_token": "t"} {}',
    "one name twice": b'{"access_token": "t", "access_token": "u"}',
    "invalid UTF-8": b'{"access_token": "\xff\xfe\xc0\xaf"}',
    "half a surrogate": b'{"access_token": "\\ud800"}',
    "100,000 nested brackets": b"[" * 100_000,
    "100,000 nested objects": b'{"a":' * 100_000,
    "100,000 closed brackets": b"[" * 100_000 + b"]" * 100_000,
    "only a blank": b" ",
    "zeros": b"\0" * 1000,
}


@pytest.mark.parametrize("body", NO_JSON.values(), ids=NO_JSON.keys())
def test_an_answer_that_is_no_json_is_the_readers_error(asking, wire, body):
    wire.on("/authorize", answer(body))
    application = asking.application()
    granted, error = application.request(["email"])
    assert (granted, error["domain"]) == (False, JSON_DOMAIN)
    assert error["description"]
    unchanged(asking, application)


def half_a_body(exchange):
    exchange.write(b'HTTP/1.1 200 OK\r\nContent-Length: 1000\r\n\r\n{"access_token": "t"')


def endless_body(exchange):
    exchange.write(b"HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\n\r\n")
    while True:
        exchange.write(b"10000\r\n" + b"x" * 0x10000 + b"\r\n")


def endless_headers(exchange):
    exchange.write(b"HTTP/1.1 200 OK\r\n")
    while True:
        exchange.write(b"X-More: " + b"x" * 4000 + b"\r\n")


def too_long(exchange):
    body = b'{"access_token": "t", "permissions": []' + b" " * (1 << 20) + b"}"
    exchange.write(b"HTTP/1.1 200 OK\r\nContent-Length: %d\r\n\r\n" % len(body) + body)


def compressed(exchange):
    exchange.write(b"HTTP/1.1 200 OK\r\nContent-Encoding: gzip\r\nContent-Length: 4\r\n\r\n\x1f\x8b\x08\x00")


NO_ANSWER = {
    "closed connection": lambda exchange: None,
    "reset connection": lambda exchange: exchange.reset(),
    "no body": lambda exchange: exchange.write(b"HTTP/1.1 200 OK\r\nContent-Length: 0\r\nConnection: close\r\n\r\n"),
    "no content": lambda exchange: exchange.write(b"HTTP/1.1 204 No Content\r\nConnection: close\r\n\r\n"),
    "half a body": half_a_body,
    "no HTTP": lambda exchange: exchange.write(b"\xff\xfe\xfd" * 1000),
    "endless body": endless_body,
    "endless headers": endless_headers,
    "a body over 1 MiB": too_long,
}


@pytest.mark.parametrize("respond", NO_ANSWER.values(), ids=NO_ANSWER.keys())
def test_where_no_answer_comes_the_error_of_the_transfer_is_passed_on(asking, wire, respond):
    wire.on("/authorize", respond)
    application = asking.application()
    granted, error = application.request(["email"])
    assert (granted, error["domain"]) == (False, TRANSFER_DOMAIN)
    assert isinstance(error["code"], int) and error["description"]
    unchanged(asking, application)


def test_a_body_of_just_under_1_mib_is_read(asking, wire):
    document = b'{"access_token": "t", "permissions": ["email"]'
    body = document + b" " * ((1 << 20) - len(document) - 1) + b"}"
    assert len(body) == 1 << 20
    wire.on("/authorize", answer(body))
    assert asking.application().request(["email"]) == GRANTED


def test_a_server_that_is_slow_is_waited_for_until_the_time_is_up(bare_world, wire):
    bare_world.start_bus()
    bare_world.configure(wire.url, timeout_seconds=1)
    bare_world.start_daemon()
    bare_world.manager().add_account()
    bare_world.agent(answer=ALLOW)
    application = bare_world.application()
    wire.on("/authorize", lambda exchange: exchange.read_until_closed())
    granted, error = application.request(["email"])
    assert (granted, error["domain"]) == (False, TRANSFER_DOMAIN)
    assert error["description"]
    unchanged(bare_world, application)


def test_a_server_that_is_not_there_is_a_transfer_error(bare_world, wire):
    url = wire.url
    wire.dispose()
    bare_world._disposables.remove(wire)
    bare_world.start_bus()
    bare_world.configure(url)
    bare_world.start_daemon()
    bare_world.manager().add_account()
    bare_world.agent(answer=ALLOW)
    granted, error = bare_world.application().request(["email"])
    assert (granted, error["domain"]) == (False, TRANSFER_DOMAIN)


def test_without_a_server_in_the_settings_the_error_says_so(bare_world):
    bare_world.start_bus()
    bare_world.configure(None)
    bare_world.start_daemon()
    bare_world.manager().add_account()
    bare_world.agent(answer=ALLOW)
    granted, error = bare_world.application().request(["email"])
    assert (granted, error["domain"]) == (False, TRANSFER_DOMAIN)
    assert "URL" in error["description"]


def test_proxies_of_the_environment_are_not_used(bare_world, wire):
    for name in ("http_proxy", "HTTP_PROXY", "all_proxy", "ALL_PROXY"):
        bare_world.environment[name] = "http://127.0.0.1:1/"
    bare_world.start_bus()
    bare_world.configure(wire.url)
    bare_world.start_daemon()
    bare_world.manager().add_account()
    bare_world.agent(answer=ALLOW)
    assert bare_world.application().request(["email"]) == GRANTED


def test_a_failed_exchange_leaves_an_earlier_grant_as_it_was(asking, wire):
    application = asking.application()
    application.request(["email"])
    before = application.access(), application.credential()
    wire.on("/authorize", answer({"error_msg": "no"}))
    assert application.request(["manage_pages"])[0] is False
    assert (application.access(), application.credential()) == before
    assert application.request(["email"]) == GRANTED


def test_a_new_token_takes_the_place_of_the_old_one(asking, wire):
    wire.on("/authorize", answer({"access_token": "first", "permissions": ["email"]}))
    wire.on("/authorize", answer({"access_token": "second", "permissions": ["email", "user_photos"]}))
    application = asking.application()
    application.request(["email"])
    assert application.token() == "first"
    application.request(["email", "user_photos"])
    assert application.token() == "second"


def unchanged(world, application):
    """Nothing is kept of what failed, and the next request is an ordinary one."""
    assert application.access() == ("none", [], {})
    with bus_error(NO_ACCESS):
        application.credential()
    assert world.manager().authorizations() == {}
    assert world.daemon.running
    assert application.request(["email"]) == GRANTED
