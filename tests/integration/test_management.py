"""What the device's user does: accounts, direct grants, revocations, refusals forgotten."""

import os
import sqlite3

import pytest
from gi.repository import GLib

from harness.agent import ALLOW, REFUSE
from harness.application import FACEBOOK, Application, Manager
from harness.bus import ACCOUNTS, MANAGEMENT
from harness.expect import (
    FAILED,
    GRANTED,
    INVALID_ARGS,
    NO_ACCESS,
    NO_ACCOUNT,
    REFUSED_WITHOUT_ERROR,
    UNSUPPORTED_TYPE,
    bus_error,
)
from harness.server import answer

PHOTO = "org.example.PhotoApp"


@pytest.fixture
def granted(wired_world):
    """An account, and an application that holds a grant."""
    wired_world.manager().add_account("master-token")
    wired_world.agent(answer=ALLOW)
    application = wired_world.application()
    assert application.request(["email", "publish_stream"], audience="friends") == GRANTED
    return application


class Unwritable:
    """As long as it lasts, no record can be written or removed."""

    def __init__(self, world):
        self._database = sqlite3.connect(os.path.join(world.state_dir, "accounts.db"))

    def __enter__(self):
        for what in ("INSERT", "UPDATE", "DELETE"):
            self._run(f"CREATE TRIGGER no_{what} BEFORE {what} ON authorizations BEGIN SELECT RAISE(ABORT, 'full'); END")

    def __exit__(self, *_):
        for what in ("INSERT", "UPDATE", "DELETE"):
            self._run(f"DROP TRIGGER no_{what}")
        self._database.close()

    def _run(self, statement):
        self._database.execute(statement)
        self._database.commit()


# ---- accounts ----


def test_accounts_are_listed_in_the_order_in_which_they_were_added(world):
    manager = world.manager()
    changed = manager.connection.signals(MANAGEMENT, "AccountsChanged")
    ids = [manager.add_account(f"token {name}", name) for name in ("ada", "grace", "edith")]
    assert manager.accounts() == [
        {"id": account_id, "account_type": FACEBOOK, "username": name}
        for account_id, name in zip(ids, ("ada", "grace", "edith"))
    ]
    assert len(set(ids)) == 3
    changed.wait(3)


def test_the_first_account_is_the_one_that_is_used(wired_world, wire):
    manager = wired_world.manager()
    first = manager.add_account("first-token")
    manager.add_account("second-token")
    wired_world.agent(answer=ALLOW)
    wired_world.application().request(["email"])
    assert wire.asked("/authorize")[0].bearer == "first-token"

    manager.remove_account(first)
    wired_world.application("org.example.Other").request(["email"])
    assert wire.asked("/authorize")[1].bearer == "second-token"


@pytest.mark.parametrize(
    "written, read",
    [(b"token", "token"), (b"token\n", "token"), (b"token\n\n", None), (b"x" * 65536, "x" * 65536)],
    ids=["as it is", "one newline dropped", "two newlines", "64 KiB"],
)
def test_the_master_token_is_read_to_its_end(wired_world, wire, written, read):
    manager = wired_world.manager()
    if read is None:
        with bus_error(INVALID_ARGS):
            manager.add_account(written)
        assert manager.accounts() == []
        return
    manager.add_account(written)
    wired_world.agent(answer=ALLOW)
    wired_world.application().request(["email"])
    assert wire.asked("/authorize")[0].bearer == read


@pytest.mark.parametrize(
    "token",
    [b"", b"\n", b"x" * 65538, b"to\nken", b"to\0ken", b"to\rken"],
    ids=["empty", "only a newline", "over 64 KiB", "newline inside", "zero inside", "carriage return"],
)
def test_an_unusable_token_makes_no_account(world, token):
    manager = world.manager()
    with bus_error(INVALID_ARGS) as error:
        manager.add_account(token)
    assert "x" * 100 not in error.message
    assert manager.accounts() == []


def test_a_token_that_never_ends_holds_nobody_up(world):
    manager = world.manager()
    reading, writing = os.pipe()
    try:
        pending = manager.connection.send(
            MANAGEMENT, "AddAccount", GLib.Variant("(ssh)", (FACEBOOK, "ada", 0)), fds=[reading]
        )
        os.close(reading)
        assert manager.accounts() == []
        assert world.application().request(["email"]) == NO_ACCOUNT
        os.write(writing, b"master-token")
    finally:
        os.close(writing)
    (account_id,) = pending.result(90)
    assert [account["id"] for account in manager.accounts()] == [account_id]


