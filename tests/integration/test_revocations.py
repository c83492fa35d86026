"""What the server is told of access that was taken back: for certain, however long it takes."""

import glob
import hashlib
import json
import os
import sqlite3
import threading

import pytest

from harness.agent import ALLOW
from harness.bus import MANAGEMENT
from harness.expect import GRANTED, INVALID_ARGS, REFUSED_WITHOUT_ERROR, TRANSFER_DOMAIN, bus_error
from harness.processes import run
from harness.server import answer
from harness.standin import Standin

PHOTO = "org.example.PhotoApp"
OTHER = "org.example.Other"


def broken(exchange):
    """A connection that ends without an answer."""


def dead_end(exchange):
    exchange.read_until_closed()


@pytest.fixture
def granted(wired_world):
    """An account, and an application that holds a grant."""
    wired_world.manager().add_account("master-token")
    wired_world.agent(answer=ALLOW)
    application = wired_world.application()
    assert application.request(["email"]) == GRANTED
    return application


def told(wire):
    """Waits for the next revocation that the server is told."""
    exchange = wire.next()
    while exchange.path != "/revoke":
        exchange = wire.next()
    return exchange


def answer_when_released(wire):
    """Answers once wire.release is set."""
    wire.release = threading.Event()

    def respond(exchange):
        assert wire.release.wait(60)
        answer("{}")(exchange)

    return respond


class Pending:
    """What is owed, and its changes."""

    def __init__(self, world):
        self.manager = world.manager()
        self._changed = self.manager.connection.signals(MANAGEMENT, "AuthorizationsChanged")

    def wait_until(self, condition):
        """Waits until the condition holds for what is owed; returns that."""
        seen = 0
        while True:
            pending = self.manager.pending_revocations()
            if condition(pending):
                return pending
            seen = len(self._changed.wait(seen + 1))


def test_a_revocation_that_was_answered_is_owed_no_more(wired_world, wire, granted):
    pending = Pending(wired_world)
    assert pending.manager.revoke(PHOTO) == GRANTED
    exchange = told(wire)
    assert (exchange.bearer, exchange.parameters) == ("master-token", {"app_id": "4711"})
    pending.wait_until(lambda owed: owed == [])
    wired_world.restart_daemon()
    assert pending.manager.pending_revocations() == []
    assert len(wire.asked("/revoke")) == 1


def test_a_revocation_is_owed_until_the_server_has_answered(wired_world, wire, granted):
    wire.always("/revoke", broken)
    pending = Pending(wired_world)
    assert pending.manager.revoke(PHOTO) == GRANTED
    (owed,) = pending.wait_until(lambda owed: owed and owed[0]["attempts"])
    assert owed["client_ids"] == [PHOTO]
    assert owed["app_id"] == "4711"
    assert owed["since"] > 1_700_000_000
    assert owed["attempts"] == 1
    assert "master-token" not in owed["failure"]
    wire.always("/revoke", answer("whatever", "401 Unauthorized"))
    pending.wait_until(lambda now: now == [])  # after a pause of a second
    assert {exchange.bearer for exchange in wire.asked("/revoke")} == {"master-token"}


def test_a_server_error_without_a_body_is_no_answer(wired_world, wire, granted):
    wire.on("/revoke", answer("", "503 Service Unavailable"))
    pending = Pending(wired_world)
    pending.manager.revoke(PHOTO)
    pending.wait_until(lambda owed: owed and owed[0]["attempts"] == 1)
    pending.wait_until(lambda owed: owed == [])
    assert len(wire.asked("/revoke")) == 2


def test_before_the_first_failure_there_is_no_word_of_one(wired_world, wire, granted):
    wire.on("/revoke", dead_end)
    manager = wired_world.manager()
    manager.revoke(PHOTO)
    (owed,) = manager.pending_revocations()
    assert (owed["attempts"], owed.get("failure")) == (0, None)