def test_a_token_descriptor_that_cannot_be_read_is_refused(world):
    manager = world.manager()
    with bus_error(INVALID_ARGS):
        folder = os.open("/", os.O_RDONLY)
        try:
            manager.add_account(folder)
        finally:
            os.close(folder)
    assert manager.accounts() == []


def test_an_account_of_a_type_that_nobody_serves_is_refused(world):
    with bus_error(UNSUPPORTED_TYPE):
        world.manager().add_account(account_type="com.zentor.other")
    assert world.manager().accounts() == []


def test_a_removed_account_leaves_no_grant_and_no_credential(wired_world, wire, granted):
    manager = wired_world.manager()
    (account,) = manager.accounts()
    changed = granted.connection.signals(ACCOUNTS, "AccessChanged")
    manager.remove_account(account["id"])

    assert manager.accounts() == []
    assert manager.authorizations() == {}
    assert granted.access() == ("none", [], {})
    with bus_error(NO_ACCESS):
        granted.credential()
    assert granted.request(["email"]) == NO_ACCOUNT
    changed.wait()
    while wire.next().path != "/revoke":
        pass


def test_an_unknown_account_cannot_be_removed(world):
    manager = world.manager()
    manager.add_account()
    with bus_error(INVALID_ARGS):
        manager.remove_account("nobody")
    assert len(manager.accounts()) == 1


def test_a_request_whose_account_is_removed_is_not_granted_and_its_alert_goes(world):
    manager = world.manager()
    account_id = manager.add_account()
    agent = world.agent()
    application = world.application()
    pending = application.start_request(["email"])
    alert = agent.next()
    manager.remove_account(account_id)
    alert.wait_until_dismissed()
    assert pending.answer() == REFUSED_WITHOUT_ERROR
    assert manager.authorizations() == {}
    assert manager.access_log() == []


def test_a_request_right_after_the_removal_is_an_ordinary_one(world):
    manager = world.manager()
    asking = Application(manager.connection)  # nothing lies between the answer and the request
    for _ in range(100):
        manager.remove_account(manager.add_account())
        assert asking.request(["email"]) == NO_ACCOUNT


# ---- direct grants ----


def test_a_client_can_be_authorized_before_it_has_ever_asked(wired_world, wire):
    manager = wired_world.manager()
    manager.add_account()
    wired_world.install(PHOTO, "Photo App")
    assert manager.authorize(PHOTO) == GRANTED
    assert wire.exchanges == []
    record = manager.authorizations()[PHOTO]
    assert record["granted"] is True and "permissions" not in record and record["options"] == {}
    assert [(e["client_id"], e["granted"], e["requested"]) for e in manager.access_log()] == [(PHOTO, True, False)]


def test_authorizing_a_refused_client_asks_the_server_and_gives_it_a_token(wired_world, wire):
    manager = wired_world.manager()
    manager.add_account("master-token")
    agent = wired_world.agent(answer=REFUSE)
    application = wired_world.application()
    application.request(["email"])
    changed = application.connection.signals(ACCOUNTS, "AccessChanged")
    wire.on("/authorize", answer({"access_token": "t", "permissions": ["email"]}))

    assert manager.authorize(PHOTO) == GRANTED
    (exchange,) = wire.asked("/authorize")
    assert exchange.parameters == {"app_id": "4711", "bundle_id": PHOTO}
    assert exchange.bearer == "master-token"
    assert application.access() == ("granted", ["email"], {"app_id": "4711"})
    assert application.token() == "t"
    changed.wait()
    assert application.request(["email"]) == GRANTED
    assert agent.asked() == 1


def test_authorizing_succeeds_also_where_the_server_does_not_agree(wired_world, wire):
    manager = wired_world.manager()
    manager.add_account()
    wired_world.agent(answer=REFUSE)
    application = wired_world.application()
    application.request(["email"])
    wire.on("/authorize", answer({"error_msg": "no"}))
    assert manager.authorize(PHOTO) == GRANTED
    assert application.access() == ("granted", [], {"app_id": "4711"})
    with bus_error(NO_ACCESS):
        application.credential()