def test_a_revocation_survives_a_kill_and_is_told_when_the_server_is_back(bare_world, standin):
    bare_world.start_bus()
    bare_world.configure(standin.url)
    bare_world.start_daemon()
    pending = Pending(bare_world)
    manager = pending.manager
    manager.add_account("master-token")
    bare_world.agent(answer=ALLOW)
    assert bare_world.application().request(["email"]) == GRANTED
    standin.end()
    assert manager.revoke(PHOTO) == GRANTED
    assert [owed["client_ids"] for owed in manager.pending_revocations()] == [[PHOTO]]
    bare_world.kill_daemon()
    bare_world.start_daemon()
    pending.wait_until(lambda owed: owed and owed[0]["attempts"])
    bare_world.kill_daemon()

    log = os.path.join(bare_world.root, "standin.log")
    bare_world.keep(Standin(bare_world, port=standin.port, log=log))
    bare_world.start_daemon()
    pending.wait_until(lambda owed: owed == [])
    with open(log, encoding="utf-8") as file:
        (line,) = [json.loads(text) for text in file]
    assert (line["exchange"], line["parameters"], line["status"]) == ("revoke", {"app_id": "4711"}, 200)
    assert line["token"] == "sha256:" + hashlib.sha256(b"master-token").hexdigest()[:16]


def test_a_kill_right_after_the_answer_loses_no_revocation(wired_world, wire, granted):
    wire.on("/revoke", dead_end)
    manager = wired_world.manager()
    assert manager.revoke(PHOTO) == GRANTED
    wired_world.crash_daemon()
    Pending(wired_world).wait_until(lambda owed: owed == [])
    assert wire.asked("/revoke")[-1].parameters == {"app_id": "4711"}
    assert wire.asked("/revoke")[-1].bearer == "master-token"


def test_an_orderly_stop_loses_no_revocation(wired_world, wire, granted):
    wire.on("/revoke", dead_end)
    assert wired_world.manager().revoke(PHOTO) == GRANTED
    told(wire)
    wired_world.restart_daemon()
    Pending(wired_world).wait_until(lambda owed: owed == [])
    assert [exchange.bearer for exchange in wire.asked("/revoke")] == ["master-token", "master-token"]


def test_without_a_server_revocations_stay_owed(bare_world, wire):
    bare_world.start_bus()
    bare_world.configure(wire.url)
    bare_world.start_daemon()
    manager = bare_world.manager()
    manager.add_account("master-token")
    bare_world.agent(answer=ALLOW)
    assert bare_world.application().request(["email"]) == GRANTED
    bare_world.stop_daemon()
    bare_world.configure(None)
    bare_world.start_daemon()
    pending = Pending(bare_world)
    assert manager.revoke(PHOTO) == GRANTED
    (owed,) = pending.wait_until(lambda now: now and now[0]["attempts"])
    assert "URL" in owed["failure"]


# ---- removed accounts ----


def database_bytes(world):
    content = b""
    for path in glob.glob(os.path.join(world.state_dir, "accounts.db*")):
        with open(path, "rb") as file:
            content += file.read()
    return content


def sealed_credentials(world):
    database = sqlite3.connect(os.path.join(world.state_dir, "accounts.db"))
    try:
        return dict(database.execute("SELECT client_id, sealed FROM credentials"))
    finally:
        database.close()


def test_a_removed_account_is_gone_and_its_token_goes_when_the_server_was_told(wired_world, wire, granted):
    sealed = sealed_credentials(wired_world)
    assert set(sealed) == {None, PHOTO}
    wire.always("/revoke", broken)
    pending = Pending(wired_world)
    manager = pending.manager
    account_id = manager.accounts()[0]["id"]
    manager.remove_account(account_id)

    assert manager.accounts() == []
    assert manager.authorizations() == {}
    with bus_error(INVALID_ARGS):
        manager.remove_account(account_id)
    assert sealed[PHOTO] not in database_bytes(wired_world)
    assert sealed[None] in database_bytes(wired_world)
    assert len(manager.pending_revocations()) == 1

    wired_world.crash_daemon()
    assert manager.accounts() == []
    wire.always("/revoke", answer("{}"))
    pending.wait_until(lambda owed: owed == [])
    assert wire.asked("/revoke")[-1].bearer == "master-token"
    manager.accounts()
    assert sealed_credentials(wired_world) == {}
    assert sealed[None] not in database_bytes(wired_world)
    wired_world.restart_daemon()
    assert manager.accounts() == []


def test_a_removed_account_for_which_nothing_is_owed_leaves_nothing(wired_world):
    manager = wired_world.manager()
    account_id = manager.add_account("master-token")
    (sealed,) = sealed_credentials(wired_world).values()
    manager.remove_account(account_id)
    assert sealed not in database_bytes(wired_world)


def test_an_account_that_is_added_after_a_removal_signs_nothing_of_the_other(wired_world, wire, granted):
    wire.always("/revoke", broken)
    pending = Pending(wired_world)
    manager = pending.manager
    manager.remove_account(manager.accounts()[0]["id"])
    manager.add_account("second-token")
    wire.always("/revoke", answer("{}"))
    application = wired_world.application()
    assert application.request(["email"]) == GRANTED
    assert wire.asked("/revoke")[-1].bearer == "master-token"
    assert wire.asked("/authorize")[-1].bearer == "second-token"
    assert pending.manager.pending_revocations() == []


# ---- the order ----


def paths(wire):
    return [exchange.path for exchange in wire.exchanges]


def test_an_app_is_authorized_again_only_after_its_revocation_was_answered(wired_world, wire, granted):
    wire.on("/revoke", broken)
    pending = Pending(wired_world)
    pending.manager.revoke(PHOTO)
    pending.wait_until(lambda owed: owed and owed[0]["attempts"])
    pending.manager.forget_refusal(PHOTO)
    assert granted.request(["email"]) == GRANTED
    assert paths(wire) == ["/authorize", "/revoke", "/revoke", "/authorize"]
    assert pending.manager.pending_revocations() == []
    assert granted.access()[0] == "granted"


def test_an_app_whose_revocation_cannot_be_told_is_not_authorized(wired_world, wire, granted):
    wire.always("/revoke", broken)
    manager = wired_world.manager()
    manager.revoke(PHOTO)
    manager.forget_refusal(PHOTO)
    granted_now, error = granted.request(["email"])
    assert (granted_now, error["domain"]) == (False, TRANSFER_DOMAIN)
    assert granted.access() == ("none", [], {})
    assert paths(wire).count("/authorize") == 1
    assert len(manager.pending_revocations()) == 1


def test_requests_that_wait_for_the_same_revocation_are_all_answered(wired_world, wire, granted):
    other = wired_world.application(OTHER)
    wire.on("/revoke", answer_when_released(wire))
    manager = wired_world.manager()
    manager.revoke(PHOTO)
    told(wire)
    manager.forget_refusal(PHOTO)
    first = granted.start_request(["email"])
    second = other.start_request(["email"])
    wire.release.set()
    assert (first.answer(), second.answer()) == (GRANTED, GRANTED)
    assert paths(wire) == ["/authorize", "/revoke", "/authorize", "/authorize"]


def test_a_request_that_waits_for_a_revocation_ends_when_its_client_is_revoked_again(wired_world, wire, granted):
    wire.on("/revoke", answer_when_released(wire))
    manager = wired_world.manager()
    manager.revoke(PHOTO)
    told(wire)
    manager.forget_refusal(PHOTO)
    agent = wired_world.agent()
    waiting = granted.start_request(["email"])
    agent.next().allow()
    assert manager.revoke(PHOTO) == GRANTED
    assert waiting.answer() == REFUSED_WITHOUT_ERROR
    wire.release.set()
    Pending(wired_world).wait_until(lambda owed: owed == [])
    assert paths(wire).count("/authorize") == 1
    assert granted.access() == ("none", [], {})


def test_no_secret_is_said_on_the_way(wired_world, wire, granted):
    token = granted.token()
    wire.on("/revoke", broken)
    pending = Pending(wired_world)
    pending.manager.revoke(PHOTO)
    seen = str(pending.wait_until(lambda owed: owed and owed[0]["attempts"]))
    pending.wait_until(lambda owed: owed == [])
    for secret in (token, "master-token"):
        assert secret not in seen
        assert secret not in wired_world.logs()


def test_rvctl_says_what_the_server_knows(wired_world, wire, granted):
    def rvctl(*arguments):
        status, out, _ = run([wired_world.programs.rvctl, *arguments], wired_world.environment)
        assert status == 0
        return out

    wire.always("/revoke", broken)
    out = rvctl("revoke", PHOTO)
    assert out.startswith("Access revoked on this device.\nThe server has not been told yet: ")
    assert "4711" in rvctl("list", "--pending")
    wire.always("/revoke", answer("{}"))
    assert rvctl("revoke", PHOTO) == "Access revoked on this device.\nThe server has been told.\n"
    assert rvctl("list", "--pending") == "The server has been told of everything.\n"
    assert rvctl("revoke", OTHER) == "Access revoked on this device.\nThere was nothing to tell the server.\n"