def test_nobody_can_be_authorized_without_an_account(world):
    manager = world.manager()
    assert manager.authorize(PHOTO) == REFUSED_WITHOUT_ERROR
    assert manager.authorizations() == {}
    assert manager.access_log() == []


def test_a_direct_grant_that_waits_for_the_server_does_not_hold_up_the_bus(wired_world, wire):
    manager = wired_world.manager()
    manager.add_account()
    wired_world.agent(answer=REFUSE)
    application = wired_world.application()
    application.request(["email"])
    wire.on("/authorize", lambda exchange: exchange.read_until_closed())
    pending = manager.start_authorize(PHOTO)
    wire.next()
    assert application.access()[0] == "refused"
    assert not pending.answered


# ---- revocations ----


def test_a_revoked_client_is_refused_at_once_and_its_token_is_dead(wired_world, wire, granted):
    manager = wired_world.manager()
    changed = granted.connection.signals(ACCOUNTS, "AccessChanged")
    everyone = manager.connection.signals(MANAGEMENT, "AuthorizationsChanged")
    assert manager.revoke(PHOTO) == GRANTED

    assert granted.access() == ("refused", [], {"app_id": "4711", "audience": "friends"})
    with bus_error(NO_ACCESS):
        granted.credential()
    assert granted.request(["email"]) == REFUSED_WITHOUT_ERROR
    record = manager.authorizations()[PHOTO]
    assert record["granted"] is False and "permissions" not in record
    newest = manager.access_log()[0]
    assert (newest["client_id"], newest["granted"], newest["requested"]) == (PHOTO, False, False)
    assert changed.wait() == [(FACEBOOK,)]
    assert set(everyone.wait()) == {(FACEBOOK,)}
    exchange = wire.next()
    while exchange.path != "/revoke":
        exchange = wire.next()
    assert exchange.parameters == {"app_id": "4711"}
    assert exchange.bearer == "master-token"


def test_nobody_waits_for_the_servers_answer_to_a_revocation(wired_world, wire, granted):
    wire.on("/revoke", lambda exchange: exchange.read_until_closed())
    assert wired_world.manager().revoke(PHOTO) == GRANTED
    with bus_error(NO_ACCESS):
        granted.credential()


def test_revoking_a_client_that_holds_nothing_succeeds_and_records_nothing(world):
    manager = world.manager()
    assert manager.revoke("org.example.Nobody") == GRANTED
    manager.add_account()
    assert manager.revoke("org.example.Nobody") == GRANTED
    assert manager.authorizations() == {}
    assert manager.access_log() == []


def test_revoking_everyone_forgets_everyone(wired_world, wire, granted):
    manager = wired_world.manager()
    agent_answers = wired_world.agent(answer=REFUSE)
    other = wired_world.application("org.example.Other", "Other")
    other.request(["email"])
    assert set(manager.authorizations()) == {PHOTO, "org.example.Other"}
    signals = [client.connection.signals(ACCOUNTS, "AccessChanged") for client in (granted, other)]

    entries = len(manager.access_log())
    assert manager.revoke_all() == GRANTED
    assert manager.authorizations() == {}
    assert len(manager.access_log()) == entries
    for client, changed in zip((granted, other), signals):
        assert client.access() == ("none", [], {})
        changed.wait()
    with bus_error(NO_ACCESS):
        granted.credential()
    assert agent_answers.asked() == 1
    agent_answers.answer = ALLOW
    assert other.request(["email"]) == GRANTED


def test_a_request_right_after_everyone_was_revoked_is_an_ordinary_one(world):
    manager = world.manager()
    manager.add_account()
    world.agent(answer=ALLOW)
    application = world.application()
    asking = Manager(application.connection)
    for _ in range(100):
        assert application.request(["email"]) == GRANTED
        assert asking.revoke_all() == GRANTED


def test_a_waiting_request_of_a_client_that_is_revoked_is_not_granted(world):
    manager = world.manager()
    manager.add_account()
    agent = world.agent()
    application = world.application()
    pending = application.start_request(["email"])
    alert = agent.next()
    assert manager.revoke(PHOTO) == GRANTED
    alert.wait_until_dismissed()
    assert pending.answer() == REFUSED_WITHOUT_ERROR
    assert manager.authorizations() == {}


def test_a_revocation_during_the_exchange_with_the_server_leaves_no_grant_behind(wired_world, wire):
    manager = wired_world.manager()
    manager.add_account()
    wired_world.agent(answer=ALLOW)
    application = wired_world.application()
    application.request(["email"])
    wire.next()
    wire.on("/authorize", lambda exchange: exchange.read_until_closed())
    pending = application.start_request(["email", "user_photos"])
    wire.next()
    assert manager.revoke(PHOTO) == GRANTED
    assert pending.answer() == REFUSED_WITHOUT_ERROR
    assert application.access()[0] == "refused"
    with bus_error(NO_ACCESS):
        application.credential()


# ---- refusals ----


def test_a_forgotten_refusal_lets_the_client_ask_again(world):
    manager = world.manager()
    manager.add_account()
    agent = world.agent(answer=REFUSE)
    application = world.application()
    application.request(["email"])
    changed = application.connection.signals(ACCOUNTS, "AccessChanged")
    manager.forget_refusal(PHOTO)
    changed.wait()
    assert application.access() == ("none", [], {})
    agent.answer = ALLOW
    assert application.request(["email"]) == GRANTED
    assert agent.asked() == 2


def test_only_a_refusal_can_be_forgotten(world):
    manager = world.manager()
    manager.add_account()
    with bus_error(FAILED):
        manager.forget_refusal(PHOTO)
    world.agent(answer=ALLOW)
    application = world.application()
    application.request(["email"])
    with bus_error(FAILED):
        manager.forget_refusal(PHOTO)
    assert application.access()[0] == "granted"


# ---- all of them ----


@pytest.mark.parametrize(
    "method, signature, values",
    [
        ("ListAuthorizations", "(s)", ("com.zentor.other",)),
        ("AuthorizeAccess", "(ss)", ("com.zentor.other", PHOTO)),
        ("RevokeAccess", "(ss)", ("com.zentor.other", PHOTO)),
        ("RevokeAllAccess", "(s)", ("com.zentor.other",)),
        ("ListPendingRevocations", "(s)", ("com.zentor.other",)),
        ("ForgetRefusal", "(ss)", ("com.zentor.other", PHOTO)),
    ],
)
def test_an_account_type_that_nobody_serves_is_an_error_everywhere(world, method, signature, values):
    with bus_error(UNSUPPORTED_TYPE):
        world.manager().connection.call(MANAGEMENT, method, GLib.Variant(signature, values))


def test_the_access_log_is_listed_newest_first_and_up_to_a_number(world):
    manager = world.manager()
    manager.add_account()
    world.agent(answer=REFUSE)
    for number in range(3):
        world.application(f"org.example.App{number}").request(["email"])
    names = [entry["client_id"] for entry in manager.access_log()]
    assert names == ["org.example.App2", "org.example.App1", "org.example.App0"]
    assert [entry["client_id"] for entry in manager.access_log(2)] == names[:2]
    assert manager.access_log(0) == []
    times = [entry["time"] for entry in manager.access_log()]
    assert times == sorted(times, reverse=True)


def test_a_client_that_is_not_installed_any_more_is_listed_by_its_id(world):
    manager = world.manager()
    manager.add_account()
    world.agent(answer=ALLOW)
    world.application(name="Photo App").request(["email"])
    assert manager.authorizations()[PHOTO]["name"] == "Photo App"
    os.unlink(os.path.join(world.root, "home/data/applications", f"{PHOTO}.desktop"))
    assert manager.authorizations()[PHOTO]["name"] == PHOTO
    assert manager.revoke(PHOTO) == GRANTED


# ---- a disk that takes nothing ----


@pytest.mark.parametrize("take_back", [lambda m: m.revoke(PHOTO), lambda m: m.revoke_all()], ids=["one", "all"])
def test_a_revocation_that_cannot_be_written_down_is_not_acknowledged(wired_world, granted, take_back):
    manager = wired_world.manager()
    with Unwritable(wired_world):
        with bus_error(FAILED):
            take_back(manager)
    assert take_back(manager) == (True, {})
    assert granted.access()[0] != "granted"


def test_an_account_whose_clients_cannot_be_revoked_stays(wired_world, granted):
    manager = wired_world.manager()
    (account,) = manager.accounts()
    with Unwritable(wired_world):
        with bus_error(FAILED):
            manager.remove_account(account["id"])
    assert manager.accounts() == [account]
    manager.remove_account(account["id"])
    assert manager.accounts() == []
    manager.add_account("another-token")
    assert granted.access()[0] == "none"
